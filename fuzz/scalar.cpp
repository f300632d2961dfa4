// Scalars, arrays and raw bytes: any text read by any sequence of operations gives what the standard
// extractors give, and what was written is read back.
//
// SPDX-License-Identifier: MIT
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cctype>
#include <cmath>
#include <type_traits>

#include "fuzz/standard_streams.h"
#include "fuzz/target.h"

namespace kel {
namespace fuzz {
namespace {

constexpr std::uint32_t most_values = 16;
constexpr std::size_t most_bytes = most_values * sizeof(double);

Guarded buffers(most_bytes);
alignas(double) char expected_bytes[most_bytes];

// The size that a value counts. It is the same at both word sizes.
template <class T>
constexpr std::uint32_t size_of = std::is_same<T, long>::value || std::is_same<T, unsigned long>::value
                                      ? 4
                                      : sizeof(T);
template <class T>
constexpr std::uint32_t read_size_of = std::is_same<T, unsigned char>::value ? 4 : size_of<T>;

template <class T>
constexpr bool moves_back = std::is_same<T, long long>::value || std::is_same<T, unsigned long long>::value;

// Reads as the standard extractors do; bytes and wide characters are numbers.
template <class T>
void extract(std::istream& in, T& value) {
    in >> value;
}
template <class T>
void extract_number(std::istream& in, T& value) {
    int number = static_cast<int>(value);
    in >> number;
    value = static_cast<T>(number);
}
void extract(std::istream& in, unsigned char& value) { extract_number(in, value); }
void extract(std::istream& in, wchar_t& value) { extract_number(in, value); }

// ---- any text ----

struct Reading {
    Reading(Bytes& input, const Form& form)
        : real(input.rest(), form), twin(input.rest(), form.tame()), in(real.stream), offset(0) {}

    TextInput real;
    TextInput twin;
    KEListream in;
    std::uint32_t offset;
};

template <class T>
void read_scalar(Reading& r, std::uint8_t choice) {
    T value = static_cast<T>(choice);
    T expected = value;
    r.in >> value;
    extract(r.twin.stream, expected);
    r.twin.stream.get();
    KEL_REQUIRE(value == expected);
    r.offset += read_size_of<T> + 1;
}

// A stream that has failed is asked for nothing, however many values a peer announces.
template <class T>
void read_array(Reading& r, std::uint8_t choice) {
    const bool failed = r.twin.stream.fail();
    const std::uint32_t n = choice % most_values;
    char* const buffer = buffers.block(n * sizeof(T));
    std::memcpy(expected_bytes, buffer, n * sizeof(T));
    const std::uint32_t announced = failed ? n - 1 - choice / most_values : n;
    r.in.get(reinterpret_cast<T*>(buffer), announced);
    T* const expected = reinterpret_cast<T*>(expected_bytes);
    for (std::uint32_t i = 0; i < n && !r.twin.stream.fail(); ++i) extract(r.twin.stream, expected[i]);
    r.twin.stream.get();
    KEL_REQUIRE(std::memcmp(buffer, expected_bytes, n * sizeof(T)) == 0);
    KEL_REQUIRE(Guarded::untouched_before(buffer));
    r.offset += moves_back<T> ? std::uint32_t(-7) : size_of<T> * announced + 1;
}

template <class T>
void read_raw(Reading& r, std::uint8_t choice) {
    const std::uint32_t n = choice % most_bytes;
    T* const buffer = reinterpret_cast<T*>(buffers.block(n));
    std::memcpy(expected_bytes, buffer, n);
    r.in.get(buffer, n);
    r.twin.stream.read(expected_bytes, n);
    KEL_REQUIRE(std::memcmp(buffer, expected_bytes, n) == 0);
    r.offset += n;
}

template <class T>
void read_raw_one(Reading& r, std::uint8_t choice) {
    T c = static_cast<T>(choice);
    char expected = static_cast<char>(choice);
    r.in.get(c);
    r.twin.stream.get(expected);
    KEL_REQUIRE(static_cast<char>(c) == expected);
    r.offset += 1;
}

void read_raw_int(Reading& r, std::uint8_t) {
    const int c = r.in.get();
    KEL_REQUIRE(c == r.twin.stream.get());
    r.offset += 4;
}

typedef void (*Read)(Reading&, std::uint8_t);
const Read reads[] = {
    read_scalar<char>,
    read_scalar<unsigned char>,
    read_scalar<short>,
    read_scalar<unsigned short>,
    read_scalar<int>,
    read_scalar<unsigned int>,
    read_scalar<long>,
    read_scalar<unsigned long>,
    read_scalar<float>,
    read_scalar<double>,
    read_scalar<long long>,
    read_scalar<unsigned long long>,
    read_scalar<wchar_t>,
    read_array<short>,
    read_array<unsigned short>,
    read_array<int>,
    read_array<unsigned int>,
    read_array<long>,
    read_array<unsigned long>,
    read_array<float>,
    read_array<double>,
    read_array<long long>,
    read_array<unsigned long long>,
    read_array<wchar_t>,
    read_raw<char>,
    read_raw<unsigned char>,
    read_raw_one<char>,
    read_raw_one<unsigned char>,
    read_raw_int,
};

void read_any_text(Bytes& input) {
    const Form form(input.byte());
    Bytes operations = input;
    input.number<std::uint64_t>();
    Reading r(input, form);
    for (int i = 0; i < 4; ++i) {
        const Read read = reads[operations.byte() % std::size(reads)];
        try {
            read(r, operations.byte());
        } catch (const std::ios_base::failure&) {
            KEL_REQUIRE(form.throwing);
            return;
        }
        KEL_REQUIRE(r.in.cur_in_offset() == r.offset);
        KEL_REQUIRE(r.real.taken() == r.twin.taken());
        KEL_REQUIRE(r.real.stream.rdstate() == r.twin.stream.rdstate());
    }
}

// ---- round trip ----

// The same sequence of operations is run twice over the same input: to write, and to read back.
struct Trip {
    explicit Trip(const Bytes& values) : input(values), out(nullptr), in(nullptr) {}

