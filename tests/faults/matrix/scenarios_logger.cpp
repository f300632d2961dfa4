// The debug logger: lines, its file and the rotation of the file.
//
// SPDX-License-Identifier: MIT
#include <kel/services/debug_logger.h>

#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>

#include "tests/faults/matrix/scenario.h"
#include "tests/services/log_folder.h"
#include "tests/support/fault.h"

namespace {

using namespace kel::test;

const unsigned int module = 0x10000001;

void write_line(KELDebugLogger& log) { log.start(3, module, "server.cpp", 42) << "text" << 7l << endl; }

// Beside the figures, whose folder is made anew for each run: a scenario that ends its process leaves its
// files.
std::string where_files_go() {
    const char* const figures = std::getenv("KEL_FIGURES");
    return figures != nullptr ? std::string(figures) + "/" : ::testing::TempDir();
}

// A logger on a file in a folder of its own; the clock stands still.
class LogScenario : public Scenario {
    void prepare() override {
        _log = std::make_unique<KELDebugLogger>(_path.c_str());
        _log->traceModule(module);
        seams::time.script([](std::time_t*) { return std::time_t(0); });
        set_up();
    }
    virtual void set_up() {}

protected:
    // The logger is closed, so that all that it has taken is in the file.
    void close_and_give() {
        _log.reset();
        const Disarmed pause;
        gives("%d lines, backup of %d bytes", count_of("text7\n", text_of(_path)),
              exists(_backup) ? static_cast<int>(text_of(_backup).size()) : -1);
    }

    const LogFolder _folder{where_files_go()};
    const std::string _path = _folder.file("log");
    const std::string _backup = _path + "o";
    std::unique_ptr<KELDebugLogger> _log;
};

class LogLine : public LogScenario {
    void act() override {
        write_line(*_log);
        close_and_give();
    }
};
KEL_SCENARIO(LogLine).giving("1 lines, backup of -1 bytes");

class LogLineAfterAnother : public LogScenario {
    void act() override {
        write_line(*_log);
        write_line(*_log);
        close_and_give();
    }
};
KEL_SCENARIO(LogLineAfterAnother).giving("2 lines, backup of -1 bytes");

class LogThatIsClosedBetween : public LogScenario {
    void act() override {
        write_line(*_log);
        _log->closeFile();
        write_line(*_log);
        close_and_give();
    }
};
KEL_SCENARIO(LogThatIsClosedBetween).giving("2 lines, backup of -1 bytes");

// The next line is the five hundredth, and the file is larger than it may be.
class LogRotates : public LogScenario {
    void set_up() override {
        write_text(_path, std::string(2000, 'x'));
        _log->setTrimSize(1);
        _log->openFile();
        _log->_lines = 499;
    }
    void act() override {
        write_line(*_log);
        close_and_give();
    }
};
KEL_SCENARIO(LogRotates).giving("1 lines, backup of 2000 bytes");

// A rotation that failed is tried again five hundred lines later. Two failures are two rounds.
class LogRotatesLater : public LogScenario {
    void set_up() override {
        write_text(_path, std::string(2000, 'x'));
        _log->setTrimSize(1);
        _log->openFile();
    }
    void act() override {
        for (int round = 0; round < 2; ++round) {
            _log->_lines = 499;
            write_line(*_log);
        }
        _log.reset();
        const Disarmed pause;
        gives("%s", exists(_backup) ? "a backup" : "no backup");
    }
};
KEL_SCENARIO(LogRotatesLater).giving("a backup").without_pairs();

class LogOnStandardOutput : public Scenario {
    void prepare() override {
        ::setenv("TZ", "UTC0", 1);
        _log.traceModule(module);
        seams::time.script([](std::time_t*) { return std::time_t(0); });
    }
    void act() override { write_line(_log); }
    KELDebugLogger _log;
};
KEL_SCENARIO(LogOnStandardOutput).showing("=> Thu Jan  1 00:00:00 1970,03,10000001,server.cpp,42,0\ntext7\n");

class LogOfAnotherModule : public LogScenario {
    void act() override {
        _log->start(3, 0x20000001, "server.cpp", 42) << "text" << 7l << endl;
        close_and_give();
    }
};
KEL_SCENARIO(LogOfAnotherModule).giving("0 lines, backup of -1 bytes");

class LogIsNamed : public Scenario {
    void act() override { gives("%d", _log.setLogFile("/nowhere/log")); }
    std::string state() override {
        return std::string(_log._file_name == nullptr ? "no name" : _log._file_name) +
               (_log._pending ? ", pending" : "");
    }
    KELDebugLogger _log;
};
KEL_SCENARIO(LogIsNamed).giving("1").and_retried();

class LogSettings : public Scenario {
    void act() override {
        KELDebugLogger log;
        log.traceModule(module);
        log.untraceModule(module);
        log.setFlag(6);
        log.unsetFlag(2);
        log.clearFlag();
        gives("%d, %u", log.isTraceEnabledFor(module), log.flag());
    }
};
KEL_SCENARIO(LogSettings).giving("0, 1").and_retried();

}  // namespace
