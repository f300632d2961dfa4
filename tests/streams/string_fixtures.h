// What the tests of narrow strings share.
//
//   StringRead   one string read with operator>>, and what std::cerr got to see
//   BufferRead   one quoted string read with getCString into a guarded buffer
//   OwnQuotes    a stream whose quoted form is its own
//   NoWayBack    a buffer that cannot take a character back
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STREAMS_STRING_FIXTURES_H
#define KEL_TESTS_STREAMS_STRING_FIXTURES_H

#include <kel/containers/strings.h>

#include <iostream>
#include <string>
#include <vector>

#include "tests/streams/fixtures.h"

const char eof_message[] = "KEListream::getCString: Unexpected EOF\n";
const char object_message[] =
    "KEListream::getCString: Error reading Object from  stream. "
    "Make sure your 'write' function and constructor from stream are correct\n";
const char overflow_message[] = "KEListream::getCString: String Overflow\n";

// Reads one string with operator>> and keeps it and the messages.
struct StringRead {
    explicit StringRead(const std::string& input, char* before = nullptr) : reader(input), s(before) {
        Swapped errors(std::cerr);
        result = &(reader.in >> s);
        messages = errors.text();
    }
    ~StringRead() { CORBA::string_free(s); }

    Reader reader;
    char* s;
    KEListream* result = nullptr;
    std::string messages;
};

// Reads one quoted string into a buffer of `room` bytes, filled with '#' and guarded behind.
struct BufferRead {
    BufferRead(const std::string& input, unsigned int room,
               const std::locale& locale = std::locale::classic())
        : reader(input), buffer(room + 8, '#') {
        reader.text.imbue(locale);
        Swapped errors(std::cerr);
        result = &reader.in.getCString(&buffer[0], room);
        messages = errors.text();
    }
    unsigned long offset() const { return reader.in.cur_in_offset(); }

    Reader reader;
    std::string buffer;
    KEListream* result = nullptr;
    std::string messages;
};

class NoWayBack : public std::streambuf {
public:
    explicit NoWayBack(const std::string& text) : _text(text) {}
    std::string rest() const { return _text.substr(_next); }

protected:
    int_type underflow() override {
        return _next < _text.size() ? traits_type::to_int_type(_text[_next]) : traits_type::eof();
    }
    int_type uflow() override {
        const int_type c = underflow();
        if (_next < _text.size()) ++_next;
        return c;
    }

private:
    std::string _text;
    std::size_t _next = 0;
};

struct OwnQuotes : KELostream {
    explicit OwnQuotes(std::ostream& out) : KELostream(out) {}
    KELostream& putCString(const char* s) override {
        quoted.push_back(s);
        return *this;
    }
    std::vector<std::string> quoted;
};

#endif
