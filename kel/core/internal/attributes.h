// What the compiler is told about code in which a few steps are all there is to do.
//
//   KEL_UNINITIALIZED   a local that is written before it is read
//   KEL_FLATTEN         a function that has all it calls in itself, as far as the compiler sees it
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_INTERNAL_ATTRIBUTES_H
#define KEL_CORE_INTERNAL_ATTRIBUTES_H

// The library's build clears everything else first. Beside the few steps that a number or a short text takes,
// clearing would cost the most.
#define KEL_UNINITIALIZED __attribute__((uninitialized))

// A call of position-independent 32-bit code takes as long as two digits.
#define KEL_FLATTEN __attribute__((flatten, hot))

#endif
