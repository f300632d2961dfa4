// SPDX-License-Identifier: MIT
#include <kel/containers/internal/free_string.h>
#include <kel/core/internal/attributes.h>
#include <kel/streams/internal/areas.h>
#include <kel/streams/internal/console.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/own_functions.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/quoted_text.h>
#include <kel/streams/internal/runs.h>
#include <kel/streams/internal/short_way.h>
#include <kel/streams/internal/text.h>
#include <kel/streams/istream.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <new>
#include <string>

using kel::internal::copy_quoted_run;
using kel::internal::error_stream;
using kel::internal::Escape;
using kel::internal::escapes;
using kel::internal::extract_value;
using kel::internal::free_string;
using kel::internal::has_own_functions;
using kel::internal::InputCount;
using kel::internal::is_cin;
using kel::internal::plain_string;
using kel::internal::QuotedTarget;
using kel::internal::read_quoted_text;
using kel::internal::read_value;
using kel::internal::ReadArea;
using kel::internal::scan_in_string;
using kel::internal::text;

namespace {

constexpr int end_of_input = std::char_traits<char>::eof();

// Lengths come from a peer and may be any 32-bit number. What no array of a 32-bit process can hold
// is refused at 64 bits too, so that a false length ends alike at both widths.
constexpr std::uint32_t largest_array = 0x7fffffff;

// A string of `length` bytes and a terminator behind them, empty for the time being. It is made as
// CORBA::string_alloc makes one, without the call, which short strings would feel.
char* new_string(std::uint32_t length) {
    if (length >= largest_array) throw std::bad_alloc();
    char* const s = new char[length + 1];
    s[0] = '\0';
    s[length] = '\0';
    return s;
}

// An array of `n` zeros, with one more behind them for readers that take it for a string.
wchar_t* new_wide_array(std::uint32_t n) {
    if (n >= largest_array / sizeof(wchar_t)) throw std::bad_alloc();
    return new wchar_t[n + 1]();
}

// The characters of a stream one by one, in the shortest way that it has.
class Characters {
public:
    explicit Characters(std::istream& in) : _in(in), _in_memory(plain_string(in) != nullptr) {}

