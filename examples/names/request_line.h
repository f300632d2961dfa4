// The lines of a request file.
//
//   parse       a line to a request
//   quoted      a text as a line would write it
//   shortened   a line as a terminal may show it
//
// A line is an operation and its arguments, separated by blanks:
//
//     bind "the name" "a \"quoted\" value"
//     rebind long "ab"*32768
//     resolve the-name
//     list
//
// An argument without blanks and quotes may stand alone. In quotes, \" \\ \n \t and \xHH have their
// usual meaning, and *N behind the closing quote repeats the text N times.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_REQUEST_LINE_H
#define NAMES_REQUEST_LINE_H

#include <string>

#include "message.h"

namespace names {

// False, and `request` undefined, when the line is not written as above.
bool parse(const std::string& line, Request& request);

// In quotes and escaped; the middle of a long text is replaced by its length.
std::string quoted(const std::string& text);

// Control bytes are escaped and the middle of a long line is replaced by its length.
std::string shortened(const std::string& line);

}  // namespace names

#endif
