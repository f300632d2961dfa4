// SPDX-License-Identifier: MIT
// C strings on streams, with their quotes and escapes, short and long.
#include <bench/support/bench.h>
#include <bench/support/values.h>
#include <kel/containers/strings.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <algorithm>
#include <cstring>
#include <iomanip>
#include <sstream>

#ifdef KEL_BENCH_ABSL
#include <absl/strings/escaping.h>
#endif

using bench::growth;
using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

// ---- out ----

void copy_out(benchmark::State& state, const std::string& text) {
    std::string to(text.size(), '\0');
    for (auto _ : state) {
        std::memcpy(&to[0], text.data(), text.size());
        benchmark::ClobberMemory();
    }
}

// The streams start over after 64 KiB.
long repetitions(const std::string& text) {
    return std::max<long>(1, 65536 / static_cast<long>(text.size()));
}

template <class Write>
void write(benchmark::State& state, const std::string& text, std::ostream& to, Write one) {
    const long count = repetitions(text);
    long i = 0;
    for (auto _ : state) {
        one(text.c_str());
        if (++i < count) continue;
        to.seekp(0);
        i = 0;
    }
}

void quoted_out(benchmark::State& state, const std::string& text) {
    std::ostringstream to;
    write(state, text, to, [&](const char* s) { to << std::quoted(s) << '\n'; });
}

void kel_out(benchmark::State& state, const std::string& text) {
    std::ostringstream to;
    KELostream out(to);
    write(state, text, to, [&](const char* s) { out << s; });
}

// ---- in ----

void copy_in(benchmark::State& state, const std::string& text) {
    for (auto _ : state) {
        char* const copy = CORBA::string_alloc(static_cast<unsigned long>(text.size()));
        std::memcpy(copy, text.data(), text.size() + 1);
        benchmark::DoNotOptimize(copy);
        CORBA::string_free(copy);
    }
}

template <class Read>
void read(benchmark::State& state, const std::string& text, std::istream& from, Read one) {
    const long count = repetitions(text);
    long i = 0;
    for (auto _ : state) {
        one();
        if (++i < count) continue;
        from.seekg(0);
        i = 0;
    }
}

void quoted_in(benchmark::State& state, const std::string& text) {
    std::stringstream from;
    for (long i = repetitions(text); i > 0; --i) from << std::quoted(text) << '\n';
    read(state, text, from, [&] {
        std::string s;
        from >> std::quoted(s);
        benchmark::DoNotOptimize(s.data());
    });
}

void kel_in(benchmark::State& state, const std::string& text) {
    std::stringstream from;
    KELostream out(from);
    for (long i = repetitions(text); i > 0; --i) out << text.c_str();
    KEListream in(from);
    char* s = nullptr;  // freed by the next one
    read(state, text, from, [&] {
        in >> s;
        benchmark::DoNotOptimize(s);
    });
    CORBA::string_free(s);
}

#ifdef KEL_BENCH_ABSL
void absl_out(benchmark::State& state, const std::string& text) {
    for (auto _ : state) benchmark::DoNotOptimize(absl::CEscape(text.c_str()));
}

void absl_in(benchmark::State& state, const std::string& text) {
    const std::string escaped = absl::CEscape(text);
    for (auto _ : state) {
        std::string s;  // a string of the caller's own, as the library gives one
        benchmark::DoNotOptimize(absl::CUnescape(escaped, &s));
        benchmark::DoNotOptimize(s.data());
    }
}
#endif

typedef void (*Run)(benchmark::State&, const std::string&);

void lines(const std::string& direction, const std::string& who, Run run) {
    const struct {
        const char* name;
        std::size_t size;
    } sizes[] = {{"16 B", 16}, {"1 KiB", 1024}, {"64 KiB", 65536}};
    for (const auto& size : sizes) {
        line(std::string("C string of ") + size.name + " " + direction, who,
             [=](benchmark::State& state) { run(state, bench::sentence(size.size)); });
    }
    line("C string of 1 KiB with escapes " + direction, who,
         [=](benchmark::State& state) { run(state, bench::sentence(1024, true)); });
    for (long n = 16; n <= 1 << 20; n *= 4) {
        growth("C string " + direction, who, n,
               [=](benchmark::State& state) { run(state, bench::sentence(n)); });
    }
}

const bool registered = [] {
    lines("out", kLimit, copy_out);
    lines("out", "std::quoted", quoted_out);
    lines("out", kKel, kel_out);
    lines("in", kLimit, copy_in);
    lines("in", "std::quoted", quoted_in);
    lines("in", kKel, kel_in);
#ifdef KEL_BENCH_ABSL
    lines("out", "absl::CEscape", absl_out);
    lines("in", "absl::CUnescape", absl_in);
#endif
    return true;
}();

}  // namespace
