// SPDX-License-Identifier: MIT
// The debug logger: an entry that reaches its file, and a module that nobody traces.
#include <bench/support/bench.h>
#include <fcntl.h>
#include <kel/services/debug_logger.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstring>
#include <string>

#ifdef KEL_BENCH_SPDLOG
#include <spdlog/sinks/basic_file_sink.h>
#include <spdlog/spdlog.h>
#endif

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

const unsigned int module = 0x10000001;
const unsigned int other_module = 0x20000001;

// A file of its own for each contender, gone with it. It is emptied now and then.
class LogFile {
public:
    LogFile() {
        const int fd = mkstemp(_name);
        if (fd != -1) close(fd);
    }
    ~LogFile() { unlink(_name); }
    LogFile(const LogFile&) = delete;
    LogFile& operator=(const LogFile&) = delete;

    const char* name() const { return _name; }
    void shrink() {
        if (++_entries % 100000 == 0 && truncate(_name, 0) != 0) std::abort();
    }

private:
    char _name[32] = "/tmp/kel_bench_XXXXXX";
    int _entries = 0;
};

// The entry's bytes with one system call.
void entry_limit(benchmark::State& state) {
    LogFile file;
    const int fd = open(file.name(), O_WRONLY | O_APPEND);
    const char text[] =
        "=> Sun Sep  9 01:46:40 2001,03,10000001,server.cpp,42,1000000000\nconnection 4711 accepted\n";
    for (auto _ : state) {
        benchmark::DoNotOptimize(write(fd, text, sizeof text - 1));
        file.shrink();
    }
    close(fd);
}

void entry_kel(benchmark::State& state) {
    LogFile file;
    KELDebugLogger log(file.name());
    log.clearFlag();
    log.unsetFlag(1);  // nothing is renamed: the bench empties the file itself
    log.traceModule(module);
    long n = 4711;
    for (auto _ : state) {
        log.start(3, module, "server.cpp", 42) << "connection " << n << " accepted" << endl;
        file.shrink();
    }
}

// Its load alone: what a disabled module costs at the least.
void disabled_limit(benchmark::State& state) {
    unsigned int mask = other_module;
    for (auto _ : state) {
        benchmark::DoNotOptimize(mask);
        benchmark::DoNotOptimize(mask & module);
    }
}

void disabled_kel(benchmark::State& state) {
    KELDebugLogger log;
    log.traceModule(other_module);
    for (auto _ : state) benchmark::DoNotOptimize(log.isTraceEnabledFor(module));
}

#ifdef KEL_BENCH_SPDLOG
// The same header, as far as it has one, and the same text.
void entry_spdlog(benchmark::State& state) {
    LogFile file;
    spdlog::logger log("bench", std::make_shared<spdlog::sinks::basic_file_sink_mt>(file.name()));
    log.set_pattern("=> %c,%l,%n,%s,%#,%E%n%v");
    log.flush_on(spdlog::level::info);
    long n = 4711;
    for (auto _ : state) {
        log.log(spdlog::source_loc("server.cpp", 42, "bench"), spdlog::level::info, "connection {} accepted",
                n);
        file.shrink();
    }
}

void disabled_spdlog(benchmark::State& state) {
    LogFile file;
    spdlog::logger log("bench", std::make_shared<spdlog::sinks::basic_file_sink_mt>(file.name()));
    log.set_level(spdlog::level::warn);
    for (auto _ : state) {
        log.debug("connection {} accepted", 4711);
        benchmark::ClobberMemory();
    }
}
#endif

const bool registered = [] {
    line("trace entry, written and flushed", kLimit, entry_limit);
    line("trace entry, written and flushed", kKel, entry_kel);
    line("trace of a disabled module", kLimit, disabled_limit);
    line("trace of a disabled module", kKel, disabled_kel);
#ifdef KEL_BENCH_SPDLOG
    line("trace entry, written and flushed", "spdlog", entry_spdlog);
    line("trace of a disabled module", "spdlog", disabled_spdlog);
#endif
    return true;
}();

}  // namespace
