// SPDX-License-Identifier: MIT
#include <kel/core/internal/attributes.h>
#include <kel/core/internal/digits.h>
#include <kel/core/internal/failure.h>
#include <kel/services/debug_logger.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <ctime>
#include <ios>
#include <new>

using kel::internal::assertion_failed;
using kel::internal::copy_bytes;
using kel::internal::longest_integer;
using kel::internal::show_integer;

namespace {

const std::size_t name_limit = 1024;  // bytes of a log's or a backup's name, terminator not counted
const std::uint32_t default_trim_size = 1024 * 1024;
const std::int32_t lines_between_trims = 499;
const std::uint32_t trim_bit = 1;       // of _flags
const std::uint32_t trace_all_bit = 1;  // of _masks[0]

// What the library builds when it is loaded.
std::ios_base::Init standard_streams;
[[maybe_unused]] KELDebugLogger* const shared_logger = KELDebugLogger::instance();

// The index of the mask that `module` belongs to by its top four bits, or -1.
int group_of(unsigned int module) {
    const unsigned int bits = module >> 28;
    if ((bits & (bits - 1)) != 0) return -1;
    return bits == 0 ? 0 : __builtin_ctz(bits) + 1;
}

// The same, but a module without a group ends the process, naming `function` and `line`.
int checked_group(unsigned int module, unsigned line, const char* function) {
    const int group = group_of(module);
    if (__builtin_expect(group == -1, 0)) assertion_failed("i != -1", "vdlogger", line, function);
    return group;
}

// ---- the text of a time ----

const std::size_t time_room = 26;    // for ctime_r
const std::size_t time_length = 24;  // of its text without the newline
const std::size_t longest_zone = 63;
const char no_zone[] = "\n";  // stands for a TZ that is not set, which is another zone than an empty one

// What a header has of a time.
struct TimeTexts {
    char date[time_room];          // of ctime without its newline, or empty
    char number[longest_integer];  // the seconds, with a newline
    int number_length;
};

// The last texts and what they were made from. Looking a zone up can take as long as writing the entry, so
// it is done once a second, and at once when TZ changes.
struct LastTime {
    std::time_t time;
    char zone[longest_zone + 1];
    TimeTexts texts;  // of an empty date while there are none
};
LastTime last_time;
bool last_time_taken;  // by a thread; others do without it, and so does a child whose parent's thread had it

void make_time_texts(std::time_t now, TimeTexts& texts) {
    tzset();  // ctime_r, unlike ctime, need not look at a changed TZ
    if (ctime_r(&now, texts.date) == nullptr) texts.date[0] = '\0';
    texts.date[time_length] = '\0';
    char* const end = show_integer(texts.number, static_cast<int>(now));
    *end = '\n';
    texts.number_length = static_cast<int>(end + 1 - texts.number);
}

// A TZ that is not set is the usual case, and no text to be compared.
bool is_last_zone(const char* zone) {
    if (zone == no_zone) return last_time.zone[0] == *no_zone;
    return std::strcmp(last_time.zone, zone) == 0;
}

// Nothing is kept of a zone that is too long.
void local_time_texts(std::time_t now, TimeTexts& texts) {
    const char* zone = std::getenv("TZ");
    if (zone == nullptr) zone = no_zone;
    if (__atomic_test_and_set(&last_time_taken, __ATOMIC_ACQUIRE)) {
        make_time_texts(now, texts);
        return;
    }
    if (last_time.time == now && last_time.texts.date[0] != '\0' && is_last_zone(zone)) {
        texts = last_time.texts;
    } else {
        make_time_texts(now, texts);
        const std::size_t length = strnlen(zone, longest_zone + 1);
        if (length <= longest_zone) {
            last_time.time = now;
            std::memcpy(last_time.zone, zone, length + 1);
            last_time.texts = texts;
        }
    }
    __atomic_clear(&last_time_taken, __ATOMIC_RELEASE);
}

// ---- the pieces of a header ----

const std::size_t longest_short_name = 255;

// At least `width` digits.
char* put_hexadecimal(char* at, std::uint32_t n, int width) {
    int digits = (35 - __builtin_clz(n | 1)) / 4;
    if (digits < width) digits = width;
    for (int i = digits; i-- > 0; n >>= 4) at[i] = "0123456789abcdef"[n & 15];
    return at + digits;
}

// Apart from the question it belongs to, which is asked far more often than a line is traced and takes half
// as long without the addresses of these texts.
[[noreturn]] __attribute__((noinline, cold)) void no_group_to_look_at() {
    assertion_failed("i != -1", "vdlogger", __LINE__,
                     "unsigned char KELDebugLogger::isTraceEnabledFor(unsigned int) const");
}

// Masks, flags and the size limit are read without the lock.
std::uint32_t read_word(const std::uint32_t& word) { return __atomic_load_n(&word, __ATOMIC_RELAXED); }
void write_word(std::uint32_t& word, std::uint32_t value) {
    __atomic_store_n(&word, value, __ATOMIC_RELAXED);
}

}  // namespace

