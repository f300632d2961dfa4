// What reading a string must give, worked out a second time from the same bytes.
//
//   expect_quoted   a string in quotes, as getCString reads it into a buffer
//   expect_string   a length and then such a string, as operator>> reads it
//
//     const Quoted expected = expect_quoted(twin.stream, room);
//     in.getCString(buffer, room);
//     KEL_REQUIRE(in.cur_in_offset() == expected.offset);
//
// This reader goes back a byte where the library looks ahead, and so needs a stream that can. The
// stored bytes of the last string lie in expected_bytes.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FUZZ_QUOTED_TEXT_H
#define KEL_FUZZ_QUOTED_TEXT_H

#include <cctype>
#include <istream>
#include <string_view>

#include "fuzz/target.h"

namespace kel {
namespace fuzz {

inline char expected_bytes[largest_input];

struct Quoted {
    std::uint32_t stored = 0;    // bytes taken from the text
    std::uint32_t filled = 0;    // bytes of 0xff behind them, when the text ends inside the quotes
    bool terminated = false;     // whether a zero follows
    std::uint32_t offset = 0;    // what the reading counts
    std::string_view complaint;  // what is reported
};

struct ExpectedString {
    bool null = false;
    bool refused = false;    // there is no memory for the length
    std::uint32_t room = 0;  // bytes of the string that are known to be there, the last one a zero
    std::uint32_t offset = 0;
    Quoted text;
};

// Up to two digits as "%2x" reads them: blanks, a sign, digits up to the first that is none.
inline char expect_hexadecimal(std::istream& in) {
    char text[3] = "";
    for (int i = 0; i < 2; ++i) {
        const int c = in.get();
        if (c == std::char_traits<char>::eof()) break;
        if (c == '\n') {
            in.unget();
            break;
        }
        text[i] = static_cast<char>(c);
    }
    const char* p = text;
    while (std::isspace(static_cast<unsigned char>(*p))) ++p;
    const bool negative = *p == '-';
    if (*p == '-' || *p == '+') ++p;
    int value = 0;
    for (; std::isxdigit(static_cast<unsigned char>(*p)); ++p) {
        value = 16 * value + (*p <= '9' ? *p - '0' : (*p | 32) - 'a' + 10);
    }
    return static_cast<char>(negative ? -value : value);
}

inline char expect_escape(std::istream& in, std::uint32_t& offset) {
    const int c = in.get();
    ++offset;
    switch (c) {
        case '"':
        case '\\':
            return static_cast<char>(c);
        case '[':
            return '{';
        case ']':
            return '}';
        case 'b':
            return 8;
        case 't':
            return 9;
        case 'n':
            return 10;
        case 'f':
            return 12;
        case 'r':
            return 13;
        case 'x':
            offset += 3;
            return expect_hexadecimal(in);
    }
    if (c != std::char_traits<char>::eof()) in.unget();
    const std::ios_base::fmtflags before = in.flags();
    int value = 0;
    in >> std::dec >> value;
    in.flags(before);
    in.get();
    return static_cast<char>(value);
}

inline Quoted expect_quoted(std::istream& in, std::uint32_t room) {
    Quoted text;
    in >> std::ws;
    int c = in.get();
    text.offset = 1;
    if (in.eof()) {
        text.complaint = "KEListream::getCString: Unexpected EOF\n";
        return text;
    }
    if (c != '"') {
        text.complaint =
            "KEListream::getCString: Error reading Object from  stream. Make sure your 'write' "
            "function and constructor from stream are correct\n";
        return text;
    }
    while ((c = in.get()) != '"') {
        ++text.offset;
        if (c == '\n') continue;
        if (c == std::char_traits<char>::eof()) {
            text.filled = room - text.stored;
            text.offset += text.filled;
        } else if (text.stored == room) {
            in.unget();
        } else {
            if (c == '\\') c = expect_escape(in, text.offset);
            expected_bytes[text.stored++] = static_cast<char>(c);
            continue;
        }
        text.complaint = "KEListream::getCString: String Overflow\n";
        return text;
    }
    if (text.stored == room) return text;
    text.terminated = true;
    in.get();
    ++text.offset;
    return text;
}

// Whether `buffer`, which had `room` bytes of Guarded::fill, is as the string leaves it.
inline bool holds(const char* buffer, std::uint32_t room, const Quoted& text) {
    if (!std::equal(buffer, buffer + text.stored, expected_bytes)) return false;
    const char* rest = buffer + text.stored;
    if (text.terminated && *rest++ != '\0') return false;
    for (std::uint32_t i = 0; i < text.filled; ++i) {
        if (*rest++ != '\xff') return false;
    }
    return Guarded::untouched(rest, buffer + room);
}

inline ExpectedString expect_string(std::istream& in) {
    ExpectedString expected;
    std::uint32_t length = 0;
    in >> length;
    expected.offset = 4;
    if (length == 0) {
        in.get();
        expected.null = true;
        expected.offset += 1;
        return expected;
    }
    expected.room = length;
    if (length == 1) {
        if (in.peek() != '"') {
            in.get();
            expected.room = 0;
            return expected;
        }
        expected.room = 2;
    }
    expected.refused = expected.room >= largest_block;
    if (expected.refused) return expected;
    expected.text = expect_quoted(in, expected.room);
    expected.offset += expected.text.offset;
    if (length > 1 && in.peek() == '\n') in.get();
    return expected;
}

// Whether `s` is that string. Between what was stored and the last byte its contents are open.
inline bool is(const char* s, const ExpectedString& expected) {
    if (s == nullptr || expected.null || expected.refused)
        return s == nullptr && (expected.null || expected.refused);
    const Quoted& text = expected.text;
    if (!std::equal(s, s + text.stored, expected_bytes) || s[expected.room] != '\0') return false;
    if (text.filled != 0) {
        return s[text.stored] == '\xff' && s[expected.room - 1] == '\xff';
    }
    return text.terminated ? s[text.stored] == '\0' : text.stored != 0 || s[0] == '\0';
}

}  // namespace fuzz
}  // namespace kel

#endif
