// Declares one seam for each line of seams.inc, under the name of the call it stands for.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SUPPORT_SEAMS_H
#define KEL_TESTS_SUPPORT_SEAMS_H

#include <netdb.h>
#include <poll.h>
#include <pthread.h>
#include <sys/select.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/types.h>
#include <sys/utsname.h>

#include <cstdio>
#include <ctime>

#include "tests/support/fault.h"

namespace kel {
namespace test {
namespace seams {

#define KEL_SEAM(result, name, parameters, arguments, how) extern Seam<result parameters> name;
#include "tests/support/seams.inc"
#undef KEL_SEAM

}  // namespace seams
}  // namespace test
}  // namespace kel

#endif
