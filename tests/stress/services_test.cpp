// Services that all threads of a process share: options, the log, the loader and the environments.
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>
#include <kel/services/arg_list.h>
#include <kel/services/debug_logger.h>
#include <kel/services/environment.h>
#include <kel/services/load_library.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <string>

#include "tests/stress/together.h"

namespace kel {
namespace test {
namespace {

// --- options -----------------------------------------------------------------------------------------

void parse(KELArgList& options) {
    char words[4][16] = {"program", "-ORBPort", "2809", "file"};
    char* argv[] = {words[0], words[1], words[2], words[3], nullptr};
    int argc = 4;
    options.argInit(argc, argv, "-ORB");
    EXPECT_EQ(argc, 2);
}

void ask(KELArgList& options) {
    const CORBA_String_var port(options.getArgValue("ORBPort"));
    EXPECT_TRUE(port.in() == nullptr || std::string(port.in()) == "2809");
    options.getArg("ORBQuiet");
    EXPECT_LE(options.getArgCount(), 2u);
}

TEST(SharedOptions, AreStoredAndAskedForAtOnce) {
    KELArgList options;
    together(crowd, [&options](int i) {
        for (int n = 0; n < 200; ++n) {
            if (i == 0) parse(options);
            if (i == 1) options.putArgValue("ORBQuiet", n % 2 == 0 ? "yes" : nullptr);
            if (i > 1) ask(options);
        }
    });
    EXPECT_EQ(options.getArgCount(), 2u);
}

// --- the log -----------------------------------------------------------------------------------------

const unsigned int enabled = 0x10000001;
const unsigned int switched = 0x20000001;

class LogFile {
public:
    LogFile() : _path(::testing::TempDir() + "kel-stress-log-" + std::to_string(::getpid())) {}
    ~LogFile() {
        std::remove(_path.c_str());
        std::remove(backup().c_str());
    }
    const std::string& path() const { return _path; }
    std::string backup() const { return _path + "o"; }

private:
    std::string _path;
};

// Two lines for each entry: a header, and the writer's number three times.
int whole_entries(const std::string& path) {
    std::ifstream log(path);
    std::string header, numbers;
    int entries = 0;
    while (std::getline(log, header) && std::getline(log, numbers)) {
        EXPECT_EQ(header.rfind("=> ", 0), 0u) << header;
        EXPECT_EQ(numbers, std::string(3, numbers[0]));
        ++entries;
    }
    return entries;
}

void reconfigure(KELDebugLogger& log, int n) {
    log.traceModule(switched);
    log.isTraceEnabledFor(switched);
    log.untraceModule(switched);
    log.setFlag(2);
    log.unsetFlag(2);
    log.clearFlag();
    log.flag();
    log.setTrimSize(n % 2 == 0 ? 1 : 2);
    if (n % 10 == 0) log.closeFile();
}

// 600 entries pass the point at which the log is trimmed.
TEST(SharedLog, KeepsTheLinesOfAllThreadsWhole) {
    const LogFile file;
    KELDebugLogger log(file.path().c_str());
    log.traceModule(enabled);
    together(crowd, [&log](int i) {
        for (long n = 0; n < 150; ++n) {
            log.start(1, enabled, "stress.cpp", 1)
                << static_cast<long>(i) << static_cast<long>(i) << static_cast<long>(i) << endl;
            log.start(1, switched, "stress.cpp", 2) << endl;
            log.isTraceEnabledFor(enabled);
        }
    });
    together(crowd, [&log](int) {
        for (int n = 0; n < 100; ++n) reconfigure(log, n);
    });
    EXPECT_EQ(whole_entries(file.path()) + whole_entries(file.backup()), crowd * 150);
}

TEST(SharedLog, MayBeReconfiguredWhileItIsWritten) {
    const LogFile file;
    KELDebugLogger log(file.path().c_str());
    log.traceModule(enabled);
    together(crowd, [&log](int i) {
        for (int n = 0; n < 100; ++n) {
            if (i == 0) reconfigure(log, n);
            if (i != 0) log.start(1, enabled, "stress.cpp", 1) << "text" << endl;
        }
    });
    EXPECT_EQ(log.flag(), 1u);
    EXPECT_EQ(log.isTraceEnabledFor(enabled), 1);
}

TEST(SharedLog, IsOneForTheProcess) {
    KELDebugLogger* of_thread[crowd] = {};
    together(crowd, [&of_thread](int i) {
        of_thread[i] = KELDebugLogger::instance();
        of_thread[i]->start(0, enabled, "stress.cpp", 1) << "not enabled" << endl;
    });
    EXPECT_EQ(std::count(of_thread, of_thread + crowd, of_thread[0]), crowd);
}

// --- the loader --------------------------------------------------------------------------------------

TEST(SharedLoader, IsOneForTheProcess) {
    KELLoadLibrary* of_thread[crowd] = {};
    together(crowd, [&of_thread](int i) { of_thread[i] = KELLoadLibrary::instance(); });
    EXPECT_EQ(std::count(of_thread, of_thread + crowd, of_thread[0]), crowd);
}

TEST(SharedLoader, OpensAndClosesForAllThreads) {
    together(crowd, [](int i) {
        KELLoadLibrary& loader = *KELLoadLibrary::instance();
        for (int n = 0; n < 25; ++n) {
            loader.Load(KEL_STRESS_PLUGIN);
            if (i == 0 && n % 5 == 0) loader.UnloadAll();
            loader.Unload(KEL_STRESS_PLUGIN);
        }
    });
    EXPECT_EQ(dlopen(KEL_STRESS_PLUGIN, RTLD_LAZY | RTLD_NOLOAD), nullptr);
}

// --- environments ------------------------------------------------------------------------------------

TEST(Environments, OfAThreadIsItsOwnForAsLongAsItLives) {
    const CORBA_Environment* of_thread[crowd] = {};
    unsigned long keys[crowd] = {};
    Start compared(crowd);
    together(crowd, [&](int i) {
        CORBA_Environment* const own = CORBA::current_environment();
        of_thread[i] = own;
        keys[i] = CurrentEnvironment::key_id();
        for (int n = 0; n < 200; ++n) {
            own->exception(new CORBA_BAD_PARAM(static_cast<unsigned long>(n), CORBA::COMPLETED_NO));
            EXPECT_EQ(CORBA::current_environment(), own);
        }
        compared.arrive();  // until here all of them exist
    });
    for (int i = 0; i < crowd; ++i) {
        EXPECT_EQ(std::count(of_thread, of_thread + crowd, of_thread[i]), 1);
        EXPECT_EQ(keys[i], keys[0]);
    }
    KELRMutex_var hold(KELThreadLocal::_mutex, 1);
    EXPECT_EQ(KELThreadLocal::_cnt, keys[0] + 1);
}

}  // namespace
}  // namespace test
}  // namespace kel
