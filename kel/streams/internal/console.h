// Tells the process's own standard streams from all others.
//
// <iostream> brings a static initialiser into every unit that includes it, and only the
// initialised units may have one. All others ask here.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_CONSOLE_H
#define KEL_STREAMS_INTERNAL_CONSOLE_H

#include <iosfwd>

namespace kel {
namespace internal {

// Whether strings are shown to a person instead of being encoded for a reader. Deliberate: std::clog
// is not among them. Pinned by ConsoleStrings.ClogGetsLengthAndQuotes.
bool is_cout_or_cerr(const std::ostream* stream);

bool is_console(const std::ostream* stream);  // std::cout, std::cerr or std::clog
bool is_cin(const std::istream* stream);

std::ostream& error_stream();  // std::cerr

}  // namespace internal
}  // namespace kel

#endif
