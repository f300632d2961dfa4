// SPDX-License-Identifier: MIT
#include <kel/streams/internal/areas.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/quoted_text.h>
#include <kel/streams/internal/runs.h>

#include <algorithm>

namespace kel {
namespace internal {

namespace {

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

// Stores what a text stands for.
class Unquoting {
public:
    Unquoting(const char* begin, const char* end, QuotedTarget& to) : _at(begin), _end(end), _to(to) {}

    // Gives the first character that is not stored.
    const char* run() {
        while (_at != _end) {
            copy_run();
            if (_at == _end || _to.room == 0) break;
            if (*_at == '\n') {
                ++_at;
                ++_to.offset;
            } else if (*_at != '\\' || !unescape()) {
                break;
            }
        }
        return _at;
    }

private:
    void copy_run() {
        const std::size_t most = std::min<std::size_t>(static_cast<std::size_t>(_end - _at), _to.room);
        const std::uint32_t n = static_cast<std::uint32_t>(copy_quoted_run(_to.buf, _at, most));
        advance(n, n, n);
    }

    bool unescape() {
        char byte;
        const int n = read_escape(_at + 1, _end, byte);
        if (n == 0) return false;
        *_to.buf = byte;
        // A hexadecimal escape counts one more than it has characters, as it does character by character.
        advance(1 + n, 1, n == 1 ? 2 : 5);
        return true;
    }

    void advance(std::ptrdiff_t read, std::uint32_t stored, std::uint32_t counted) {
        _at += read;
        _to.buf += stored;
        _to.room -= stored;
        _to.offset += counted;
    }

    const char* _at;
    const char* const _end;
    QuotedTarget& _to;
};

}  // namespace

void read_quoted_text(std::istream& in, QuotedTarget& to) {
    std::streambuf& string = *in.rdbuf();
    const char* const begin = ReadArea::begin(string);
    ReadArea::consume(string, Unquoting(begin, ReadArea::end(string), to).run() - begin);
}

}  // namespace internal
}  // namespace kel
