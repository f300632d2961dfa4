// SPDX-License-Identifier: MIT
#include <kel/core/internal/digits.h>
#include <kel/streams/internal/areas.h>
#include <kel/streams/internal/console.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/own_functions.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/runs.h>
#include <kel/streams/internal/text.h>
#include <kel/streams/ostream.h>

#include <algorithm>
#include <cctype>
#include <cstring>
#include <cwchar>

using kel::internal::copy_plain_run;
using kel::internal::Escape;
using kel::internal::escapes;
using kel::internal::has_own_functions;
using kel::internal::is_cout_or_cerr;
using kel::internal::longest_integer;
using kel::internal::plain_string;
using kel::internal::show_integer;
using kel::internal::text;
using kel::internal::write_bare;
using kel::internal::WriteArea;

namespace {

// The letter that escapes `c`, or 0.
char escape_letter(char c) {
    for (const Escape& escape : escapes) {
        if (c == escape.byte) return escape.letter;
    }
    return 0;
}

constexpr int longest_escape = 4;

// One character as it stands in a quoted string: 1 to 4 characters. Gives their end.
char* show_quoted(char* at, char c) {
    if (const char letter = escape_letter(c)) {
        *at++ = '\\';
        *at++ = letter;
        return at;
    }
    const unsigned char byte = static_cast<unsigned char>(c);
    if (std::isprint(byte)) {
        *at++ = c;
        return at;
    }
    static const char digits[] = "0123456789abcdef";
    *at++ = '\\';
    *at++ = 'x';
    *at++ = digits[byte >> 4];
    *at++ = digits[byte & 15];
    return at;
}

// Writes one character of a quoted string and returns how many it took.
std::uint32_t write_quoted(std::ostream& out, char c) {
    char text[longest_escape];
    const char* const end = show_quoted(text, c);
    for (const char* at = text; at != end; ++at) out.put(*at);
    return static_cast<std::uint32_t>(end - text);
}

constexpr std::size_t quotes_and_newline = 3;
constexpr std::size_t closing = 2;

// The quoted form of `n` characters in front of `end`, where there is room for it unless escapes make it
// longer. Gives its end, or null when there may be no room: then its beginning is there.
char* show_quoted_runs(char* at, const char* end, const char* s, std::size_t n) {
    *at++ = '"';
    for (;;) {
        const std::size_t run = copy_plain_run(at, s, n);
        at += run;
        if (run == n) break;
        s += run;
        n -= run;
        if (static_cast<std::size_t>(end - at) < longest_escape + n + closing) return nullptr;
        at = show_quoted(at, *s++);
        --n;
    }
    *at++ = '"';
    *at++ = '\n';
    return at;
}

// Writes the quoted form to a plain stream over a string, which makes room where there is none. Returns the
// number of its characters: what is refused because there is no memory counts all the same.
std::size_t write_quoted_runs(std::ostream& out, const char* s, std::size_t n) {
    std::streambuf& string = *out.rdbuf();
    std::size_t count = quotes_and_newline;
    out.put('"');
    while (n > 0) {
        char* const begin = WriteArea::begin(string);
        char* const end = out.good() ? WriteArea::end(string) : begin;
        const std::size_t run = copy_plain_run(begin, s, std::min(n, static_cast<std::size_t>(end - begin)));
        char* at = begin + run;
        s += run;
        n -= run;
        const bool fits = n > 0 && end - at >= longest_escape;
        if (fits) at = show_quoted(at, *s);
        WriteArea::fill(string, static_cast<std::size_t>(at - begin));
        count += static_cast<std::size_t>(at - begin);
        if (n == 0) break;
        if (!fits) count += write_quoted(out, *s);
        ++s;
        --n;
    }
    out.put('"').put('\n');
    return count;
}

// A string and its length straight into the memory of a plain stream's string. Returns the number of
// characters of the quoted form; 0, and nothing is written, for any other stream and where there may be no
// room.
std::size_t show_string(std::streambuf* string, const char* s, std::size_t n) {
    if (string == nullptr || WriteArea::room(*string) < longest_integer + n + quotes_and_newline) return 0;
    char* const begin = WriteArea::begin(*string);
    char* const quoted = show_integer(begin, n + 1);
    char* const end = show_quoted_runs(quoted, WriteArea::end(*string), s, n);
    if (end == nullptr) return 0;
    WriteArea::fill(*string, static_cast<std::size_t>(end - begin));
    return static_cast<std::size_t>(end - quoted);
}

}  // namespace

KELostream& KELostream::operator<<(const char* s) {
    std::ostream& out = text(_strm);
    const std::size_t n = s == nullptr ? 0 : std::strlen(s);
    const unsigned long length = s == nullptr ? 0 : n + 1;
    if (is_cout_or_cerr(&out)) {
        if (s != nullptr) out << s;
        _offset += static_cast<std::uint32_t>(length);
        return *this;
    }
    // Both parts at once, which takes half as long.
    if (n > 0 && has_own_functions(*this)) {
        if (const std::size_t quoted = show_string(plain_string(out), s, n)) {
            _offset += 4 + static_cast<std::uint32_t>(quoted);
            return *this;
        }
    }
    write_bare(out, length);
    _offset += 4;
    if (length <= 1) {
        out << " ";
        _offset += 1;
        return *this;
    }
    putCString(s);
    return *this;
}

KELostream& KELostream::putCString(const char* s) {
    std::ostream& out = text(_strm);
    if (plain_string(out) != nullptr) {
        _offset += static_cast<std::uint32_t>(write_quoted_runs(out, s, std::strlen(s)));
        return *this;
    }
    out.put('"');
    _offset += 1;
    for (; *s != '\0'; ++s) _offset += write_quoted(out, *s);
    out.put('"').put('\n');
    _offset += 2;
    return *this;
}

// Deliberate: the length is not written, the reader must be given it. Pinned by
// WideStrings.TheLengthIsNotWritten.
KELostream& KELostream::operator<<(const wchar_t* ws) {
    std::ostream& out = text(_strm);
    const std::uint32_t length = ws == nullptr ? 0 : static_cast<std::uint32_t>(std::wcslen(ws));
    if (is_cout_or_cerr(&out)) {
        // Deliberate: a console shows the address, for it takes no wide characters. Pinned by
        // ConsoleWideStrings.CoutShowsTheAddress.
        out << static_cast<const void*>(ws) << " ";
        _offset += 4 * length + 1;
        return *this;
    }
    out << " ";
    put(ws, length);
    out << " ";
    _offset += 4 * length + 2;
    return *this;
}
