// Defines each call of seams.inc as a symbol of the test executable. The dynamic linker binds the
// library to these definitions; each forwards to the next one in line unless its thread is armed.
//
// SPDX-License-Identifier: MIT
#include "tests/support/seams.h"

namespace kel {
namespace test {

namespace {

thread_local int armed_here = 0;
thread_local int paused_here = 0;
int armed_everywhere = 0;

}  // namespace

void reset_allocation_plan();  // in seams_new.cpp

bool armed() {
    return paused_here == 0 && (armed_here != 0 || __atomic_load_n(&armed_everywhere, __ATOMIC_RELAXED) != 0);
}

Armed::Armed() { ++armed_here; }
Armed::~Armed() { --armed_here; }
ArmedEverywhere::ArmedEverywhere() { __atomic_add_fetch(&armed_everywhere, 1, __ATOMIC_RELAXED); }
ArmedEverywhere::~ArmedEverywhere() { __atomic_sub_fetch(&armed_everywhere, 1, __ATOMIC_RELAXED); }
Disarmed::Disarmed() { ++paused_here; }
Disarmed::~Disarmed() { --paused_here; }

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
