// Construction, modules, flags and the life of the debug logger.
//
// SPDX-License-Identifier: MIT
#include <cxxabi.h>

#include <type_traits>
#include <vector>

#include "tests/services/log_folder.h"
#include "tests/support/child.h"

namespace {

using namespace kel::test;

class DebugLogger : public DebugLoggerTest {
protected:
    // How often `body` locks a mutex.
    template <class Body>
    static long locks_taken_by(Body body) {
        seams::pthread_mutex_lock.reset();
        faulted(body);
        return seams::pthread_mutex_lock.calls();
    }
};

// --- layout ------------------------------------------------------------------------------------------

TEST_F(DebugLogger, IsARecursiveMutexFollowedByItsFields) {
    static_assert(std::is_base_of<KELRMutex, KELDebugLogger>::value, "");
    const char* const start = reinterpret_cast<const char*>(&log);
    const std::vector<const void*> fields = {&log._masks, &log._flags,   &log._trim_size,
                                             &log._lines, &log._fd,      &log._file_name,
                                             &log._fp,    &log._pending, &log._in_line};
    EXPECT_EQ(fields[0], start + sizeof(KELRMutex));
    for (std::size_t i = 1; i < fields.size(); ++i) EXPECT_LT(fields[i - 1], fields[i]) << i;
    EXPECT_EQ(sizeof log._masks, 5 * sizeof(std::uint32_t));
    EXPECT_EQ(&log._in_line, &log._pending + 1);
    EXPECT_LT(reinterpret_cast<const char*>(&log._in_line) + 1,
              start + sizeof log);  // room for one more flag
}

TEST_F(DebugLogger, InitClearsTheFlagThatNobodyUses) {
    unsigned char* const unused = &log._in_line + 1;
    *unused = 7;
    log.init(path.c_str(), 1);
    EXPECT_EQ(*unused, 0);
}

// --- the shared logger and construction --------------------------------------------------------------

TEST_F(DebugLogger, TheSharedLoggerIsOneObject) {
    EXPECT_NE(KELDebugLogger::instance(), nullptr);
    EXPECT_EQ(KELDebugLogger::instance(), KELDebugLogger::instance());
}

TEST_F(DebugLogger, TheSharedLoggerStartsOnStandardOutputWithoutTrimming) {
    const KELDebugLogger& shared = *KELDebugLogger::instance();
    for (std::uint32_t mask : shared._masks) EXPECT_EQ(mask, 0u);
    EXPECT_EQ(shared._flags, 0u);
    EXPECT_EQ(shared._trim_size, 1048576u);
    EXPECT_EQ(shared._lines, 0);
    EXPECT_EQ(shared._fd, -1);
    EXPECT_EQ(shared._file_name, nullptr);
    EXPECT_EQ(shared._fp, stdout);
    EXPECT_EQ(shared._pending, 0);
    EXPECT_EQ(shared._in_line, 0);
}

TEST_F(DebugLogger, ALoggerWithoutAFileIsLikeTheSharedOne) {
    KELDebugLogger plain;
    EXPECT_EQ(plain.flag(), 0u);
    EXPECT_EQ(plain._fp, stdout);
    EXPECT_EQ(plain._pending, 0);
    EXPECT_EQ(plain._file_name, nullptr);
}

TEST_F(DebugLogger, ALoggerWithAFileTrimsAndHasItPending) {
    KELDebugLogger with_file(path.c_str());
    EXPECT_EQ(with_file.flag(), 1u);
    EXPECT_EQ(with_file._pending, 1);
    EXPECT_STREQ(with_file._file_name, path.c_str());
    EXPECT_EQ(with_file._fd, -1);
    EXPECT_EQ(with_file._trim_size, 1048576u);
    for (std::uint32_t mask : with_file._masks) EXPECT_EQ(mask, 0u);
}

TEST_F(DebugLogger, ANullOrEmptyFileMeansStandardOutput) {
    KELDebugLogger null_file(nullptr), no_name("");
    for (KELDebugLogger* each : {&null_file, &no_name}) {
        EXPECT_EQ(each->_fp, stdout);
        EXPECT_EQ(each->_pending, 0);
        EXPECT_EQ(each->flag(), 1u);
    }
}

TEST_F(DebugLogger, PrintsOnStandardOutputWithoutAFile) {
    const Outcome o = in_child([] {
        KELDebugLogger& shared = *KELDebugLogger::instance();
        shared.traceModule(module);
        stop_clock(1000000000);
        Armed armed;
        write_line(shared, "hello");
    });
    EXPECT_EQ(o.out, "=> Sun Sep  9 01:46:40 2001,03,10000001,server.cpp,42,1000000000\nhello\n");
}

TEST_F(DebugLogger, TheSharedLoggerWorksAfterTheExitHandlersRan) {
    const Outcome o = in_child([] {
        abi::__cxa_finalize(nullptr);
        KELDebugLogger& shared = *KELDebugLogger::instance();
        shared.traceModule(module);
        write_line(shared, "late");
        ::_exit(0);
    });
    EXPECT_EQ(o.exit_code, 0) << o.err;
    EXPECT_NE(o.out.find("late\n"), std::string::npos);
}

TEST_F(DebugLogger, AnUnfinishedLineIsFlushedAtExit) {
    const Outcome o = in_child([this] {
        KELDebugLogger& shared = *KELDebugLogger::instance();
        shared.setLogFile(path.c_str());
        shared.traceModule(module);
        shared.start(3, module, "server.cpp", 42) << "unfinished";
        std::exit(0);
    });
    EXPECT_EQ(o.exit_code, 0) << o.err;
    EXPECT_NE(text_of(path).find("\nunfinished"), std::string::npos);
}

// The other thread is a plain one, which owns nothing that a leak check could miss at exit.
TEST_F(DebugLogger, ExitWhileAnotherThreadHoldsALineEnds) {
    const auto hold_a_line = [](void* ends) -> void* {
        KELDebugLogger::instance()->start(3, module, "server.cpp", 42);
        const char byte = 0;
        if (::write(static_cast<int*>(ends)[1], &byte, 1) != 1) ::_exit(96);
        for (;;) ::pause();
    };
    const Outcome o = in_child([hold_a_line] {
        int ends[2];
        pthread_t holder;
        char byte;
        if (::pipe(ends) != 0) ::_exit(97);
        if (::pthread_create(&holder, nullptr, hold_a_line, ends) != 0) ::_exit(96);
        if (::read(ends[0], &byte, 1) != 1) ::_exit(95);
        std::exit(0);
    });
    EXPECT_EQ(o.exit_code, 0) << o.err;
}

// --- modules -----------------------------------------------------------------------------------------

TEST_F(DebugLogger, TheTopFourBitsChooseTheMask) {
    const unsigned int codes[5] = {0x00000010, 0x10000010, 0x20000010, 0x40000010, 0x80000010};
    KELDebugLogger fresh;
    for (unsigned int code : codes) fresh.traceModule(code);
    for (int group = 0; group < 5; ++group) EXPECT_EQ(fresh._masks[group], codes[group]) << group;
}

TEST_F(DebugLogger, AnyOtherTopNibbleEndsTheProcess) {
    for (unsigned int nibble : {3u, 5u, 6u, 7u, 9u, 10u, 11u, 12u, 13u, 14u, 15u}) {
        const Assertion a = assertion_of([&] { log.traceModule(nibble << 28); });
        EXPECT_EQ(a.expression, "i != -1") << nibble;
    }
}

TEST_F(DebugLogger, ABadModuleInTraceModuleFailsAtLine261) {
    const Assertion a = assertion_of([&] { log.traceModule(0x30000000); });
    EXPECT_EQ(a.expression, "i != -1");
    EXPECT_EQ(a.file, "vdlogger");
    EXPECT_EQ(a.line, 261u);
    EXPECT_EQ(a.function, "void KELDebugLogger::traceModule(unsigned int)");
}

TEST_F(DebugLogger, ABadModuleInUntraceModuleFailsAtLine272) {
    const Assertion a = assertion_of([&] { log.untraceModule(0x30000000); });
    EXPECT_EQ(a.expression, "i != -1");
    EXPECT_EQ(a.file, "vdlogger");
    EXPECT_EQ(a.line, 272u);
    EXPECT_EQ(a.function, "void KELDebugLogger::untraceModule(unsigned int)");
}

TEST_F(DebugLogger, ABadModuleInStartEndsTheProcess) {
    const Assertion a = assertion_of([&] { log.start(1, 0x30000000, "f", 1); });
    EXPECT_EQ(a.expression, "i != -1");
    EXPECT_EQ(a.file, "vdlogger");
    EXPECT_EQ(a.function,
              "KELDebugLogger& KELDebugLogger::start(unsigned int, unsigned int, const char*, int)");
}

TEST_F(DebugLogger, ABadModuleInStartEndsTheProcessEvenWhenEverythingIsTraced) {
    log.traceModule(1);
    EXPECT_EQ(assertion_of([&] { log.start(1, 0xf0000001, "f", 1); }).expression, "i != -1");
}

TEST_F(DebugLogger, ABadModuleInIsTraceEnabledForEndsTheProcess) {
    const Assertion a = assertion_of([&] { log.isTraceEnabledFor(0x30000000); });
    EXPECT_EQ(a.expression, "i != -1");
    EXPECT_EQ(a.file, "vdlogger");
    EXPECT_EQ(a.function, "unsigned char KELDebugLogger::isTraceEnabledFor(unsigned int) const");
}

TEST_F(DebugLogger, ABadModuleIsFoundBeforeTheLockIsTaken) {
    seams::pthread_mutex_lock.fail(1, EINVAL, true);
    EXPECT_EQ(assertion_of([&] { log.start(1, 0x30000000, "f", 1); }).expression, "i != -1");
    EXPECT_EQ(assertion_of([&] { log.traceModule(0x30000000); }).expression, "i != -1");
    EXPECT_EQ(assertion_of([&] { log.untraceModule(0x30000000); }).expression, "i != -1");
}

TEST_F(DebugLogger, TheWholeCodeGoesIntoTheMask) {
    KELDebugLogger fresh;
    fresh.traceModule(0x10000001);
    fresh.traceModule(0x10000100);
    EXPECT_EQ(fresh._masks[1], 0x10000101u);
}

TEST_F(DebugLogger, UntraceModuleClearsEveryBitOfTheCode) {
    log._masks[1] = 0x10000103;
    log.untraceModule(0x10000001);
    EXPECT_EQ(log._masks[1], 0x00000102u);
}

TEST_F(DebugLogger, TheGroupBitAloneMakesAModuleEnabled) {
    EXPECT_EQ(log.isTraceEnabledFor(0x10000002), 1);
    EXPECT_EQ(log.isTraceEnabledFor(0x20000002), 0);
}

TEST_F(DebugLogger, EachGroupIsEnabledAndDisabledByItself) {
    const unsigned int codes[5] = {0x00000010, 0x10000010, 0x20000010, 0x40000010, 0x80000010};
    for (unsigned int traced : codes) {
        KELDebugLogger fresh;
        fresh.traceModule(traced);
        for (unsigned int code : codes) EXPECT_EQ(fresh.isTraceEnabledFor(code), code == traced) << code;
        fresh.untraceModule(traced);
        for (std::uint32_t mask : fresh._masks) EXPECT_EQ(mask, 0u) << traced;
    }
}

TEST_F(DebugLogger, ModulesOfGroupZeroAreToldApart) {
    log.traceModule(0x00000002);
    EXPECT_EQ(log.isTraceEnabledFor(0x00000002), 1);
    EXPECT_EQ(log.isTraceEnabledFor(0x00000004), 0);
}

TEST_F(DebugLogger, TracingEverythingDoesNotShowInIsTraceEnabledFor) {
    log.traceModule(0x00000001);
    EXPECT_EQ(log.isTraceEnabledFor(other_group), 0);
    EXPECT_EQ(log.isTraceEnabledFor(0x00000002), 0);
}

TEST_F(DebugLogger, TracingEverythingPrintsADisabledModule) {
    log.traceModule(0x00000001);
    log.start(1, other_group, "f", 1) << endl;
    EXPECT_EQ(headers_in(path), 1);
}

TEST_F(DebugLogger, ReadingMasksAndFlagsTakesNoLock) {
    EXPECT_EQ(locks_taken_by([&] { log.isTraceEnabledFor(module); }), 0);
    EXPECT_EQ(locks_taken_by([&] { log.flag(); }), 0);
}

TEST_F(DebugLogger, ChangingMasksAndFlagsTakesTheLockOnce) {
    EXPECT_EQ(locks_taken_by([&] { log.traceModule(module); }), 1);
    EXPECT_EQ(locks_taken_by([&] { log.untraceModule(module); }), 1);
    EXPECT_EQ(locks_taken_by([&] { log.setFlag(2); }), 1);
    EXPECT_EQ(locks_taken_by([&] { log.unsetFlag(2); }), 1);
    EXPECT_EQ(locks_taken_by([&] { log.clearFlag(); }), 1);
    EXPECT_FALSE(is_held(log));
}

// --- flags and the size limit ------------------------------------------------------------------------

TEST_F(DebugLogger, SetFlagAddsBits) {
    log.setFlag(0x80000004);
    EXPECT_EQ(log.flag(), 0x80000005u);
}

TEST_F(DebugLogger, UnsetFlagRemovesBits) {
    log.setFlag(6);
    log.unsetFlag(3);
    EXPECT_EQ(log.flag(), 4u);
}

TEST_F(DebugLogger, ClearFlagLeavesTrimmingOn) {
    log.unsetFlag(1);
    log.setFlag(0xfffffffe);
    log.clearFlag();
    EXPECT_EQ(log.flag(), 1u);
}

TEST_F(DebugLogger, TheTrimSizeIsGivenInKibibytes) {
    log.setTrimSize(3);
    EXPECT_EQ(log._trim_size, 3072u);
}

TEST_F(DebugLogger, ATrimSizeOfZeroKeepsTheLimit) {
    log.setTrimSize(3);
    log.setTrimSize(0);
    EXPECT_EQ(log._trim_size, 3072u);
}

TEST_F(DebugLogger, ATrimSizeBeyondFourGibibytesWraps) {
    log.setTrimSize(0x00400001);
    EXPECT_EQ(log._trim_size, 1024u);
}

}  // namespace
