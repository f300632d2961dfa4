// SPDX-License-Identifier: MIT
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/quoted_block.h>

#include <algorithm>
#include <cstring>
#include <istream>

namespace kel {
namespace internal {

namespace {

constexpr std::uint32_t block_size = 1024;

const char* find(const char* begin, const char* end, char c) {
    const void* const found = std::memchr(begin, c, static_cast<std::size_t>(end - begin));
    return found != nullptr ? static_cast<const char*>(found) : end;
}

// 0 to 15, or -1 for what is no hexadecimal digit.
int hexadecimal(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

// An escape that the writer makes, of which `text` is what stands behind the backslash. Gives the number
// of its characters there, or 0 for any other and for one that is cut off.
int read_escape(const char* text, const char* end, char& byte) {
    if (text == end) return 0;
    for (const Escape& escape : escapes) {
        if (*text != escape.letter) continue;
        byte = escape.byte;
        return 1;
    }
    if (*text != 'x' || end - text < 3) return 0;
    const int upper = hexadecimal(text[1]);
    const int lower = hexadecimal(text[2]);
    if (upper < 0 || lower < 0) return 0;
    byte = static_cast<char>(upper * 16 + lower);
    return 3;
}

// Stores what a block stands for, up to the quote at its end, if there is one, or up to an escape that is
// not the writer's.
class Unquoting {
public:
    Unquoting(const char* begin, const char* end, QuotedTarget& to) : _at(begin), _end(end), _to(to) {}

    // Gives the first character that is not stored.
    const char* run() {
        const char* newline = find(_at, _end, '\n');
        const char* backslash = find(_at, _end, '\\');
        for (;;) {
            copy_up_to(std::min(newline, backslash));
            if (_at == _end) return _at;
            if (_at == newline) {
                ++_at;
                ++_to.offset;
                newline = find(_at, _end, '\n');
                continue;
            }
            if (!unescape()) return _at;
            backslash = find(_at, _end, '\\');
        }
    }

private:
    void copy_up_to(const char* stop) {
        const std::uint32_t n = static_cast<std::uint32_t>(stop - _at);
        std::memcpy(_to.buf, _at, n);
        advance(stop, n, n);
    }

    bool unescape() {
        char byte;
        const int n = read_escape(_at + 1, _end, byte);
        if (n == 0) return false;
        *_to.buf = byte;
        // A hexadecimal escape counts one more than it has characters, as it does character by character.
        advance(_at + 1 + n, 1, n == 1 ? 2 : 5);
        return true;
    }

    void advance(const char* at, std::uint32_t stored, std::uint32_t counted) {
        _at = at;
        _to.buf += stored;
        _to.room -= stored;
        _to.offset += counted;
    }

    const char* _at;
    const char* const _end;
    QuotedTarget& _to;
};

}  // namespace

void read_run(std::istream& in, QuotedTarget& to) {
    std::streambuf& from = *in.rdbuf();
    for (; to.room > 0; --to.room, ++to.offset) {
        const int c = from.sgetc();
        if (c == '"' || c == '\\' || c == '\n' || c == std::char_traits<char>::eof()) return;
        *to.buf++ = static_cast<char>(c);
        from.sbumpc();
    }
}

// A character takes up one byte of the room at most, so that many may be consumed at once. The standard
// stream looks for the quote in its buffer, which nobody else has access to.
AfterBlock read_block(std::istream& in, QuotedTarget& to) {
    KEL_UNINITIALIZED char block[block_size + 2];
    in.getline(block, static_cast<std::streamsize>(std::min(block_size, to.room)) + 1, '"');
    const char* end = block + in.gcount();
    const bool quoted = in.good();
    if (!in.eof()) in.clear();  // the block was full before a quote came

    const char* const stop = Unquoting(block, quoted ? end - 1 : end, to).run();
    if (stop == end) return AfterBlock::open;
    if (quoted && stop == end - 1) {
        if (to.room > 0) return AfterBlock::closed;
        in.rdbuf()->sungetc();  // the last character that is read is then read by itself
        return AfterBlock::open;
    }
    if (quoted && stop == end - 2) {
        // The quote is escaped: one that closed the string would not stand behind a backslash.
        *to.buf++ = '"';
        --to.room;
        to.offset += 2;
        return AfterBlock::open;
    }
    in.clear();
    for (; end != stop; --end) in.rdbuf()->sungetc();
    return AfterBlock::odd;
}

}  // namespace internal
}  // namespace kel
