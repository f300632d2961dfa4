// What the tables of stream operations share.
//
//   InputCase, OutputCase         one operation: what it reads or writes, and what it counts
//   show                          a number as text, a character as its code
//   OffsetAtRead, OffsetAtWrite   buffers that note the offset when the first character passes
//   Broken                        a buffer that throws whenever it is asked for or given a character
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STREAMS_CASE_FIXTURES_H
#define KEL_TESTS_STREAMS_CASE_FIXTURES_H

#include <functional>
#include <string>

#include "tests/streams/fixtures.h"

struct InputCase {
    const char* name;
    const char* text;
    std::function<KEListream&(KEListream&, std::string&)> read;  // shows what was read
    const char* shown;
    unsigned long offset;
};

inline void PrintTo(const InputCase& c, std::ostream* os) { *os << c.name; }

struct OutputCase {
    const char* name;
    std::function<KELostream&(KELostream&)> write;
    const char* text;
    unsigned long offset;
};

inline void PrintTo(const OutputCase& c, std::ostream* os) { *os << c.name; }

template <class T>
std::string show(T value) {
    return std::to_string(+value);
}

struct OffsetAtRead : std::stringbuf {
    explicit OffsetAtRead(const std::string& text) : content(text) {}
    int_type underflow() override {
        at_first = in->cur_in_offset();
        if (done) return traits_type::eof();
        done = true;
        setg(&content[0], &content[0], &content[0] + content.size());
        return traits_type::to_int_type(content[0]);
    }
    std::string content;
    KEListream* in = nullptr;
    bool done = false;
    unsigned long at_first = 0;
};

struct OffsetAtWrite : std::stringbuf {
    int_type overflow(int_type c) override {
        note();
        return std::stringbuf::overflow(c);
    }
    std::streamsize xsputn(const char* s, std::streamsize n) override {
        note();
        return std::stringbuf::xsputn(s, n);
    }
    void note() {
        if (!seen) at_first = out->cur_out_offset();
        seen = true;
    }
    KELostream* out = nullptr;
    bool seen = false;
    unsigned long at_first = 0;
};

struct Broken : std::streambuf {
    int_type underflow() override { throw 1; }
    int_type overflow(int_type) override { throw 1; }
};

#endif