// Static objects of a client may log before this unit is initialised. The logger is never destroyed:
// detached threads may still log while the process exits, and the C library flushes every stream after
// that.
KELDebugLogger* KELDebugLogger::instance() {
    alignas(KELDebugLogger) static unsigned char storage[sizeof(KELDebugLogger)];
    static KELDebugLogger* const logger = new (storage) KELDebugLogger;
    return logger;
}

KELDebugLogger::KELDebugLogger() : KELDebugLogger(nullptr, 0) {}

KELDebugLogger::KELDebugLogger(const char* file) : KELDebugLogger(file, trim_bit) {}

KELDebugLogger::KELDebugLogger(const char* file, unsigned int flags)
    : _file_name(nullptr), _fp(stdout), _pending(0) {
    init(file, flags);
}

KELDebugLogger::~KELDebugLogger() {
    abandon_file();
    delete[] _file_name;
}

// Deliberate: a name once set stays, and a file that is open or pending stays so when another name is
// given. Pinned by DebugLogFile.InitKeepsANameThatIsSet.
void KELDebugLogger::init(const char* file, unsigned int flags) {
    KELRMutex_var hold(*this, 1);
    if (file != nullptr) {
        setLogFile(file);
    } else {
        abandon_file();
        _fp = stdout;
        _pending = 0;
    }
    _fd = -1;
    write_word(_flags, flags);
    for (std::uint32_t& mask : _masks) write_word(mask, 0);
    write_word(_trim_size, default_trim_size);
    _lines = 0;
    _in_line = 0;
    _spare = 0;
}

unsigned char KELDebugLogger::setLogFile(const char* file) {
    KELRMutex_var hold(*this, 1);
    if (file == nullptr || *file == '\0' || _file_name != nullptr) return 0;
    char* const name = new char[name_limit + 1];
    const std::size_t length = strnlen(file, name_limit);
    std::memcpy(name, file, length);
    name[length] = '\0';
    _file_name = name;
    _pending = 1;
    return 1;
}

// A stream that a failed close has lost is opened again as well.
void KELDebugLogger::openFile() {
    KELRMutex_var hold(*this, 1);
    if (is_open()) return;
    std::FILE* const opened = std::fopen(_file_name, "a");
    _pending = opened == nullptr;
    _fd = -1;
    if (opened == nullptr) return;
    _fp = opened;
    _fd = fileno(opened);
    // Deliberate: everybody may write the log, as processes of several users share one.
    // Pinned by DebugLogFile.OpeningGivesTheFileMode0666WhateverTheUmask.
    fchmod(_fd, 0666);
}

// Deliberate: a failed close changes no field but the stream itself. When the flush fails the stream is
// intact and goes on; when only the close fails the C library has given the stream up, and the next
// enabled start() opens the file again. Pinned by DebugLogFile.AFailedCloseChangesNothing.
void KELDebugLogger::closeFile() {
    KELRMutex_var hold(*this, 1);
    if (!is_open() || _fp == stdout) return;
    if (std::fflush(_fp) != 0) return;
    const int rc = std::fclose(_fp);
    _fp = nullptr;
    if (rc != 0) return;
    _pending = 1;
    _fd = -1;
}

bool KELDebugLogger::is_open() const { return _pending == 0 && _fp != nullptr; }

void KELDebugLogger::abandon_file() {
    if (is_open() && _fp != stdout) std::fclose(_fp);
    _fp = nullptr;
}

// Deliberate: the lock stays held until endl, also when nothing is printed, and a line that is open lets
// the items of a nested start() through. The module is checked before the lock is taken.
// Pinned by DebugLogLine.ADisabledStartHoldsTheLockUntilEndl, DebugLogLine.ItemsOfANestedDisabledStartPrint.
KELDebugLogger& KELDebugLogger::start(unsigned int level, unsigned int module, const char* file, int line) {
    const int group =
        checked_group(module, __LINE__,
                      "KELDebugLogger& KELDebugLogger::start(unsigned int, unsigned int, const char*, int)");
    lock();
    if (_in_line != 0 || !prints(module, group)) return *this;
    if (!is_open()) openFile();
    if (!is_open()) return *this;
    // Deliberate: the check comes before its header is printed, so the first one looks at 499 headers and
    // later ones at 500. Pinned by DebugLogTrimming.TheFiveHundredthStartTrimsBeforeItsHeader.
    if (++_lines > lines_between_trims) {
        trimLog();
        _lines = 0;
        if (!is_open()) return *this;
    }
    print_header(level, module, file, line);
    _in_line = 1;
    return *this;
}

bool KELDebugLogger::prints(unsigned int module, int group) const {
    return (read_word(_masks[group]) & module) != 0 || (read_word(_masks[0]) & trace_all_bit) != 0;
}

