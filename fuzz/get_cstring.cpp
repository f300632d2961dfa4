// getCString: any text, any room, every kind of standard stream, into a buffer that ends at a page
// nobody may touch.
//
// SPDX-License-Identifier: MIT
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include "fuzz/quoted_text.h"
#include "fuzz/standard_streams.h"
#include "fuzz/target.h"

namespace kel {
namespace fuzz {
namespace {

constexpr std::uint32_t most_room = 16 * 1024;

Complaints complaints;
Guarded buffers(most_room);
Guarded texts(largest_input);

// Most strings are short; a few rooms are larger than any input.
std::uint32_t room_of(std::uint8_t choice) {
    return choice < 0xf0 ? choice % 64u : most_room >> (choice - 0xf0u);
}

// Reads one string after the other until the text ends.
void read_any_text(Bytes& input) {
    const Form form(input.byte());
    const std::uint8_t first_room = input.byte();
    TextInput real(input.rest(), form);
    TextInput twin(input.rest(), form.tame());
    KEListream in(real.stream);
    for (std::uint8_t i = 0; i < 4 && twin.stream.good(); ++i) {
        const std::uint32_t room = room_of(static_cast<std::uint8_t>(first_room + 5 * i));
        char* const buffer = buffers.block(room);
        const unsigned long before = in.cur_in_offset();
        try {
            in.getCString(buffer, room);
        } catch (const std::ios_base::failure&) {
            KEL_REQUIRE(form.throwing && Guarded::untouched_before(buffer));
            return;
        }
        const Quoted expected = expect_quoted(twin.stream, room);
        KEL_REQUIRE(holds(buffer, room, expected) && Guarded::untouched_before(buffer));
        KEL_REQUIRE(in.cur_in_offset() == before + expected.offset);
        KEL_REQUIRE(complaints.take() == expected.complaint);
        KEL_REQUIRE(real.taken() == twin.taken() && real.stream.rdstate() == twin.stream.rdstate());
    }
}

// What the writer counts for a byte, by the form it gives it.
std::uint32_t written_size(unsigned char c) {
    if (std::strchr("\b\t\n\f\r\"\\{}", c) != nullptr) return 2;
    return std::isprint(c) ? 1 : 4;
}

// What was written comes back, when there is room for it.
void round_trip(Bytes& input) {
    const std::uint32_t missing = input.byte() % 3u;  // 0 leaves room for the terminator as well
    const char* const text = texts.text(input.text());
    const auto length = static_cast<std::uint32_t>(std::strlen(text));
    TextOutput written;
    KELostream out(written.stream);
    out.putCString(text);
    std::uint32_t offset = 3;
    std::uint32_t read_offset = 2;
    for (const char* p = text; *p != '\0'; ++p) {
        const std::uint32_t size = written_size(static_cast<unsigned char>(*p));
        offset += size;
        read_offset += size == 4 ? 5 : size;
    }
    KEL_REQUIRE(out.cur_out_offset() == offset);

    TextInput source(written.written(), Form());
    KEListream in(source.stream);
    const std::uint32_t room = length + 1 >= missing ? length + 1 - missing : 0;
    char* const buffer = buffers.block(room);
    in.getCString(buffer, room);
    const std::uint32_t stored = std::min(length, room);
    KEL_REQUIRE(std::memcmp(buffer, text, stored) == 0 && Guarded::untouched_before(buffer));
    KEL_REQUIRE(complaints.take().empty() == (room >= length));
    if (room > length) {
        KEL_REQUIRE(buffer[length] == '\0');
        KEL_REQUIRE(in.cur_in_offset() == read_offset && source.taken() == written.written().size());
    }
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    complaints.take();
    Bytes input(data, size);
    if (input.byte() % 4 == 0) {
        round_trip(input);
    } else {
        read_any_text(input);
    }
    return 0;
}
