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

// Where they are. A call that asked would take as long as the question whether a stream is a plain one.
struct Consoles {
    const std::istream* in;
    const std::ostream* out;
    const std::ostream* error;
    const std::ostream* log;
};
extern const Consoles consoles;

// Whether strings are shown to a person instead of being encoded for a reader. Deliberate: std::clog
// is not among them. Pinned by ConsoleStrings.ClogGetsLengthAndQuotes.
inline bool is_cout_or_cerr(const std::ostream* stream) {
    return stream == consoles.out || stream == consoles.error;
}
inline bool is_console(const std::ostream* stream) {
    return is_cout_or_cerr(stream) || stream == consoles.log;
}
inline bool is_cin(const std::istream* stream) { return stream == consoles.in; }

std::ostream& error_stream();  // std::cerr

}  // namespace internal
}  // namespace kel

#endif
