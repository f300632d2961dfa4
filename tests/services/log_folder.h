// What the tests of the logger share: a fresh folder, a fixed time and a look at the lock.
//
//   LogFolder           a temporary folder, removed with its files
//   DebugLoggerTest     fixture: a logger in a fresh folder, the time zone UTC and helpers
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SERVICES_LOG_FOLDER_H
#define KEL_TESTS_SERVICES_LOG_FOLDER_H

#include <ftw.h>
#include <gtest/gtest.h>
#include <kel/services/debug_logger.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <string>
#include <thread>

#include "tests/support/fault.h"

namespace kel {
namespace test {

class LogFolder {
public:
    explicit LogFolder(const std::string& where = ::testing::TempDir()) {
        _path = where + "kel-log-XXXXXX";
        if (::mkdtemp(&_path[0]) == nullptr) std::abort();
    }
    ~LogFolder() {
        ::nftw(
            _path.c_str(), [](const char* path, const struct stat*, int, FTW*) { return std::remove(path); },
            16, FTW_DEPTH | FTW_PHYS);
    }
    std::string file(const std::string& name) const { return _path + "/" + name; }

private:
    std::string _path;
};

inline bool exists(const std::string& path) { return ::access(path.c_str(), F_OK) == 0; }

inline std::string text_of(const std::string& path) {
    std::string text;
    if (std::FILE* file = std::fopen(path.c_str(), "r")) {
        char buffer[4096];
        std::size_t n;
        while ((n = std::fread(buffer, 1, sizeof buffer, file)) > 0) text.append(buffer, n);
        std::fclose(file);
    }
    return text;
}

inline void write_text(const std::string& path, const std::string& text) {
    std::FILE* const file = std::fopen(path.c_str(), "w");
    std::fputs(text.c_str(), file);
    std::fclose(file);
}

inline int count_of(const std::string& piece, const std::string& text) {
    int n = 0;
    for (std::size_t at = text.find(piece); at != std::string::npos; at = text.find(piece, at + 1)) ++n;
    return n;
}

class DebugLoggerTest : public FaultTest {
protected:
    static const unsigned int module = 0x10000001;
    static const unsigned int other_group = 0x20000001;

    DebugLoggerTest() : log(path.c_str()) { log.traceModule(module); }

    void SetUp() override {
        FaultTest::SetUp();
        set_time_zone("UTC0");
    }

    // Runs `body` with the plans and scripts in force.
    template <class Body>
    static void faulted(Body body) {
        Armed armed;
        body();
    }

    static void set_time_zone(const char* zone) {
        ::setenv("TZ", zone, 1);
        ::tzset();
    }

    // From here on the time of armed calls stands still.
    static void stop_clock(std::time_t now) {
        seams::time.script([now](std::time_t*) { return now; });
    }

    static void write_line(KELDebugLogger& log, const char* text = "text") {
        log.start(3, module, "server.cpp", 42) << text << endl;
    }

    static void write_lines(KELDebugLogger& log, int n) {
        for (int i = 0; i < n; ++i) write_line(log);
    }

    int headers_in(const std::string& file) const { return count_of("=> ", text_of(file)); }

    // The system's mutex inside `mutex`, found by watching which one is locked.
    static pthread_mutex_t* inside(KELRMutex& mutex) KEL_NO_THREAD_SAFETY_ANALYSIS {
        pthread_mutex_t* found = nullptr;
        seams::pthread_mutex_lock.script([&found](pthread_mutex_t* m) {
            found = m;
            return seams::pthread_mutex_lock.real(m);
        });
        {
            Armed armed;
            mutex.lock();
        }
        mutex.unlock();
        seams::pthread_mutex_lock.reset();
        return found;
    }

    // Whether a thread other than a fresh one holds the mutex that inside() found.
    static bool is_held(pthread_mutex_t* system_mutex) {
        int rc = 0;
        std::thread other([&] {
            rc = pthread_mutex_trylock(system_mutex);
            if (rc == 0) pthread_mutex_unlock(system_mutex);
        });
        other.join();
        return rc == EBUSY;
    }
    static bool is_held(KELRMutex& mutex) { return is_held(inside(mutex)); }

    LogFolder folder;
    const std::string path = folder.file("log");
    const std::string backup = path + "o";
    KELDebugLogger log;
};

}  // namespace test
}  // namespace kel

#endif
