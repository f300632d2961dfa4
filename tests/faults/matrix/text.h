// A text of limited length that never allocates, for what is noted while blocks are counted.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_TEXT_H
#define KEL_TESTS_FAULTS_MATRIX_TEXT_H

#include <algorithm>
#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <string>

namespace kel {
namespace test {

class Text {
public:
    void clear() { _size = 0; }

    void append(const char* bytes, std::size_t n) {
        n = std::min(n, sizeof _bytes - _size);
        std::memcpy(_bytes + _size, bytes, n);
        _size += n;
    }

    void append(const std::string& text) { append(text.data(), text.size()); }

    __attribute__((format(printf, 2, 3))) void add(const char* format, ...) {
        char line[1024];
        std::va_list arguments;
        va_start(arguments, format);
        const int n = std::vsnprintf(line, sizeof line, format, arguments);
        va_end(arguments);
        append(line, std::min(static_cast<std::size_t>(n), sizeof line - 1));
    }

    std::string str() const { return std::string(_bytes, _size); }

private:
    char _bytes[4096];
    std::size_t _size = 0;
};

}  // namespace test
}  // namespace kel

#endif
