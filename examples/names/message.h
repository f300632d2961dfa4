// What client and server say to each other.
//
//   Request        an operation on one context of the service
//   FrameReader    cuts the bytes of a connection into messages
//   framed         a message with its length in front
//   write, read    a request in its marshalled form
//
// A message is eight hexadecimal digits (the number of bytes that follow), a newline, and text that a
// KELostream wrote. A request is the operation, the context, the name and, for bind and rebind, the
// value. A reply is a status, kOk with the result behind it or kException with the repository id
// and the body of an exception.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_MESSAGE_H
#define NAMES_MESSAGE_H

#include <kel/containers/strings.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cstddef>
#include <istream>
#include <string>

namespace names {

const unsigned long kOk = 0;
const unsigned long kException = 1;

// Longer messages are refused before memory is spent on them.
const std::size_t kLongestMessage = 1024 * 1024;

struct Request {
    CORBA_String_var operation;  // "bind", "rebind", "resolve", "unbind" or "list"
    CORBA_String_var context;    // names are unique within a context
    CORBA_String_var name;
    CORBA_String_var value;  // of bind and rebind
};

// The message `text` as it travels.
std::string framed(const std::string& text);

// Collects what a connection delivers.
class FrameReader {
public:
    void append(const char* bytes, std::size_t n) { _received.append(bytes, n); }

    // Takes the next complete message out; false when more bytes must come first. Throws
    // CORBA::MARSHAL when there is no length where one should be, or one that is too large: nothing
    // that follows can be understood then.
    bool next(std::string& message);

private:
    std::string _received;
};

void write(KELostream& out, const Request& request);

// Throws CORBA::MARSHAL when `text` is not the text of a request.
Request read_request(const std::string& text);

// A string of a message; `text` is the standard stream of `in`. Throws CORBA::MARSHAL when there is no
// string, and for a length that the message cannot hold.
void read_string(KEListream& in, std::istream& text, CORBA_String_var& value);

}  // namespace names

#endif