    Bytes input;
    KELostream* out;  // null when reading
    KEListream* in;

    // The next value of the input, changed where its text would not be read as what it is.
    template <class T>
    T value() {
        const T raw = input.number<T>();
        if constexpr (std::is_floating_point<T>::value) return std::isfinite(raw) ? raw : T(0);
        if constexpr (std::is_same<T, char>::value)
            return std::isspace(static_cast<unsigned char>(raw)) ? 'x' : raw;
        return raw;
    }
};

template <class T>
void carry_scalar(Trip& t, std::uint8_t) {
    const T value = t.value<T>();
    if (t.out != nullptr) {
        const unsigned long before = t.out->cur_out_offset();
        *t.out << value;
        KEL_REQUIRE(t.out->cur_out_offset() == before + size_of<T> + 1);
        return;
    }
    T found = T();
    *t.in >> found;
    KEL_REQUIRE(found == value);
}

template <class T>
void carry_array(Trip& t, std::uint8_t choice) {
    const std::uint32_t n = choice % 3u + 1;
    T values[3];
    for (std::uint32_t i = 0; i < n; ++i) values[i] = t.value<T>();
    if (t.out != nullptr) {
        const unsigned long before = t.out->cur_out_offset();
        t.out->put(values, n);
        KEL_REQUIRE(t.out->cur_out_offset() == before + (moves_back<T> ? 9 : (size_of<T> + 1) * n));
        return;
    }
    char* const buffer = buffers.block(n * sizeof(T));
    t.in->get(reinterpret_cast<T*>(buffer), n);
    KEL_REQUIRE(std::equal(values, values + n, reinterpret_cast<const T*>(buffer)));
}

template <class T>
void carry_raw(Trip& t, std::uint8_t choice) {
    const std::uint32_t n = choice % 4u;
    T bytes[3];
    for (std::uint32_t i = 0; i < n; ++i) bytes[i] = t.input.number<T>();
    if (t.out != nullptr) {
        const unsigned long before = t.out->cur_out_offset();
        t.out->put(bytes, n);
        KEL_REQUIRE(t.out->cur_out_offset() == before + n);
        return;
    }
    T* const buffer = reinterpret_cast<T*>(buffers.block(n));
    t.in->get(buffer, n);
    KEL_REQUIRE(std::memcmp(buffer, bytes, n) == 0);
}

typedef void (*Carry)(Trip&, std::uint8_t);
const Carry carries[] = {
    carry_scalar<char>,
    carry_scalar<unsigned char>,
    carry_scalar<short>,
    carry_scalar<unsigned short>,
    carry_scalar<int>,
    carry_scalar<unsigned int>,
    carry_scalar<long>,
    carry_scalar<unsigned long>,
    carry_scalar<float>,
    carry_scalar<double>,
    carry_scalar<long long>,
    carry_scalar<unsigned long long>,
    carry_scalar<wchar_t>,
    carry_array<short>,
    carry_array<unsigned short>,
    carry_array<int>,
    carry_array<unsigned int>,
    carry_array<long>,
    carry_array<unsigned long>,
    carry_array<float>,
    carry_array<double>,
    carry_array<long long>,
    carry_array<unsigned long long>,
    carry_array<wchar_t>,
    carry_raw<char>,
    carry_raw<unsigned char>,
};

void carry_all(Trip& t) {
    for (int i = 0; i < 8 && !t.input.empty(); ++i) {
        const Carry carry = carries[t.input.byte() % std::size(carries)];
        carry(t, t.input.byte());
    }
}

void round_trip(const Bytes& input) {
    TextOutput written;
    written.stream.precision(17);  // enough to tell any two doubles apart
    KELostream out(written.stream);
    Trip there(input);
    there.out = &out;
    carry_all(there);

    TextInput source(written.written(), Form());
    KEListream in(source.stream);
    Trip back(input);
    back.in = &in;
    carry_all(back);
    KEL_REQUIRE(source.taken() == written.written().size() && source.stream.good());
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    Bytes input(data, size);
    if (input.byte() % 2 == 0) {
        round_trip(input);
    } else {
        read_any_text(input);
    }
    return 0;
}
