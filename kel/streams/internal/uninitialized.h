// For locals that are written before they are read.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_UNINITIALIZED_H
#define KEL_STREAMS_INTERNAL_UNINITIALIZED_H

// The library's build clears everything else first. Beside the few steps that a number or a short text takes,
// clearing would cost the most.
#define KEL_UNINITIALIZED __attribute__((uninitialized))

#endif
