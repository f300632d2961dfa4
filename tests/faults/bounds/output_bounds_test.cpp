// Counts in the writing operations.
// SPDX-License-Identifier: MIT
#include <kel/streams/ostream.h>

#include <ios>
#include <memory>
#include <ostream>
#include <sstream>
#include <streambuf>

#include "tests/faults/bounds/bounds.h"

namespace {

const char header[] = "kel/streams/ostream.h";

template <class T>
using Writing = KELostream& (KELostream::*)(const T*, unsigned int);

// Takes nothing and keeps how much it was asked to take.
class Refusing : public std::streambuf {
public:
    std::streamsize asked = -2;

protected:
    std::streamsize xsputn(const char*, std::streamsize n) override {
        asked = n;
        return 0;
    }
};

// No bytes lie behind the one that there is: what refuses them must be told the whole count. A count
// from 2^31 on is negative in a 32-bit program and fails at any standard stream.
template <class Byte>
void write_bytes(std::uint32_t n) {
    Refusing nowhere;
    std::ostream text(&nowhere);
    KELostream out(text);
    const std::unique_ptr<Byte[]> bytes(new Byte[1]());
    out.put(bytes.get(), n);
    EXPECT_EQ(nowhere.asked, static_cast<std::streamsize>(n));
    EXPECT_EQ(text.bad(), n != 0);
    EXPECT_EQ(out.cur_out_offset(), n);
}

void write_too_many_bytes_to_memory(std::uint32_t n) {
    if (!kel::test::is_negative_count(n)) return;
    std::ostringstream text;
    KELostream out(text);
    const std::unique_ptr<char[]> byte(new char[1]());
    out.put(byte.get(), n);
    EXPECT_TRUE(text.bad());
    EXPECT_EQ(text.str(), "");
}

// The standard stream gives up at the first of the values, behind which there are no more.
template <class T>
void write_array(Writing<T> writing, std::uint32_t n, std::uint32_t offset) {
    Refusing nowhere;
    std::ostream text(&nowhere);
    text.exceptions(std::ios_base::badbit);
    KELostream out(text);
    const std::unique_ptr<T[]> values(new T[1]());
    if (n == 0) {
        (out.*writing)(values.get(), n);
    } else {
        EXPECT_THROW((out.*writing)(values.get(), n), std::ios_base::failure);
    }
    EXPECT_EQ(out.cur_out_offset(), offset);
}

template <class T>
void write_what_there_is(Writing<T> writing, std::uint32_t n) {
    if (n > 1) return;
    std::ostringstream text;
    KELostream out(text);
    const std::unique_ptr<T[]> values(new T[1]{7});
    (out.*writing)(values.get(), n);
    EXPECT_EQ(text.str(), n == 0 ? "" : "7 ");
}

template <class T>
void write_values(Writing<T> writing, std::uint32_t n, std::uint32_t share) {
    write_array(writing, n, share * n);
    write_what_there_is(writing, n);
}

// The 9 of 64-bit values is added when all of them are written.
template <class T>
void write_wide_values(Writing<T> writing, std::uint32_t n) {
    write_array(writing, n, n == 0 ? 9 : 0);
    write_what_there_is(writing, n);
}

}  // namespace

AT_BOUNDS(CharArray, IsOfferedWholeAndAtOnce, header, "n") {
    write_bytes<char>(n);
    write_too_many_bytes_to_memory(n);
}
AT_BOUNDS(UnsignedCharArray, IsOfferedWholeAndAtOnce, header, "n") { write_bytes<unsigned char>(n); }

AT_BOUNDS(WideArray, WritingEndsWithTheStream, header, "n") { write_values<wchar_t>(&KELostream::put, n, 5); }
AT_BOUNDS(WideBuffer, WritingEndsWithTheStream, header, "n") {
    write_values<wchar_t>(&KELostream::put_wcbuf, n, 5);
}
AT_BOUNDS(ShortArray, WritingEndsWithTheStream, header, "n") { write_values<short>(&KELostream::put, n, 3); }
AT_BOUNDS(UnsignedShortArray, WritingEndsWithTheStream, header, "n") {
    write_values<unsigned short>(&KELostream::put, n, 3);
}
AT_BOUNDS(IntArray, WritingEndsWithTheStream, header, "n") { write_values<int>(&KELostream::put, n, 5); }
AT_BOUNDS(UnsignedIntArray, WritingEndsWithTheStream, header, "n") {
    write_values<unsigned int>(&KELostream::put, n, 5);
}
AT_BOUNDS(LongArray, WritingEndsWithTheStream, header, "n") { write_values<long>(&KELostream::put, n, 5); }
AT_BOUNDS(UnsignedLongArray, WritingEndsWithTheStream, header, "n") {
    write_values<unsigned long>(&KELostream::put, n, 5);
}
AT_BOUNDS(FloatArray, WritingEndsWithTheStream, header, "n") { write_values<float>(&KELostream::put, n, 5); }
AT_BOUNDS(DoubleArray, WritingEndsWithTheStream, header, "n") {
    write_values<double>(&KELostream::put, n, 9);
}
AT_BOUNDS(LongLongArray, WritingEndsWithTheStream, header, "n") {
    write_wide_values<long long>(&KELostream::put, n);
}
AT_BOUNDS(UnsignedLongLongArray, WritingEndsWithTheStream, header, "n") {
    write_wide_values<unsigned long long>(&KELostream::put, n);
}
