// SPDX-License-Identifier: MIT
#include <kel/core/internal/attributes.h>
#include <kel/streams/internal/areas.h>
#include <kel/streams/internal/console.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/runs.h>
#include <kel/streams/internal/text.h>
#include <kel/streams/ostream.h>

#include <cctype>
#include <cstring>
#include <cwchar>

using kel::internal::Escape;
using kel::internal::escapes;
using kel::internal::is_cout_or_cerr;
using kel::internal::is_plain_string;
using kel::internal::plain_run;
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

// Puts pieces of a quoted string straight into the room that a string buffer has, and those for which there
// is none through the stream, which makes more. What is refused there counts all the same.
class Quoting {
public:
    explicit Quoting(std::ostream& out) : _out(out), _string(*out.rdbuf()) { look(); }
    ~Quoting() { WriteArea::fill(_string, filled()); }
    Quoting(const Quoting&) = delete;
    Quoting& operator=(const Quoting&) = delete;

    void add(const char* text, std::size_t n) {
        _count += n;
        if (n > static_cast<std::size_t>(_end - _at)) {
            write(text, n);
            return;
        }
        if (n == 0) return;  // and perhaps no room at all
        std::memcpy(_at, text, n);
        _at += n;
    }

    void add(char c) { add(&c, 1); }

    void add_quoted(char c) {
        KEL_UNINITIALIZED char text[longest_escape];
        add(text, static_cast<std::size_t>(show_quoted(text, c) - text));
    }

    std::size_t count() const { return _count; }

private:
    // There is no room behind a piece that was refused.
    void look() {
        _begin = WriteArea::begin(_string);
        _end = _out.good() ? WriteArea::end(_string) : _begin;
        _at = _begin;
    }

    std::size_t filled() const { return static_cast<std::size_t>(_at - _begin); }

    void write(const char* text, std::size_t n) {
        WriteArea::fill(_string, filled());
        _begin = _at;
        _out.write(text, static_cast<std::streamsize>(n));
        look();
    }

    std::ostream& _out;
    std::streambuf& _string;
    std::size_t _count = 0;
    char* _begin;
    char* _at;
    char* _end;
};

// The quoted form. Returns the number of its characters.
std::size_t write_quoted_runs(std::ostream& out, const char* s) {
    KEL_UNINITIALIZED Quoting quoting(out);
    quoting.add('"');
    for (std::size_t left = std::strlen(s); left > 0;) {
        const std::size_t run = plain_run(s, left);
        quoting.add(s, run);
        s += run;
        left -= run;
        if (left == 0) break;
        quoting.add_quoted(*s++);
        --left;
    }
    quoting.add('"');
    quoting.add('\n');
    return quoting.count();
}

}  // namespace

KELostream& KELostream::operator<<(const char* s) {
    std::ostream& out = text(_strm);
    const unsigned long length = s == nullptr ? 0 : std::strlen(s) + 1;
    if (is_cout_or_cerr(&out)) {
        if (s != nullptr) out << s;
        _offset += static_cast<std::uint32_t>(length);
        return *this;
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
    if (is_plain_string(out)) {
        _offset += static_cast<std::uint32_t>(write_quoted_runs(out, s));
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
