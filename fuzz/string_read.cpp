// Reading strings: operator>>(char*&) and the holder over text of any kind, the holder over a binary
// stream whose lengths lie, and what was written read back.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include "fuzz/quoted_text.h"
#include "fuzz/standard_streams.h"
#include "fuzz/target.h"
#include "tests/containers/mirrors.h"

namespace kel {
namespace fuzz {
namespace {

// Lengths beyond the input are false; few of them are worth the time to fill a large block.
constexpr std::size_t usual_limit = 2 * 1024;

Complaints complaints;
Guarded texts(largest_input);

// Reads the next string with and without a holder. False when there was no memory for it.
bool read(KEListream& in, CORBA_String_var& holder, bool into_holder) {
    try {
        if (into_holder) {
            in >> holder;
        } else {
            in >> holder.inout();
        }
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

void read_any_text(Bytes& input) {
    const std::uint8_t choice = input.byte();
    const Form form(choice);
    const bool into_holder = (choice & 0x20) != 0;
    largest_block = choice == 0xff ? most_memory : usual_limit;
    TextInput real(input.rest(), form);
    TextInput twin(input.rest(), form.tame());
    KEListream in(real.stream);
    CORBA_String_var s;
    for (int i = 0; i < 8 && twin.stream.good(); ++i) {
        const unsigned long before = in.cur_in_offset();
        bool done = false;
        try {
            done = read(in, s, into_holder);
        } catch (const std::ios_base::failure&) {
            KEL_REQUIRE(form.throwing);
            return;
        }
        const ExpectedString expected = expect_string(twin.stream);
        KEL_REQUIRE(done == !expected.refused && is(s.in(), expected));
        KEL_REQUIRE(kel::test::capacity_of(s) == 0);
        KEL_REQUIRE(in.cur_in_offset() == before + expected.offset);
        KEL_REQUIRE(complaints.take() == expected.text.complaint);
        KEL_REQUIRE(real.taken() == twin.taken() && real.stream.rdstate() == twin.stream.rdstate());
    }
}

// Another encoding: a length of four bytes, then the bytes. A peer may end it early, which throws or
// goes unnoticed.
class BinaryInput : public KEListream {
public:
    using KEListream::operator>>;
    using KEListream::get;

    BinaryInput(Bytes& input, bool notices_the_end) : _input(input), _notices_the_end(notices_the_end) {}

    KEListream& operator>>(unsigned long& n) override {
        n = _input.number<std::uint32_t>();
        return *this;
    }
    KEListream& get(char* bytes, unsigned int n) override {
        for (unsigned int i = 0; i < n; ++i) {
            if (_input.empty() && _notices_the_end) throw CORBA_MARSHAL();
            bytes[i] = _input.empty() ? 'e' : static_cast<char>(_input.byte());
        }
        return *this;
    }

private:
    Bytes& _input;
    bool _notices_the_end;
};

// What the holder must be after a binary read, and after the assignments between the reads.
struct Held {
    const char* text;  // null, or the first bytes of the string
    std::size_t size;
    unsigned long capacity;
};

bool is(const CORBA_String_var& s, const Held& held) {
    if (kel::test::capacity_of(s) != held.capacity) return false;
    if (held.text == nullptr || s.in() == nullptr) return held.text == nullptr && s.in() == nullptr;
    return std::strlen(s.in()) == held.size && std::memcmp(s.in(), held.text, held.size) == 0;
}

// What `n` bytes of `source` must have made of the holder, which has the capacity for them.
void expect_bytes(Held& held, std::string_view source, std::uint32_t n) {
    static char bytes[usual_limit + 1];
    const std::size_t given = std::min<std::size_t>(n, source.size());
    std::copy_n(source.begin(), given, bytes);
    std::fill(bytes + given, bytes + n, 'e');
    held.text = bytes;
    held.size = std::find(bytes, bytes + n, '\0') - bytes;
    if (held.size == n && n == held.capacity) --held.size;  // no room for a terminator behind them
}

// One read, and what it must do. False when the stream itself gave up.
bool read_binary(BinaryInput& in, Bytes& input, CORBA_String_var& s, Held& held, bool notices_the_end) {
    Bytes ahead = input;
    const std::uint32_t n = ahead.number<std::uint32_t>();
    const std::string_view source = ahead.rest();
    const bool fits = n <= held.capacity && held.text != nullptr;
    const bool refused = !fits && n >= largest_block;
    try {
        in >> s;
        KEL_REQUIRE((n != 0 || CORBA_String_var::_allowing_null_string) && !refused);
    } catch (const std::bad_alloc&) {
        KEL_REQUIRE(refused);
        return true;
    } catch (const CORBA_MARSHAL&) {
        if (n == 0) return true;
        KEL_REQUIRE(notices_the_end && n > source.size() && s.in()[0] == '\0');
        return false;
    }
    if (n == 0) {
        held = {nullptr, 0, 0};
        return true;
    }
    if (!fits) held.capacity = n + 1;
    expect_bytes(held, source, n);
    return true;
}

void read_binary_strings(Bytes& input) {
    static const char* const assigned[] = {"", "to", "a name of some length"};
    const std::uint8_t choice = input.byte();
    const bool notices_the_end = (choice & 1) != 0;
    largest_block = usual_limit;
    CORBA_String_var::allowing_null_string((choice & 2) == 0);
    BinaryInput in(input, notices_the_end);
    CORBA_String_var s;
    Held held = {"", 0, 0};
    for (int i = 0; i < 4 && !input.empty(); ++i) {
        const unsigned assign = choice >> (2 * i) & 3;
        if (assign != 0) {
            const char* const text = assigned[assign - 1];
            s = text;
            held = {text, std::strlen(text), std::max<unsigned long>(held.capacity, std::strlen(text) + 1)};
        }
        if (!read_binary(in, input, s, held, notices_the_end)) break;
        KEL_REQUIRE(is(s, held));
    }
    CORBA_String_var::allowing_null_string(1);
}

// What the writer counts behind the length, and by how much the reader counts otherwise.
std::uint32_t written_size(const char* s, std::uint32_t& hexadecimals) {
    if (s == nullptr || *s == '\0') return 1;
    std::uint32_t size = 3;
    for (; *s != '\0'; ++s) {
        const bool escaped = std::strchr("\b\t\n\f\r\"\\{}", *s) != nullptr;
        const bool plain = std::isprint(static_cast<unsigned char>(*s)) != 0;
        size += escaped ? 2 : plain ? 1 : 4;
        if (!escaped && !plain) ++hexadecimals;
    }
    return size;
}

// Strings, empty ones and nulls, written one after the other and read back.
void round_trip(Bytes& input) {
    const std::uint8_t nulls = input.byte();
    const bool into_holder = (nulls & 0x80) != 0;
    const char* const begin = texts.text(input.rest());
    const char* const end = begin + input.rest().size();
    TextOutput written;
    KELostream out(written.stream);
    const char* strings[8];
    int count = 0;
    std::uint32_t counted = 0;
    for (const char* s = begin; s <= end && count < 8; s += std::strlen(s) + 1) {
        strings[count] = (nulls >> count & 1) != 0 ? nullptr : s;
        std::uint32_t ignored = 0;
        out << strings[count];
        counted += 4 + written_size(strings[count++], ignored);
        KEL_REQUIRE(out.cur_out_offset() == counted);
    }
    TextInput source(written.written(), Form());
    KEListream in(source.stream);
    CORBA_String_var s;
    counted = 0;
    for (int i = 0; i < count; ++i) {
        KEL_REQUIRE(read(in, s, into_holder));
        const char* const expected = strings[i];
        KEL_REQUIRE((s.in() == nullptr) == (expected == nullptr));
        KEL_REQUIRE(expected == nullptr || std::strcmp(s.in(), expected) == 0);
        std::uint32_t more = 0;
        counted += 4 + written_size(expected, more) + more;
        // An empty string counts nothing for its blank, a full one nothing for its newline.
        if (expected != nullptr) --counted;
        KEL_REQUIRE(in.cur_in_offset() == counted);
    }
    KEL_REQUIRE(source.taken() == written.written().size() && complaints.take().empty());
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    complaints.take();
    Bytes input(data, size);
    const std::uint8_t kind = input.byte() % 4;
    if (kind == 0) {
        round_trip(input);
    } else if (kind == 1) {
        read_binary_strings(input);
    } else {
        read_any_text(input);
    }
    largest_block = most_memory;
    return 0;
}
