// Wide strings: read from any text into new and into given memory, written and read back, compared and
// hashed.
//
// SPDX-License-Identifier: MIT
#include <kel/containers/wstrings.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cwchar>
#include <string_view>

#include "fuzz/standard_streams.h"
#include "fuzz/target.h"

namespace kel {
namespace fuzz {
namespace {

constexpr std::uint32_t most_values = 64;

// Counts beyond the input are false; few of them are worth the time to clear a large block.
constexpr std::size_t usual_limit = 2 * 1024;

Guarded buffers(most_values * sizeof(wchar_t));

wchar_t* block(std::uint32_t n) { return reinterpret_cast<wchar_t*>(buffers.block(n * sizeof(wchar_t))); }

// ---- any text ----

struct Reading {
    Reading(std::string_view text, const Form& f)
        : form(f), real(text, f), twin(text, f.tame()), in(real.stream), offset(0) {}

    Form form;
    TextInput real;
    TextInput twin;
    KEListream in;
    std::uint32_t offset;
    wchar_t expected[most_values];
};

// Reads up to `n` numbers and a separator into `expected`.
void expect_values(Reading& r, std::uint32_t n) {
    for (std::uint32_t i = 0; i < n && !r.twin.stream.fail(); ++i) {
        int number = static_cast<int>(r.expected[i]);
        r.twin.stream >> number;
        r.expected[i] = static_cast<wchar_t>(number);
    }
    r.twin.stream.get();
    r.offset += 4 * n + 1;
}

std::uint32_t count_of(std::istream& text) {
    std::uint32_t n = 0;
    text >> n;
    return n;
}

// The count that comes next; the twin stays where it is.
std::uint32_t next_count(const Reading& r) {
    TextInput ahead(r.twin.rest(), r.form.tame());
    ahead.stream.clear(r.twin.stream.rdstate());
    return count_of(ahead.stream);
}

// A string in new memory: zeros where the text did not reach, and one behind the last value.
void read_new(Reading& r, bool into_holder) {
    CORBA_WString_var s;
    bool refused = false;
    try {
        if (into_holder) {
            r.in >> s;
        } else {
            r.in >> s.inout();
        }
    } catch (const std::bad_alloc&) {
        refused = true;
    }
    const std::uint32_t n = count_of(r.twin.stream);
    KEL_REQUIRE(refused == ((std::uint64_t(n) + 1) * sizeof(wchar_t) > largest_block));
    KEL_REQUIRE(refused == (s.in() == nullptr));
    if (refused) return;
    // What the text cannot hold was cleared. The last of it stands for the rest.
    const std::uint32_t looked_at = std::min(n, most_values);
    std::fill_n(r.expected, most_values, L'\0');
    expect_values(r, looked_at);
    r.offset += 4 * (n - looked_at) + 4 * n;
    KEL_REQUIRE(std::equal(r.expected, r.expected + looked_at, s.in()));
    KEL_REQUIRE(s.in()[n] == L'\0' && (n <= most_values || s.in()[n - 1] == L'\0'));
}

// The caller's own memory, which has room for the count.
void read_given(Reading& r) {
    const std::uint32_t n = next_count(r);
    if (n > most_values) return read_new(r, false);
    wchar_t* const buffer = block(n);
    std::copy_n(buffer, n, r.expected);
    wchar_t* p = buffer;
    r.in >> p;
    KEL_REQUIRE(p == buffer && count_of(r.twin.stream) == n);
    expect_values(r, n);
    r.offset += 4 * n;
    KEL_REQUIRE(std::equal(buffer, buffer + n, r.expected));
    KEL_REQUIRE(Guarded::untouched_before(reinterpret_cast<const char*>(buffer)));
}

void read_values(Reading& r, std::uint32_t n) {
    wchar_t* const buffer = block(n);
    std::copy_n(buffer, n, r.expected);
    r.in.get_wcbuf(buffer, n);
    expect_values(r, n);
    KEL_REQUIRE(std::equal(buffer, buffer + n, r.expected));
    KEL_REQUIRE(Guarded::untouched_before(reinterpret_cast<const char*>(buffer)));
}

void read_next(Reading& r, std::uint8_t choice) {
    switch (choice % 4) {
        case 0:
            return read_new(r, true);
        case 1:
            return read_new(r, false);
        case 2:
            return read_given(r);
        default:
            return read_values(r, choice / 4u);
    }
}

void read_any_text(Bytes& input) {
    const std::uint8_t choice = input.byte();
    const Form form(choice);
    largest_block = choice == 0xff ? most_memory : usual_limit;
    Bytes operations = input;
    input.number<std::uint32_t>();
    Reading r(input.rest(), form);
    for (int i = 0; i < 4; ++i) {
        try {
            read_next(r, operations.byte());
        } catch (const std::ios_base::failure&) {
            KEL_REQUIRE(form.throwing);
            return;
        }
        KEL_REQUIRE(r.in.cur_in_offset() == r.offset);
        KEL_REQUIRE(r.real.taken() == r.twin.taken());
        KEL_REQUIRE(r.real.stream.rdstate() == r.twin.stream.rdstate());
    }
}

// ---- strings of the input's own bytes ----

// A holder with the values of the next text, each of them up to three bytes of it.
CORBA_WString_var wide(Bytes& input) {
    const std::string_view text = input.text();
    const unsigned step = 1 + input.byte() % 3u;
    CORBA_WString_var s(CORBA::wstring_alloc(text.size()));
    std::size_t n = 0;
    for (std::size_t i = 0; i < text.size(); i += step) {
        std::uint32_t value = 0;
        for (const char c : text.substr(i, step)) value = value << 11 ^ static_cast<unsigned char>(c);
        s[n++] = static_cast<wchar_t>(value);
    }
    s[n] = L'\0';
    return s;
}

// Written behind its length, which the writer leaves out, a string is read back as it was.
void round_trip(const CORBA_WString_var& s) {
    const auto n = static_cast<std::uint32_t>(std::wcslen(s));
    TextOutput written;
    KELostream out(written.stream);
    out << static_cast<unsigned int>(n);
    out << s.in();
    KEL_REQUIRE(out.cur_out_offset() == 5 + 9 * n + 2);
    TextInput source(written.written(), Form());
    KEListream in(source.stream);
    CORBA_WString_var found;
    in >> found;
    KEL_REQUIRE(compare(found, s) == 0 && in.cur_in_offset() == 8 * n + 1);
}

// Every character counts as the first one's low byte.
unsigned long expected_hash(const wchar_t* s) {
    const std::uint32_t first = static_cast<std::uint32_t>(static_cast<std::int8_t>(s[0] & 0xff));
    std::uint32_t h = 0;
    for (; *s != L'\0'; ++s) h = h * 2 ^ first;
    return h % 0x80000000u;
}

void compare_and_hash(const CORBA_WString_var& a, const CORBA_WString_var& b) {
    const CORBA_WString_var copy(a);
    const CORBA_WString_var null;
    KEL_REQUIRE(compare(a, copy) == 0 && _kel_hash(a) == _kel_hash(copy));
    KEL_REQUIRE(compare(null, a) < 0 && compare(a, null) > 0 && compare(null, null) == 0);
    KEL_REQUIRE((compare(a, b) == 0) == (std::wstring_view(a.in()) == b.in()));
    KEL_REQUIRE((compare(a, b) < 0) == (compare(b, a) > 0));
    KEL_REQUIRE(_kel_hash(a) == expected_hash(a) && _kel_hash(b) == expected_hash(b) && _kel_hash(null) == 0);
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    Bytes input(data, size);
    if (input.byte() % 2 != 0) {
        read_any_text(input);
        largest_block = most_memory;
        return 0;
    }
    const CORBA_WString_var a = wide(input);
    const CORBA_WString_var b = wide(input);
    round_trip(a);
    compare_and_hash(a, b);
    return 0;
}
