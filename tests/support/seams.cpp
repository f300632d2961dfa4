// Defines each call of seams.inc as a symbol of the test executable. The dynamic linker binds the
// library to these definitions; each forwards to the next one in line unless its thread is armed.
//
// SPDX-License-Identifier: MIT
#include "tests/support/seams.h"

#include <algorithm>

namespace kel {
namespace test {

namespace {

thread_local int armed_here = 0;
thread_local int paused_here = 0;
int armed_everywhere = 0;

// In static storage, because tracing must not allocate. Calls beyond it are not listed.
CallTrace::Call traced[16384];
long traced_count = 0;
bool tracing = false;

}  // namespace

void reset_allocation_plan();   // in seams_new.cpp
void reset_allocation_count();  // the same

bool armed() {
    return paused_here == 0 && (armed_here != 0 || __atomic_load_n(&armed_everywhere, __ATOMIC_RELAXED) != 0);
}

Armed::Armed() { ++armed_here; }
Armed::~Armed() { --armed_here; }
ArmedEverywhere::ArmedEverywhere() { __atomic_add_fetch(&armed_everywhere, 1, __ATOMIC_RELAXED); }
ArmedEverywhere::~ArmedEverywhere() { __atomic_sub_fetch(&armed_everywhere, 1, __ATOMIC_RELAXED); }
Disarmed::Disarmed() { ++paused_here; }
Disarmed::~Disarmed() { --paused_here; }

void trace_call(SeamBase& seam, long nth) {
    if (!__atomic_load_n(&tracing, __ATOMIC_RELAXED)) return;
    const long i = __atomic_fetch_add(&traced_count, 1, __ATOMIC_RELAXED);
    if (i < static_cast<long>(sizeof traced / sizeof traced[0])) traced[i] = {&seam, nth};
}

CallTrace::CallTrace() {
    __atomic_store_n(&traced_count, 0, __ATOMIC_RELAXED);
    __atomic_store_n(&tracing, true, __ATOMIC_RELAXED);
}

CallTrace::~CallTrace() { stop(); }

void CallTrace::stop() { __atomic_store_n(&tracing, false, __ATOMIC_RELAXED); }

void CallTrace::restart() {
    __atomic_store_n(&traced_count, 0, __ATOMIC_RELAXED);
    for (SeamBase* seam : all_seams()) seam->forget_calls();
    reset_allocation_count();
}

std::vector<CallTrace::Call> CallTrace::calls() const {
    const long listed = static_cast<long>(sizeof traced / sizeof traced[0]);
    return {traced, traced + std::min(__atomic_load_n(&traced_count, __ATOMIC_RELAXED), listed)};
}

namespace seams {

// Constant initialisation: the library calls through the seams before this program's own
// initialisers run.
#if defined(__clang__)
#define KEL_CONSTINIT [[clang::require_constant_initialization]]
#else
#define KEL_CONSTINIT __constinit
#endif
#define KEL_SEAM(result, name, parameters, arguments, how) \
    KEL_CONSTINIT Seam<result parameters> name(#name, how);
#include "tests/support/seams.inc"
#undef KEL_SEAM

}  // namespace seams

const std::vector<SeamBase*>& all_seams() {
    static const std::vector<SeamBase*> all = {
#define KEL_SEAM(result, name, parameters, arguments, how) &seams::name,
#include "tests/support/seams.inc"
#undef KEL_SEAM
    };
    return all;
}

void find_real_calls() {
#define KEL_SEAM(result, name, parameters, arguments, how) seams::name.find_real();
#include "tests/support/seams.inc"
#undef KEL_SEAM
}

void reset_faults() {
#define KEL_SEAM(result, name, parameters, arguments, how) seams::name.reset();
#include "tests/support/seams.inc"
#undef KEL_SEAM
    reset_allocation_plan();
}

}  // namespace test
}  // namespace kel

using kel::test::Failing;

#define KEL_SEAM_SYMBOL __attribute__((visibility("default"))) KEL_TEST_BEFORE_SANITIZER

// The assembler name gives the symbol without a second declaration of the system's function.
#define KEL_SEAM(result, name, parameters, arguments, how)                       \
    extern "C" KEL_SEAM_SYMBOL result kel_seam_##name parameters __asm__(#name); \
    extern "C" result kel_seam_##name parameters { return kel::test::seams::name.call arguments; }
#include "tests/support/seams.inc"
#undef KEL_SEAM

// Plain spellings that share a seam with the 64-bit one.
extern "C" KEL_SEAM_SYMBOL int kel_seam_fcntl(int fd, int command, void* arg) __asm__("fcntl");
extern "C" int kel_seam_fcntl(int fd, int command, void* arg) {
    return kel::test::seams::fcntl64.call(fd, command, arg);
}
extern "C" KEL_SEAM_SYMBOL FILE* kel_seam_fopen(const char* path, const char* mode) __asm__("fopen");
extern "C" FILE* kel_seam_fopen(const char* path, const char* mode) {
    return kel::test::seams::fopen64.call(path, mode);
}
