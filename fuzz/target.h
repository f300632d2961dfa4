// What the fuzz targets share.
//
//   KEL_REQUIRE     ends the process when a promise of the library is broken
//   Bytes           takes numbers and texts off the front of an input
//   Guarded         memory that ends where touching one byte more ends the process
//   Complaints      collects what the library writes to std::cerr
//   largest_block   the most that operator new gives; beyond it there is no memory
//
// A target is one function that libFuzzer calls with an input, and that the replay program calls with
// each file of the corpus:
//
//     extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
//         Bytes input(data, size);
//         ...
//         KEL_REQUIRE(in.cur_in_offset() == expected);
//         return 0;
//     }
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FUZZ_TARGET_H
#define KEL_FUZZ_TARGET_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <iostream>
#include <streambuf>
#include <string_view>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace kel {
namespace fuzz {

[[noreturn]] void broken(const char* promise, const char* file, int line);

#define KEL_REQUIRE(promise) \
    ((promise) ? static_cast<void>(0) : kel::fuzz::broken(#promise, __FILE__, __LINE__))

// Longer inputs are left alone; the targets keep buffers of this size.
constexpr std::size_t largest_input = 4096;

// Sanitizers end the process when a block is too large for them, where the system throws. A target may
// set a smaller limit, so that a false length is found out quickly.
constexpr std::size_t most_memory = std::size_t(64) << 20;
extern std::size_t largest_block;

class Bytes {
public:
    Bytes(const std::uint8_t* data, std::size_t size) : _rest(reinterpret_cast<const char*>(data), size) {}

    std::string_view rest() const { return _rest; }
    bool empty() const { return _rest.empty(); }

    // 0 when there is none left.
    std::uint8_t byte() { return number<std::uint8_t>(); }

    // Missing bytes are zeros.
    template <class T>
    T number() {
        T value = T();
        const std::size_t n = std::min(sizeof value, _rest.size());
        if (n != 0) std::memcpy(&value, _rest.data(), n);
        _rest.remove_prefix(n);
        return value;
    }

    // The bytes up to the next zero, which is dropped.
    std::string_view text() {
        const std::string_view found = _rest.substr(0, _rest.find('\0'));
        _rest.remove_prefix(std::min(found.size() + 1, _rest.size()));
        return found;
    }

private:
    std::string_view _rest;
};

// One such object serves one block at a time, for the life of the process.
class Guarded {
public:
    static constexpr char fill = '\xa5';

    // Room for blocks of up to `size` bytes.
    explicit Guarded(std::size_t size);
    Guarded(const Guarded&) = delete;
    Guarded& operator=(const Guarded&) = delete;

    // A block of `n` bytes, each of them `fill`.
    char* block(std::size_t n) {
        char* const start = _end - n;
        std::memset(start - margin, fill, n + margin);
        return start;
    }

    // A block that holds `text` and a zero.
    const char* text(std::string_view text) {
        char* const start = block(text.size() + 1);
        std::copy(text.begin(), text.end(), start);
        start[text.size()] = '\0';
        return start;
    }

    // Whether the bytes from `from` to `to` are as block() left them. What lies before a block belongs
    // to the check.
    static bool untouched(const char* from, const char* to) {
        return std::all_of(from, to, [](char c) { return c == fill; });
    }
    static bool untouched_before(const char* start) { return untouched(start - margin, start); }

private:
    static constexpr std::size_t margin = 16;

    char* _end;
};

class Complaints : private std::streambuf {
public:
    Complaints() : _before(std::cerr.rdbuf(this)) { take(); }
    ~Complaints() override { std::cerr.rdbuf(_before); }

    // What was written since the last call. It stays valid until more is written.
    std::string_view take() {
        const std::string_view text(_text,
                                    pptr() == nullptr ? 0 : static_cast<std::size_t>(pptr() - pbase()));
        setp(_text, _text + sizeof _text);
        return text;
    }

private:
    char _text[1024];
    std::streambuf* _before;
};

}  // namespace fuzz
}  // namespace kel

#endif
