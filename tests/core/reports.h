// What a wrapper tells when its thread call fails.
//
//   fail_next              lets the next armed call of a seam fail
//   FailedCreation         what a failed creation printed and threw; made by fail_creation
//   expect_no_resources    the full convention of a failed creation
//   expect_use_failure     the full convention of a failed use
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CORE_REPORTS_H
#define KEL_TESTS_CORE_REPORTS_H

#include <kel/exceptions/standard.h>

#include <cerrno>
#include <cstring>
#include <functional>
#include <string>

#include "tests/support/child.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {

inline void fail_next(SeamBase& call, int rc) { call.fail(call.calls() + 1, rc); }

struct FailedCreation {
    bool thrown = false;
    unsigned long minor = 0;
    CORBA::CompletionStatus completed = CORBA::COMPLETED_YES;
    std::string printed;  // by perror
    long calls = 0;       // of the call that failed
};

// Runs `create` while the next call fails with `rc`, having set errno to `error`.
template <class Create>
FailedCreation fail_creation(SeamBase& call, int rc, int error, Create create) {
    FailedCreation seen;
    const long before = call.calls();
    seams::perror.script([&](const char* text) {
        seen.printed += text;
        errno = 4444;  // perror may leave anything here
    });
    fail_next(call, rc);
    try {
        Armed armed;
        errno = error;
        create();
    } catch (const CORBA_NO_RESOURCES& e) {
        seen.thrown = true;
        seen.minor = e.minor();
        seen.completed = e.completed();
    }
    seen.calls = call.calls() - before;
    call.fail(0, 0);
    seams::perror.reset();
    return seen;
}

// Minor codes up to 4095 are stored in the OMG's set, greater ones as they are.
template <class Create>
void expect_no_resources(SeamBase& call, Create create) {
    const struct {
        int error;
        unsigned long minor;
    } rows[] = {{0, 0x4f4d0000}, {7, 0x4f4d0007}, {EAGAIN, 0x4f4d000b}, {4095, 0x4f4d0fff}, {70000, 70000}};
    for (const auto& row : rows) {
        const FailedCreation seen = fail_creation(call, ENOMEM, row.error, create);
        EXPECT_TRUE(seen.thrown);
        EXPECT_EQ(seen.minor, row.minor);
        EXPECT_EQ(seen.completed, CORBA::COMPLETED_NO);
        EXPECT_EQ(seen.printed, call.name());
        EXPECT_EQ(seen.calls, 1) << "a failed creation is not tried again";
    }
}

// `use` calls fail_next itself, right before the wrapper. What perror prints is the name, and the text
// of errno, which the call leaves alone.
inline void expect_use_failure(const std::function<void()>& use, const std::string& printed_name,
                               const std::string& expression, const std::string& function) {
    const Assertion seen = assertion_of(use);
    EXPECT_TRUE(seen.failed);
    EXPECT_EQ(seen.expression, expression);
    EXPECT_EQ(seen.file, "vthread");
    EXPECT_GT(seen.line, 0u);
    EXPECT_EQ(seen.function, function);
    EXPECT_EQ(seen.child.err, printed_name + ": " + std::strerror(EIO) + "\n");
    EXPECT_EQ(seen.child.out, "");
}

// Fails the next call with `rc`; errno says EIO, which no thread call sets.
inline void fail_use(SeamBase& call, int rc) {
    fail_next(call, rc);
    errno = EIO;
}

}  // namespace test
}  // namespace kel

#endif