    bool in_memory() const { return _in_memory; }
    int peek() { return _in_memory ? kel::internal::peek(_in) : _in.peek(); }
    int take() { return _in_memory ? kel::internal::take(_in) : _in.get(); }

private:
    std::istream& _in;
    const bool _in_memory;
};

// A string without escapes that lies in memory from its opening quote to the character behind its closing
// one, as most do. False, and nothing is read, for any other and where there is no room for it and its
// terminator: `buf` has then the beginning of what will be stored there.
bool take_whole_string(std::istream& in, std::streambuf& string, char* buf, std::uint32_t room,
                       std::uint32_t& offset) {
    const char* const begin = ReadArea::begin(string);
    const std::ptrdiff_t there = ReadArea::end(string) - begin;
    if (there < 3 || *begin != '"') return false;
    const char* const contents = begin + 1;
    const std::size_t most = std::min<std::size_t>(static_cast<std::size_t>(there) - 2, room);
    const std::size_t n = copy_quoted_run(buf, contents, most);
    if (n == most || contents[n] != '"') return false;
    buf[n] = '\0';
    ReadArea::consume(string, static_cast<std::ptrdiff_t>(n) + 3);
    InputCount::set(in, 1);
    offset += static_cast<std::uint32_t>(n) + 2;
    return true;
}

// Whether memory has the next character and it is not `c`. Then it has been peeked at.
bool another_comes_next(std::istream& in, const std::streambuf& string, char c) {
    const char* const at = ReadArea::begin(string);
    if (at == ReadArea::end(string) || *at == c) return false;
    InputCount::set(in, 0);
    return true;
}

// Consumes the opening quote if it comes next, as it does where the writer has been.
bool take_quote(std::istream& in) {
    std::streambuf& string = *in.rdbuf();
    const char* const at = ReadArea::begin(string);
    if (at == ReadArea::end(string) || *at != '"') return false;
    ReadArea::consume(string, 1);
    return true;
}

// Consumes white space and one character, which must be the opening quote. Otherwise reports.
bool read_opening_quote(std::istream& in) {
    in >> std::ws;
    const int c = in.get();
    if (in.eof()) {
        error_stream() << "KEListream::getCString: Unexpected EOF\n" << std::flush;
        return false;
    }
    if (c != '"') {
        error_stream() << "KEListream::getCString: Error reading Object "
                       << "from  stream. Make sure your 'write' "
                       << "function and constructor from stream are "
                       << "correct\n"
                       << std::flush;
        return false;
    }
    return true;
}

void report_overflow() { error_stream() << "KEListream::getCString: String Overflow\n" << std::flush; }

// Up to two hexadecimal digits. A newline is left for the string, where it is skipped.
char read_hexadecimal(std::istream& in) {
    char digits[3] = {};
    for (int i = 0; i < 2 && in.peek() != '\n' && in.peek() != end_of_input; ++i) {
        digits[i] = static_cast<char>(in.get());
    }
    unsigned int value = 0;
    std::sscanf(digits, "%2x", &value);
    return static_cast<char>(value);
}

// Has numbers read in decimal until the end of the scope, also when the stream throws.
class Decimal {
public:
    explicit Decimal(std::ios_base& stream)
        : _stream(stream), _flags(stream.setf(std::ios_base::dec, std::ios_base::basefield)) {}
    ~Decimal() { _stream.flags(_flags); }
    Decimal(const Decimal&) = delete;
    Decimal& operator=(const Decimal&) = delete;

private:
    std::ios_base& _stream;
    const std::ios_base::fmtflags _flags;
};

// A decimal number, whatever base the stream reads its scalars in, and the delimiter behind it.
char read_decimal(std::istream& in) {
    const Decimal base(in);
    int value = 0;
    in >> value;
    in.get();
    return static_cast<char>(value);
}

// The byte that the escape behind a backslash stands for. Its letter is looked at first: not every
// standard stream can put back what turns out to be a digit.
char read_escape(std::istream& in, std::uint32_t& offset) {
    const int c = in.peek();
    if (c == 'x') {
        in.get();
        // Deliberate: with the backslash 5, where the writer counts 4. Pinned by
        // StringEscapes.HexadecimalCountsFiveOnReading.
        offset += 3 + 1;
        return read_hexadecimal(in);
    }
    offset += 1;
    for (const Escape& escape : escapes) {
        if (c != escape.letter) continue;
        in.get();
        return escape.byte;
    }
    return read_decimal(in);
}

// Whether a character inside the quotes will be stored, by itself or with its escape.
bool takes_room(int c) { return c != '"' && c != '\n' && c != end_of_input; }

// A quoted string of any kind, character by character where it has to be.
[[gnu::noinline]] void read_quoted(std::istream& in, QuotedTarget to) {
    Characters characters(in);
    const bool quoted = (characters.in_memory() && take_quote(in)) || read_opening_quote(in);
    to.offset += 1;
    if (!quoted) return;

    for (;;) {
        if (characters.in_memory() && in.good()) read_quoted_text(in, to);
        if (to.room == 0 && takes_room(characters.peek())) {  // and stays unread
            to.offset += 1;
            report_overflow();
            return;
        }
        const int c = characters.take();
        if (c == '"') {
            if (to.room == 0) return;
            break;
        }
        if (c == end_of_input) {
            // Every further read would give the same, up to the overflow.
            std::fill_n(to.buf, to.room, '\xff');
            to.offset += to.room + 1;
            report_overflow();
            return;
        }
        to.offset += 1;
        if (c == '\n') continue;
        --to.room;
        *to.buf++ = c == '\\' ? read_escape(in, to.offset) : static_cast<char>(c);
    }
    *to.buf = '\0';
    characters.take();
    to.offset += 1;
}

// Reads a quoted string into a new one: from memory when no virtual function is to be asked. What a stream
// throws leaves that empty: nobody could tell what has been stored from what its memory held before.
[[gnu::noinline]] void read_into(KEListream& stream, char* s, std::uint32_t length, bool from_memory) {
    try {
        if (from_memory) {
            read_quoted(*stream._strm, {s, length, stream._offset});
        } else {
            stream.getCString(s, length);
        }
    } catch (...) {
        s[0] = '\0';
        throw;
    }
}

// A length by the ordinary way, which has an address and is kept out of the short one.
[[gnu::noinline]] std::uint32_t extract_length(std::istream& in) {
    std::uint32_t length = 0;
    extract_value(in, length);
    return length;
}

// What stands behind a length of 0 or 1: no string, or an empty one.
[[gnu::noinline]] void read_no_more_than_one(KEListream& stream, char*& s, std::uint32_t length) {
    std::istream& in = *stream._strm;
    if (length == 0) {
        in.get();
        stream._offset += 1;
    } else if (in.peek() == '"') {
        s = new_string(2);  // the quotes are trusted for no more than the two bytes of this room
        read_into(stream, s, 2, false);
    } else {
        in.get();
        s = new_string(0);
    }
}

// The form of std::cin: one word into the caller's own buffer. There is nothing to allocate and no
// way to know the room, so a missing buffer fails the stream.
void read_word(std::istream& in, char* s, std::uint32_t& offset) {
    if (s == nullptr) {
        in.setstate(std::ios_base::failbit);
        return;
    }
    if (in >> s) offset += static_cast<std::uint32_t>(std::strlen(s));
}

}  // namespace

KEL_FLATTEN KEListream& KEListream::operator>>(char*& s) {
    std::istream& in = text(_strm);
    if (is_cin(&in)) {
        read_word(in, s, _offset);
        return *this;
    }

    std::streambuf* const string = plain_string(in);
    KEL_UNINITIALIZED std::uint32_t length;
    const bool in_memory = string != nullptr && scan_in_string<0>(in, *string, length);
    if (!in_memory) length = extract_length(in);
    _offset += 4;
    free_string(s);
    s = nullptr;

    if (length <= 1) {
        read_no_more_than_one(*this, s, length);
        return *this;
    }
    s = new_string(length);
    const bool from_memory = in_memory && has_own_functions(*this);
    const bool taken = from_memory && take_whole_string(in, *string, s, length, _offset);
    if (taken && another_comes_next(in, *string, '\n')) return *this;
    if (!taken) read_into(*this, s, length, from_memory);
    // Deliberate: a newline here is taken even when the string had room for its terminator and the
    // newline is the next item's. Pinned by StringReading.ANewlineBehindTheStringIsTaken.
    if (in.peek() == '\n') {
        in.get();
        s[length] = '\0';
    }
    return *this;
}

KEL_FLATTEN KEListream& KEListream::getCString(char* buf, unsigned int len) {
    std::istream& in = text(_strm);
    std::streambuf* const string = plain_string(in);
    if (string == nullptr || !take_whole_string(in, *string, buf, len, _offset)) {
        read_quoted(in, {buf, len, _offset});
    }
    return *this;
}

KEListream& KEListream::operator>>(wchar_t*& ws) {
    std::uint32_t n = 0;
    read_value(text(_strm), n);
    if (ws == nullptr) ws = new_wide_array(n);
    get(ws, n);
    _offset += 4 * n;
    return *this;
}