// As "=> %s,%02x,%08x,%s,%d,%d\n" would print it, which takes longer than the system takes to write it.
void KELDebugLogger::print_header(unsigned int level, unsigned int module, const char* file, int line) {
    KEL_UNINITIALIZED TimeTexts now;
    local_time_texts(std::time(nullptr), now);
    KEL_UNINITIALIZED char header[longest_short_name + 100];
    copy_bytes<3>(header, "=> ");
    char* at = header + 3;
    copy_bytes<time_length>(at, now.date);
    if (now.date[0] != '\0') at += time_length;
    *at++ = ',';
    at = put_hexadecimal(at, level, 2);
    *at++ = ',';
    at = put_hexadecimal(at, module, 8);
    *at++ = ',';

    const char* name = file != nullptr ? file : "(null)";
    for (std::size_t n = 0; *name != '\0' && n != longest_short_name; ++n) *at++ = *name++;
    if (*name != '\0') {
        std::fwrite(header, 1, static_cast<std::size_t>(at - header), _fp);
        std::fputs(name, _fp);
        at = header;
    }
    *at++ = ',';
    at = show_integer(at, line);
    *at++ = ',';
    copy_bytes<longest_integer>(at, now.number);
    at += now.number_length;
    std::fwrite(header, 1, static_cast<std::size_t>(at - header), _fp);
}

// Inside a line _fp is null only after a closeFile() in its middle; the rest of that line is lost.
KELDebugLogger& KELDebugLogger::operator<<(const char* s) {
    if (_in_line != 0 && _fp != nullptr) std::fputs(s != nullptr ? s : "<null>", _fp);
    return *this;
}

KELDebugLogger& KELDebugLogger::operator<<(long n) {
    if (_in_line != 0 && _fp != nullptr) {
        KEL_UNINITIALIZED char text[longest_integer];
        std::fwrite(text, 1, static_cast<std::size_t>(show_integer(text, n) - text), _fp);
    }
    return *this;
}

KELDebugLogger& KELDebugLogger::operator<<(KELDebugLogger& (*manipulator)(KELDebugLogger&)) {
    return manipulator(*this);
}

// Deliberate: the inner endl of a nest ends the line, and one without a start() fails in unlock().
// Pinned by DebugLogLine.TheInnerEndlOfANestEndsTheLine, DebugLogLine.EndlWithoutStartEndsTheProcess.
KELDebugLogger& endl(KELDebugLogger& log) {
    if (log._in_line != 0) {
        if (log._fp != nullptr) {
            std::fputc('\n', log._fp);
            std::fflush(log._fp);
        }
        log._in_line = 0;
    }
    log.unlock();
    return log;
}

// The two line numbers are fixed: scripts that watch for these assertions match them.
void KELDebugLogger::traceModule(unsigned int module) {
    const int group = checked_group(module, 261, "void KELDebugLogger::traceModule(unsigned int)");
    KELRMutex_var hold(*this, 1);
    write_word(_masks[group], _masks[group] | module);
}

void KELDebugLogger::untraceModule(unsigned int module) {
    const int group = checked_group(module, 272, "void KELDebugLogger::untraceModule(unsigned int)");
    KELRMutex_var hold(*this, 1);
    write_word(_masks[group], _masks[group] & ~module);
}

// Deliberate: the group bits are part of both words, so one enabled module of groups 1 to 4 makes every
// module of its group look enabled. Pinned by DebugLogger.TheGroupBitAloneMakesAModuleEnabled.
unsigned char KELDebugLogger::isTraceEnabledFor(unsigned int module) const {
    const int group = group_of(module);
    if (group == -1) no_group_to_look_at();
    return (read_word(_masks[group]) & module) != 0;
}

void KELDebugLogger::setFlag(unsigned int bits) {
    KELRMutex_var hold(*this, 1);
    write_word(_flags, _flags | bits);
}

void KELDebugLogger::unsetFlag(unsigned int bits) {
    KELRMutex_var hold(*this, 1);
    write_word(_flags, _flags & ~bits);
}

// Deliberate: trimming stays on. Pinned by DebugLogger.ClearFlagLeavesTrimmingOn.
void KELDebugLogger::clearFlag() {
    KELRMutex_var hold(*this, 1);
    write_word(_flags, trim_bit);
}

unsigned int KELDebugLogger::flag() const { return read_word(_flags); }

void KELDebugLogger::setTrimSize(unsigned int kb) {
    if (kb != 0) write_word(_trim_size, kb * 1024);
}

// Whatever fails here is tried again 500 headers later. A cut backup name would be another file, so a
// name that is too long leaves the log as it is. The negative length of a failure is too long as well.
void KELDebugLogger::trimLog() {
    KELRMutex_var hold(*this, 1);
    if (!is_open() || _fd == -1 || (flag() & trim_bit) == 0) return;
    struct stat log;
    if (fstat(_fd, &log) != 0 || log.st_size < read_word(_trim_size)) return;
    char backup[name_limit + 1];
    const int length = std::snprintf(backup, sizeof backup, "%so", _file_name);
    if (static_cast<std::size_t>(length) > name_limit) return;
    unlink(backup);
    closeFile();
    if (_pending == 0) return;  // the log could not be closed: it keeps its name
    std::rename(_file_name, backup);
    openFile();
}
