// SPDX-License-Identifier: MIT
// Numbers on streams, one at a time and as arrays of a thousand.
#include <bench/support/bench.h>
#include <bench/support/values.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <array>
#include <charconv>
#include <cstring>
#include <iterator>
#include <sstream>

#ifdef KEL_BENCH_FMT
#include <fmt/compile.h>
#include <fmt/format.h>
#endif

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

const std::size_t count = 1000;
const std::size_t room = 32;  // characters for one number and its separator

// ---- writing: each contender starts over after a thousand values ----

// std::to_chars, as the streams show a number: doubles with six digits.
template <class T>
char* characters(char* at, T value) {
    if constexpr (std::is_floating_point_v<T>) {
        at = std::to_chars(at, at + room, value, std::chars_format::general, 6).ptr;
    } else {
        at = std::to_chars(at, at + room, value).ptr;
    }
    *at = ' ';
    return at + 1;
}

struct Characters {
    template <class T>
    void write(T value) {
        end = characters(end, value);
    }
    template <class T>
    void write_all(const std::vector<T>& values) {
        for (T value : values) write(value);
    }
    void restart() { end = text.data(); }

    std::array<char, count * room> text;
    char* end = text.data();
};

struct Standard {
    template <class T>
    void write(T value) {
        stream << value << ' ';
    }
    template <class T>
    void write_all(const std::vector<T>& values) {
        for (T value : values) write(value);
    }
    void restart() { stream.seekp(0); }

    std::ostringstream stream;
};

struct Kel {
    template <class T>
    void write(T value) {
        out << value;
    }
    template <class T>
    void write_all(const std::vector<T>& values) {
        out.put(values.data(), static_cast<unsigned int>(values.size()));
    }
    void restart() { stream.seekp(0); }

    std::ostringstream stream;
    KELostream out{stream};
};

#ifdef KEL_BENCH_FMT
struct Fmt {
    template <class T>
    void write(T value) {
        if constexpr (std::is_floating_point_v<T>) {
            fmt::format_to(std::back_inserter(text), FMT_COMPILE("{:g} "), value);
        } else {
            fmt::format_to(std::back_inserter(text), FMT_COMPILE("{} "), value);
        }
    }
    template <class T>
    void write_all(const std::vector<T>& values) {
        for (T value : values) write(value);
    }
    void restart() { text.clear(); }

    fmt::memory_buffer text;
};
#endif

template <class Contender, class T>
void encode_one(benchmark::State& state) {
    const std::vector<T> values = bench::numbers<T>(count);
    Contender to;
    std::size_t i = 0;
    for (auto _ : state) {
        to.write(values[i]);
        if (++i < values.size()) continue;
        to.restart();
        i = 0;
    }
}

template <class Contender, class T>
void encode_all(benchmark::State& state) {
    const std::vector<T> values = bench::numbers<T>(count);
    Contender to;
    for (auto _ : state) {
        to.write_all(values);
        to.restart();
        benchmark::ClobberMemory();
    }
}

// ---- reading ----

struct FromCharacters {
    explicit FromCharacters(const std::string& text) : begin(text.data()), end(begin + text.size()) {}
    template <class T>
    void read(T& value) {
        at = std::from_chars(at, end, value).ptr + 1;
    }
    template <class T>
    void read_all(std::vector<T>& values) {
        for (T& value : values) read(value);
    }
    void restart() { at = begin; }

    const char* begin;
    const char* end;
    const char* at = begin;
};

struct FromStandard {
    explicit FromStandard(const std::string& text) : stream(text) {}
    template <class T>
    void read(T& value) {
        stream >> value;
        stream.get();
    }
    template <class T>
    void read_all(std::vector<T>& values) {
        for (T& value : values) stream >> value;
        stream.get();
    }
    void restart() { stream.seekg(0); }

    std::istringstream stream;
};

struct FromKel {
    explicit FromKel(const std::string& text) : stream(text) {}
    template <class T>
    void read(T& value) {
        in >> value;
    }
    template <class T>
    void read_all(std::vector<T>& values) {
        in.get(values.data(), static_cast<unsigned int>(values.size()));
    }
    void restart() { stream.seekg(0); }

    std::istringstream stream;
    KEListream in{stream};
};

// What all of them read: the values, each with its separator.
template <class T>
std::string as_text(const std::vector<T>& values) {
    std::ostringstream text;
    KELostream(text).put(values.data(), static_cast<unsigned int>(values.size()));
    return text.str();
}

template <class Contender, class T>
void decode_one(benchmark::State& state) {
    const std::string text = as_text(bench::numbers<T>(count));
    Contender from(text);
    std::size_t i = 0;
    T value = 0;
    for (auto _ : state) {
        from.read(value);
        benchmark::DoNotOptimize(value);
        if (++i < count) continue;
        from.restart();
        i = 0;
    }
}

template <class Contender, class T>
void decode_all(benchmark::State& state) {
    const std::string text = as_text(bench::numbers<T>(count));
    std::vector<T> values(count);
    Contender from(text);
    for (auto _ : state) {
        from.read_all(values);
        from.restart();
        benchmark::ClobberMemory();
    }
}

template <class T>
void type(const std::string& name) {
    line("encode one " + name, kLimit, encode_one<Characters, T>);
    line("encode one " + name, "std::ostream", encode_one<Standard, T>);
    line("encode one " + name, kKel, encode_one<Kel, T>);
    line("encode 1,000 " + name + "s", kLimit, encode_all<Characters, T>);
    line("encode 1,000 " + name + "s", "std::ostream", encode_all<Standard, T>);
    line("encode 1,000 " + name + "s", kKel, encode_all<Kel, T>);
#ifdef KEL_BENCH_FMT
    line("encode one " + name, "{fmt}", encode_one<Fmt, T>);
    line("encode 1,000 " + name + "s", "{fmt}", encode_all<Fmt, T>);
#endif
    line("decode one " + name, kLimit, decode_one<FromCharacters, T>);
    line("decode one " + name, "std::istream", decode_one<FromStandard, T>);
    line("decode one " + name, kKel, decode_one<FromKel, T>);
    line("decode 1,000 " + name + "s", kLimit, decode_all<FromCharacters, T>);
    line("decode 1,000 " + name + "s", "std::istream", decode_all<FromStandard, T>);
    line("decode 1,000 " + name + "s", kKel, decode_all<FromKel, T>);
}

const bool registered = [] {
    type<int>("int");
    type<long long>("long long");
    type<double>("double");
    return true;
}();

}  // namespace
