// SPDX-License-Identifier: MIT
#include <kel/streams/internal/console.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/plain_runs.h>
#include <kel/streams/internal/text.h>
#include <kel/streams/ostream.h>

#include <cctype>
#include <cstring>
#include <cwchar>

using kel::internal::Escape;
using kel::internal::escapes;
using kel::internal::is_cout_or_cerr;
using kel::internal::is_over_string;
using kel::internal::is_plain;
using kel::internal::plain_run;
using kel::internal::text;
using kel::internal::write_bare;
using kel::internal::write_to_string;

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

// Collects characters for a string buffer, which is given them in blocks.
class Block {
public:
    explicit Block(std::ostream& out) : _out(out) {}

    void add(const char* text, std::size_t n) {
        if (n > room()) flush();
        if (n > room()) {
            _out.write(text, static_cast<std::streamsize>(n));
            _flushed += n;
            return;
        }
        std::memcpy(_end, text, n);
        _end += n;
    }

    void add_quoted(char c) {
        if (room() < longest_escape) flush();
        _end = show_quoted(_end, c);
    }

    // Writes what is left and a last character, and gives the number of characters in all.
    std::size_t finish(char last) {
        const std::size_t n = static_cast<std::size_t>(_end - _text);
        if (_out.good()) {
            write_to_string(_out, _text, _end - _text, last);
        } else {
            _out.put(last);  // refused
        }
        return _flushed + n + 1;
    }

private:
    std::size_t room() const { return static_cast<std::size_t>(_text + sizeof _text - _end); }

    void flush() {
        _out.write(_text, _end - _text);
        _flushed += static_cast<std::size_t>(_end - _text);
        _end = _text;
    }

    std::ostream& _out;
    std::size_t _flushed = 0;
    char* _end = _text;
    char _text[512];
};

// The quoted form. Returns the number of its characters.
std::size_t write_in_blocks(std::ostream& out, const char* s) {
    KEL_UNINITIALIZED Block block(out);
    block.add("\"", 1);
    for (std::size_t left = std::strlen(s); left > 0;) {
        const std::size_t run = plain_run(s, left);
        block.add(s, run);
        s += run;
        left -= run;
        if (left == 0) break;
        block.add_quoted(*s++);
        --left;
    }
    block.add("\"", 1);
    return block.finish('\n');
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
    if (is_plain(out) && is_over_string(out)) {
        _offset += static_cast<std::uint32_t>(write_in_blocks(out, s));
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
