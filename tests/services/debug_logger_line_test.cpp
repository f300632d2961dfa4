// Headers, lines and the lock that keeps them whole.
//
// SPDX-License-Identifier: MIT
#include <cerrno>
#include <climits>
#include <stdexcept>
#include <thread>
#include <utility>

#include "tests/services/log_folder.h"
#include "tests/support/child.h"

namespace {

using namespace kel::test;

const std::time_t some_time = 1000000000;

class DebugLogLine : public DebugLoggerTest {
protected:
    // What one enabled start() prints at `now`.
    std::string header_at(std::time_t now, unsigned int level = 3, unsigned int code = module,
                          const char* file = "server.cpp", int line = 42) {
        stop_clock(now);
        log.traceModule(code);
        faulted([&] { log.start(level, code, file, line); });
        log << endl;
        return text_of(path);
    }

    // The same without what was printed before.
    template <class... Args>
    std::string next_header_at(Args... args) {
        const std::size_t before = text_of(path).size();
        return header_at(args...).substr(before);
    }
};

// --- the header --------------------------------------------------------------------------------------

TEST_F(DebugLogLine, TheHeaderHasTimeLevelModuleFileLineAndSeconds) {
    EXPECT_EQ(header_at(some_time), "=> Sun Sep  9 01:46:40 2001,03,10000001,server.cpp,42,1000000000\n\n");
}

TEST_F(DebugLogLine, TheEpochReadsAsZeroSeconds) {
    EXPECT_EQ(header_at(0), "=> Thu Jan  1 00:00:00 1970,03,10000001,server.cpp,42,0\n\n");
}

TEST_F(DebugLogLine, ATimeBeforeTheEpochIsNegative) {
    EXPECT_EQ(header_at(-1), "=> Wed Dec 31 23:59:59 1969,03,10000001,server.cpp,42,-1\n\n");
}

TEST_F(DebugLogLine, SmallLevelsAndModulesArePaddedWithZeros) {
    EXPECT_EQ(header_at(0, 0xa, 0x2), "=> Thu Jan  1 00:00:00 1970,0a,00000002,server.cpp,42,0\n\n");
}

TEST_F(DebugLogLine, HexadecimalDigitsAreSmallLetters) {
    EXPECT_EQ(header_at(0, 0xff, 0x8abcdef0), "=> Thu Jan  1 00:00:00 1970,ff,8abcdef0,server.cpp,42,0\n\n");
}

TEST_F(DebugLogLine, ALevelAboveTwoDigitsIsPrintedWhole) {
    EXPECT_EQ(header_at(0, 0x1ff), "=> Thu Jan  1 00:00:00 1970,1ff,10000001,server.cpp,42,0\n\n");
}

TEST_F(DebugLogLine, ANegativeLineIsPrintedAsSuch) {
    EXPECT_EQ(header_at(0, 3, module, "a,b", -7), "=> Thu Jan  1 00:00:00 1970,03,10000001,a,b,-7,0\n\n");
}

TEST_F(DebugLogLine, TheHeaderGivesLocalTimeAndFollowsTheZone) {
    set_time_zone("UTC0");
    ::setenv("TZ", "EST5", 1);  // not told to the C library: that is the logger's task
    EXPECT_EQ(header_at(some_time), "=> Sat Sep  8 20:46:40 2001,03,10000001,server.cpp,42,1000000000\n\n");
}

TEST_F(DebugLogLine, AZoneThatChangesWithinASecondShowsAtOnce) {
    const char* const zones[] = {"UTC0", "EST5", "UTC0", "UTC-1", ""};
    const char* const hours[] = {"01", "20", "01", "02", "01"};
    for (std::size_t i = 0; i < 5; ++i) {
        ::setenv("TZ", zones[i], 1);
        for (int again = 0; again < 2; ++again) {
            EXPECT_EQ(next_header_at(some_time).substr(14, 2), hours[i]) << zones[i];
        }
    }
    const std::string long_zone = std::string(80, 'Z') + "2";
    ::setenv("TZ", long_zone.c_str(), 1);
    EXPECT_EQ(next_header_at(some_time).substr(14, 2), "23");
    ::unsetenv("TZ");
    const std::string unset = next_header_at(some_time);
    ::setenv("TZ", "UTC-1", 1);
    EXPECT_EQ(next_header_at(some_time).substr(14, 2), "02");
    ::unsetenv("TZ");
    EXPECT_EQ(next_header_at(some_time), unset);
}

TEST_F(DebugLogLine, EachSecondShowsItsOwnTime) {
    for (int second : {0, 1, 1, 59, 0}) {
        const std::string header = next_header_at(second);
        EXPECT_EQ(header.substr(20, 2), std::string(second < 10 ? "0" : "") + std::to_string(second));
    }
}

TEST_F(DebugLogLine, FileNamesOfAnyLengthAndNonePrintAsTheirFormatDoes) {
    for (std::size_t length : {0, 1, 254, 255, 256, 5000}) {
        const std::string name(length, 'n');
        EXPECT_EQ(next_header_at(0, 3, module, name.c_str(), 42),
                  "=> Thu Jan  1 00:00:00 1970,03,10000001," + name + ",42,0\n\n");
    }
    EXPECT_EQ(next_header_at(0, 3, module, nullptr, 42),
              "=> Thu Jan  1 00:00:00 1970,03,10000001,(null),42,0\n\n");
}

TEST_F(DebugLogLine, ExtremeNumbersPrintAsTheirFormatDoes) {
    EXPECT_EQ(next_header_at(0, 0, 0x2, "f", INT_MIN),
              "=> Thu Jan  1 00:00:00 1970,00,00000002,f,-2147483648,0\n\n");
    EXPECT_EQ(next_header_at(0, 0xffffffff, module, "f", INT_MAX),
              "=> Thu Jan  1 00:00:00 1970,ffffffff,10000001,f,2147483647,0\n\n");
}

TEST_F(DebugLogLine, BothTimesOfAHeaderComeFromOneReading) {
    std::time_t ticking = some_time;
    seams::time.script([&](std::time_t*) { return ticking++; });
    {
        Armed armed;
        write_line(log);
    }
    EXPECT_EQ(seams::time.calls(), 1);
    EXPECT_EQ(text_of(path), "=> Sun Sep  9 01:46:40 2001,03,10000001,server.cpp,42,1000000000\ntext\n");
}

TEST_F(DebugLogLine, TheTextOfASecondIsMadeOnce) {
    header_at(0);
    seams::ctime_r.forget_calls();
    for (int i = 0; i < 3; ++i) next_header_at(some_time);
    EXPECT_EQ(seams::ctime_r.calls(), 1);
}

// One that makes the text of a second keeps nobody else from writing a header.
TEST_F(DebugLogLine, AThreadThatCannotHaveTheLastTextMakesItsOwn) {
    header_at(0);
    stop_clock(some_time);
    const std::string other_path = folder.file("other");
    KELDebugLogger other(other_path.c_str());
    other.traceModule(module);
    bool first = true;
    seams::ctime_r.script([&](const std::time_t* now, char* text) {
        if (std::exchange(first, false)) {
            std::thread([&] { faulted([&] { write_line(other); }); }).join();
        }
        return seams::ctime_r.real(now, text);
    });
    const std::size_t before = text_of(path).size();
    faulted([&] { write_line(log); });
    const std::string line = "=> Sun Sep  9 01:46:40 2001,03,10000001,server.cpp,42,1000000000\ntext\n";
    EXPECT_EQ(text_of(other_path), line);
    EXPECT_EQ(text_of(path).substr(before), line);
}

TEST_F(DebugLogLine, ATimeWithoutATextPrintsNone) {
    header_at(0);
    seams::ctime_r.fail(1, EOVERFLOW, true);
    EXPECT_EQ(next_header_at(some_time), "=> ,03,10000001,server.cpp,42,1000000000\n\n");
    seams::ctime_r.reset();
    EXPECT_EQ(next_header_at(some_time),
              "=> Sun Sep  9 01:46:40 2001,03,10000001,server.cpp,42,1000000000\n\n");
}

TEST_F(DebugLogLine, AYearOfFiveDigitsHasNoText) {
    if (sizeof(std::time_t) == 4) GTEST_SKIP() << "no 32-bit time is that late";
    const long long year_ten_thousand = 253402300800;
    EXPECT_EQ(
        header_at(static_cast<std::time_t>(year_ten_thousand)),
        "=> ,03,10000001,server.cpp,42," + std::to_string(static_cast<int>(year_ten_thousand)) + "\n\n");
}

// --- lines -------------------------------------------------------------------------------------------

TEST_F(DebugLogLine, AnEntryIsTheHeaderTheItemsAndANewline) {
    stop_clock(0);
    {
        Armed armed;
        log.start(3, module, "server.cpp", 42) << "retries " << 2L << ", name "
                                               << "x" << endl;
    }
    EXPECT_EQ(text_of(path), "=> Thu Jan  1 00:00:00 1970,03,10000001,server.cpp,42,0\nretries 2, name x\n");
}

TEST_F(DebugLogLine, ANullTextPrintsAsNull) {
    log.start(3, module, "f", 1) << static_cast<const char*>(nullptr) << endl;
    EXPECT_NE(text_of(path).find("\n<null>\n"), std::string::npos);
}

TEST_F(DebugLogLine, PercentSignsInATextAreText) {
    log.start(3, module, "f", 1) << "100%s%n" << endl;
    EXPECT_NE(text_of(path).find("\n100%s%n\n"), std::string::npos);
}

TEST_F(DebugLogLine, NumbersPrintInDecimal) {
    log.start(3, module, "f", 1) << -5L << " " << LONG_MIN << " " << LONG_MAX << endl;
    const std::string line = "\n-5 " + std::to_string(LONG_MIN) + " " + std::to_string(LONG_MAX) + "\n";
    EXPECT_NE(text_of(path).find(line), std::string::npos);
}

TEST_F(DebugLogLine, ItemsOutsideALinePrintNothing) {
    write_line(log);
    const std::string before = text_of(path);
    log << "stray" << 7L;
    std::fflush(log._fp);
    EXPECT_EQ(text_of(path), before);
}

KELDebugLogger* manipulated = nullptr;
KELDebugLogger& remember(KELDebugLogger& log) {
    manipulated = &log;
    return log;
}

TEST_F(DebugLogLine, AManipulatorIsAppliedAlsoOutsideALine) {
    manipulated = nullptr;
    EXPECT_EQ(&(log << remember), &log);
    EXPECT_EQ(manipulated, &log);
}

TEST_F(DebugLogLine, EveryOperationReturnsTheLogger) {
    EXPECT_EQ(&log.start(3, module, "f", 1), &log);
    EXPECT_EQ(&(log << "text"), &log);
    EXPECT_EQ(&(log << 1L), &log);
    EXPECT_EQ(&endl(log), &log);
}

TEST_F(DebugLogLine, EndlFlushesTheLine) {
    write_line(log, "at once");
    EXPECT_NE(text_of(path).find("at once\n"), std::string::npos);
}

TEST_F(DebugLogLine, AHeaderPutsTheLoggerInALineAndEndlTakesItOut) {
    log.start(3, module, "f", 1);
    EXPECT_EQ(log._in_line, 1);
    log << endl;
    EXPECT_EQ(log._in_line, 0);
}

TEST_F(DebugLogLine, ADisabledStartPrintsNothing) {
    log.start(3, other_group, "f", 1) << "text" << endl;
    EXPECT_FALSE(exists(path));
    EXPECT_EQ(log._in_line, 0);
}

TEST_F(DebugLogLine, EndlOutsideALinePrintsNothing) {
    write_line(log);
    const std::string before = text_of(path);
    log.start(3, other_group, "f", 1) << "text" << 7L << endl;
    std::fflush(log._fp);
    EXPECT_EQ(text_of(path), before);
}

TEST_F(DebugLogLine, EveryGroupPrintsWhenItIsEnabled) {
    const unsigned int codes[5] = {0x00000010, 0x10000010, 0x20000010, 0x40000010, 0x80000010};
    log.untraceModule(module);
    for (unsigned int code : codes) {
        log.start(3, code, "f", 1) << endl;
        log.traceModule(code);
        log.start(3, code, "f", 1) << endl;
        log.untraceModule(code);
    }
    EXPECT_EQ(headers_in(path), 5);
}

TEST_F(DebugLogLine, ADisabledStartHoldsTheLockUntilEndl) {
    log.start(3, other_group, "f", 1);
    EXPECT_TRUE(is_held(log));
    log << endl;
    EXPECT_FALSE(is_held(log));
}

TEST_F(DebugLogLine, AnEnabledStartHoldsTheLockUntilEndl) {
    log.start(3, module, "f", 1);
    EXPECT_TRUE(is_held(log));
    log << endl;
    EXPECT_FALSE(is_held(log));
}

TEST_F(DebugLogLine, AnExceptionBetweenStartAndEndlLeavesTheLockHeld) {
    try {
        log.start(3, module, "f", 1);
        throw std::runtime_error("lost endl");
    } catch (const std::runtime_error&) {
    }
    EXPECT_TRUE(is_held(log));
    log << endl;
}

TEST_F(DebugLogLine, EndlWithoutStartEndsTheProcess) {
    const Assertion a = assertion_of([&] { log << endl; });
    EXPECT_EQ(a.expression, "(rc == 0)");
    EXPECT_EQ(a.function, "void KELRMutex::unlock()");
}

TEST_F(DebugLogLine, AThreadMayNestStarts) {
    log.start(3, module, "f", 1);
    log.start(3, module, "f", 2);
    log << endl;
    EXPECT_TRUE(is_held(log));
    log << endl;
    EXPECT_FALSE(is_held(log));
}

TEST_F(DebugLogLine, AStartInsideALinePrintsNoHeader) {
    log.start(3, module, "f", 1) << "outer ";
    log.start(3, module, "f", 2) << "inner";
    log << endl << endl;
    EXPECT_EQ(headers_in(path), 1);
    EXPECT_NE(text_of(path).find("\nouter inner\n"), std::string::npos);
}

TEST_F(DebugLogLine, TheInnerEndlOfANestEndsTheLine) {
    log.start(3, module, "f", 1) << "outer ";
    log.start(3, module, "f", 2) << "inner" << endl;
    log << "lost" << endl;
    const std::string text = text_of(path);
    EXPECT_NE(text.find("\nouter inner\n"), std::string::npos);
    EXPECT_EQ(text.find("lost"), std::string::npos);
    EXPECT_EQ(text.back(), '\n');
    EXPECT_EQ(text[text.size() - 2], 'r');
}

TEST_F(DebugLogLine, ItemsOfANestedDisabledStartPrint) {
    log.start(3, module, "f", 1) << "outer ";
    log.start(3, other_group, "f", 2) << "inner" << endl;
    log << endl;
    EXPECT_NE(text_of(path).find("\nouter inner\n"), std::string::npos);
}

TEST_F(DebugLogLine, LinesOfTwoThreadsDoNotMix) {
    const int lines = 200;
    auto write_all = [&](const char* item) {
        for (int i = 0; i < lines; ++i) {
            log.start(3, module, "f", 1);
            for (int piece = 0; piece < 8; ++piece) log << item;
            log << endl;
        }
    };
    std::thread a(write_all, "a"), b(write_all, "b");
    a.join();
    b.join();
    const std::string text = text_of(path);
    EXPECT_EQ(count_of("\naaaaaaaa\n", text), lines);
    EXPECT_EQ(count_of("\nbbbbbbbb\n", text), lines);
}

}  // namespace
