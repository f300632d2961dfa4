// SPDX-License-Identifier: MIT
#include <kel/streams/internal/console.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/text.h>
#include <kel/streams/ostream.h>

#include <cctype>
#include <cstring>
#include <cwchar>

using kel::internal::Escape;
using kel::internal::escapes;
using kel::internal::is_cout_or_cerr;
using kel::internal::text;

namespace {

// The letter that escapes `c`, or 0.
char escape_letter(char c) {
    for (const Escape& escape : escapes) {
        if (c == escape.byte) return escape.letter;
    }
    return 0;
}

// Writes one character of a quoted string and returns how many it took.
std::uint32_t write_escaped(std::ostream& out, char c) {
    if (const char letter = escape_letter(c)) {
        out.put('\\').put(letter);
        return 2;
    }
    const unsigned char byte = static_cast<unsigned char>(c);
    if (std::isprint(byte)) {
        out.put(c);
        return 1;
    }
    static const char digits[] = "0123456789abcdef";
    out.put('\\').put('x').put(digits[byte >> 4]).put(digits[byte & 15]);
    return 4;
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
    out << length;
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
    out.put('"');
    _offset += 1;
    for (; *s != '\0'; ++s) _offset += write_escaped(out, *s);
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
