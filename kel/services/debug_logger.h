// Writes trace lines of enabled modules to a log file or to standard output.
//
//   KELDebugLogger   a logger; it is the recursive mutex that keeps its lines whole
//   endl             ends a line and lets the next thread write
//
//     KELDebugLogger& log = *KELDebugLogger::instance();
//     log.traceModule(0x10000001);
//     log.start(3, 0x10000001, __FILE__, __LINE__) << "retries left: " << 2L << endl;
//
// prints a header and the text:
//
//     => Thu Jan  1 00:00:00 1970,03,10000001,server.cpp,42,0
//     retries left: 2
//
// Any thread may log. The lock is held from start() to endl, whether or not the module is enabled,
// so each start() needs its endl: one lost to an exception leaves the lock held, and one too many
// ends the process. The shared logger works until the very end of the process.
//
// The log file may be written by every user (mode 0666) and a link under its name is followed: keep
// it in a private folder.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_SERVICES_DEBUG_LOGGER_H
#define KEL_SERVICES_DEBUG_LOGGER_H

#include <kel/config.h>
#include <kel/core/mutex.h>

#include <cstdio>

class KEL_API KELDebugLogger : public KELRMutex {
public:
    // The logger of this process; it starts on standard output with every module disabled.
    static KELDebugLogger* instance();

    // Logs to standard output.
    KELDebugLogger();

    // Logs to `file`, opened by the first enabled start(), and trims it.
    explicit KELDebugLogger(const char* file);

    // Closes the log file.
    ~KELDebugLogger() override;

    KELDebugLogger(const KELDebugLogger&) = delete;
    KELDebugLogger& operator=(const KELDebugLogger&) = delete;

    // Starts over with every module disabled, `flags` as the options and a limit of 1 MiB. A null
    // `file` means standard output, any other goes to setLogFile. A name once set stays.
    void init(const char* file, unsigned int flags);

    // Names the log file, of which the first 1024 bytes count. Gives 0 and changes nothing for a null
    // or empty name and when a name is set already, otherwise 1.
    unsigned char setLogFile(const char* file);

    // Opens the named file at its end unless it is open. When that fails the next enabled start()
    // tries again and nothing is printed until then.
    void openFile();

    // Closes the log file; the next enabled start() opens it again. Standard output stays open.
    void closeFile();

    // Takes the lock and, when the module is enabled and no line is open, prints a header with the
    // time, `level`, `module`, and the caller's `file` and `line`. A module whose top four bits are
    // not 0, 1, 2, 4 or 8 ends the process.
    KELDebugLogger& start(unsigned int level, unsigned int module, const char* file,
                          int line) KEL_NO_THREAD_SAFETY_ANALYSIS;

    // Print in the open line, and do nothing when there is none. A null text prints "<null>".
    KELDebugLogger& operator<<(const char* s);
    KELDebugLogger& operator<<(long n);
    KELDebugLogger& operator<<(KELDebugLogger& (*manipulator)(KELDebugLogger&));

    // Enable or disable the bits of `module` in its group. The top four bits choose the group and
    // belong to the mask as well. Bit 0 of group 0 enables everything for start().
    void traceModule(unsigned int module);
    void untraceModule(unsigned int module);

    // 1 when the group's mask and `module` share a bit. Takes no lock; bit 0 of group 0 has no say.
    unsigned char isTraceEnabledFor(unsigned int module) const;

    // The option bits; bit 0 trims the log. clearFlag() leaves exactly that bit set. flag() takes no lock.
    void setFlag(unsigned int bits);
    void unsetFlag(unsigned int bits);
    void clearFlag();
    unsigned int flag() const;

    // The size in KiB at which the log is trimmed; 0 is ignored. Takes no lock.
    void setTrimSize(unsigned int kb);

    // Renames a log that has reached its limit to its name and "o", replacing the older one, and
    // starts a new one. Does nothing unless trimming is on and the file is open.
    void trimLog();

    // The enabled modules of each group.
    std::uint32_t _masks[5];
    // The option bits.
    std::uint32_t _flags;
    std::uint32_t _trim_size;  // bytes
    std::int32_t _lines;       // headers since the last look at the size
    int _fd;                   // -1 when no file is open
    char* _file_name;          // owned, or null
    // The open file, standard output, or null.
    std::FILE* _fp;
    unsigned char _pending;  // the named file still has to be opened
    unsigned char _in_line;  // a header is printed and its endl is still to come

private:
    KELDebugLogger(const char* file, unsigned int flags);

    bool prints(unsigned int module, int group) const;
    bool is_open() const;
    void abandon_file();
    void print_header(unsigned int level, unsigned int module, const char* file, int line);

    unsigned char _spare;  // keeps its place among the fields; nothing uses it
};

// Ends the open line, if there is one, and releases the lock that start() took.
KEL_API KELDebugLogger& endl(KELDebugLogger& log) KEL_NO_THREAD_SAFETY_ANALYSIS;

#endif
