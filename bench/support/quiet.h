// Whether the machine is this program's own at the moment.
//
// A virtual processor may share a real one with strangers, and is then half as fast for some milliseconds at
// a time. What that does to a work depends on the work: to instructions side by side much, to waits for
// memory little. So ratios that were measured meanwhile are those of another machine.
//
//   wait_for_quiet  waits until a probe takes hardly longer than the shortest before, for a bounded time
//   probe           nanoseconds of a loop that does the same each time, and fills a processor
//
// SPDX-License-Identifier: MIT
#ifndef KEL_BENCH_SUPPORT_QUIET_H
#define KEL_BENCH_SUPPORT_QUIET_H

namespace bench {

// The least of three probes, so that an interrupt in one of them is not taken for a neighbour.
double probe();

// Gives the shortest probe meanwhile: a long one when the machine did not become quiet in some tens of
// milliseconds.
double wait_for_quiet();

}  // namespace bench

#endif
