// SPDX-License-Identifier: MIT
#include "message.h"

#include <kel/exceptions/standard.h>

#include <cstdio>
#include <cstring>
#include <sstream>

namespace names {

namespace {

const std::size_t kHeaderSize = 9;  // eight digits and a newline

[[noreturn]] void refuse(const char* reason) { throw CORBA_MARSHAL(0, CORBA::COMPLETED_NO, reason); }

// The length that a header states.
std::size_t parse_header(const std::string& received) {
    const std::string digits = received.substr(0, kHeaderSize - 1);
    if (digits.find_first_not_of("0123456789abcdef") != std::string::npos ||
        received[kHeaderSize - 1] != '\n') {
        refuse("the message does not begin with a length");
    }
    const unsigned long length = std::stoul(digits, nullptr, 16);
    if (length > kLongestMessage) refuse("the message is too long");
    return length;
}

bool has_value(const char* operation) {
    return std::strcmp(operation, "bind") == 0 || std::strcmp(operation, "rebind") == 0;
}

}  // namespace

std::string framed(const std::string& text) {
    char header[kHeaderSize + 1];
    std::snprintf(header, sizeof header, "%08lx\n", static_cast<unsigned long>(text.size()));
    return header + text;
}

bool FrameReader::next(std::string& message) {
    if (_received.size() < kHeaderSize) return false;
    const std::size_t length = parse_header(_received);
    if (_received.size() < kHeaderSize + length) return false;
    message = _received.substr(kHeaderSize, length);
    _received.erase(0, kHeaderSize + length);
    return true;
}

void write(KELostream& out, const Request& request) {
    out << request.operation.in() << request.context.in() << request.name.in();
    if (has_value(request.operation)) out << request.value.in();
}

Request read_request(const std::string& text) {
    std::istringstream stream(text);
    KEListream in(stream);
    Request request;
    read_string(in, stream, request.operation);
    read_string(in, stream, request.context);
    read_string(in, stream, request.name);
    if (has_value(request.operation)) read_string(in, stream, request.value);
    if (stream.rdbuf()->in_avail() > 0) refuse("the request has a rest that is not understood");
    return request;
}

// The length is looked at before the string is read: the stream would allocate as much as it says.
void read_string(KEListream& in, std::istream& text, CORBA_String_var& value) {
    const std::streamoff start = text.rdbuf()->pubseekoff(0, std::ios_base::cur, std::ios_base::in);
    unsigned long length = 0;
    if (!(text >> length)) refuse("a string is missing");
    const std::streamsize rest = text.rdbuf()->in_avail();
    if (length == 0 || length > static_cast<unsigned long>(rest > 0 ? rest : 0) + 1) {
        refuse("a string has a length that is not its own");
    }
    if (length > 1 && text.rdbuf()->sgetc() != '"') refuse("a string is not in quotes");
    text.rdbuf()->pubseekpos(start, std::ios_base::in);
    in >> value;
    if (text.fail()) refuse("a string breaks off");
    if (std::strlen(value) + 1 != length) refuse("a string has a length that is not its own");
}

}  // namespace names
