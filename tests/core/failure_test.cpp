// The convention by which failed thread calls are reported.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/core/condition.h>
#include <kel/core/mutex.h>

#include "tests/core/reports.h"

namespace {

using namespace kel::test;

using Failure = FaultTest;

TEST_F(Failure, MinorCodeIsErrnoAndNotTheReturnedCode) {
    const FailedCreation seen = fail_creation(seams::pthread_mutex_init, EAGAIN, ENOENT, [] { KELMutex m; });
    EXPECT_EQ(seen.minor, 0x4f4d0000ul + ENOENT);
}

TEST_F(Failure, MinorCodeIsZeroInTheOmgSetWhenErrnoIsZero) {
    const FailedCreation seen = fail_creation(seams::pthread_cond_init, EAGAIN, 0, [] { KELCondition c; });
    EXPECT_EQ(seen.minor, 0x4f4d0000ul);
}

TEST_F(Failure, ErrnoIsReadBeforeAnythingIsPrinted) {
    const FailedCreation seen = fail_creation(seams::pthread_mutex_init, EAGAIN, 5, [] { KELMutex m; });
    EXPECT_EQ(seen.printed, "pthread_mutex_init") << "and perror left another errno";
    EXPECT_EQ(seen.minor, 0x4f4d0005ul);
}

TEST_F(Failure, CreationPrintsTheTextOfErrno) {
    const Outcome seen = in_child([] {
        fail_use(seams::pthread_mutex_init, EAGAIN);
        Armed armed;
        EXPECT_THROW(KELMutex m, CORBA_NO_RESOURCES);
    });
    EXPECT_EQ(seen.exit_code, 0);
    EXPECT_EQ(seen.err, "pthread_mutex_init: Input/output error\n");
}

TEST_F(Failure, SuccessPrintsNothing) {
    Armed armed;
    KELMutex m;
    KELCondition c;
    m.lock();
    c.signal();
    m.unlock();
    EXPECT_EQ(seams::perror.calls(), 0);
}

}  // namespace
