// The calls that can fail, and the errors with which the system may fail them.
//
//   FailingCall      a seam, its errors and the manner in which it fails
//   failing_calls    all of them: what the fault matrix goes through
//   Fault            one failing call of one run
//   apply            puts faults into the seams
//
// The errors are those of the manual pages. A call that cannot fail, such as getpid, has no row, and
// neither has ctime_r: the log asks for a text once a second, so that how often depends on when a
// scenario runs.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_CALLS_H
#define KEL_TESTS_FAULTS_MATRIX_CALLS_H

#include <string>
#include <vector>

#include "tests/support/fault.h"

namespace kel {
namespace test {

enum class Manner {
    plain,           // nothing happens but the failure
    after_the_work,  // what the call stands for happens all the same: descriptors are closed, ...
};

struct FailingCall {
    SeamBase* seam;
    std::vector<int> errors;
    Manner manner = Manner::plain;
    // What errno holds after the failure of a call that returns its error: such calls leave it alone.
    std::vector<int> left_in_errno = {};
};

const std::vector<FailingCall>& failing_calls();

// Null for a call that cannot fail.
const FailingCall* failing_call(const SeamBase& seam);
const FailingCall* failing_call(const std::string& name);

struct Fault {
    SeamBase* seam = nullptr;
    long nth = 0;
    int error = 0;
    int left_in_errno = -1;  // -1: the call sets errno to its error
    bool from_then_on = false;

    // errno right after the failed call.
    int errno_after() const { return left_in_errno >= 0 ? left_in_errno : error; }
    std::string text() const;
};

// At most two faults of the same call. The seams must be reset.
void apply(const std::vector<Fault>& faults);
// Scripts and counts stay.
void withdraw(const std::vector<Fault>& faults);

// How the resolver tells a failure: by the code behind its last parameter, too.
void tell_resolver_failures();

}  // namespace test
}  // namespace kel

#endif
