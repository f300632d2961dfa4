// Lengths in the reading operations: those of the caller's buffer and those that the text claims.
// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/streams/istream.h>

#include <algorithm>
#include <cstring>
#include <cwchar>
#include <iostream>
#include <memory>
#include <sstream>

#include "tests/faults/bounds/bounds.h"

using kel::test::aliased_room;
using kel::test::AliasedRoom;
using kel::test::is_negative_count;
using kel::test::refused;

namespace {

const char header[] = "kel/streams/istream.h";

template <class T>
using Reading = KEListream& (KEListream::*)(T*, unsigned int);

// Collects what the library reports on std::cerr.
class Reports {
public:
    Reports() : _before(std::cerr.rdbuf(_text.rdbuf())) {}
    ~Reports() { std::cerr.rdbuf(_before); }
    Reports(const Reports&) = delete;
    Reports& operator=(const Reports&) = delete;

    std::string text() const { return _text.str(); }

private:
    std::ostringstream _text;
    std::streambuf* const _before;
};

const char overflow[] = "KEListream::getCString: String Overflow\n";

// There are two values, and room for them and for the one that cannot be read, however many are asked
// for: reading ends with the text.
template <class T>
void read_array(Reading<T> reading, std::uint32_t n, std::uint32_t offset) {
    std::istringstream text("7 8 ");
    KEListream in(text);
    const std::unique_ptr<T[]> values(new T[3]());
    (in.*reading)(values.get(), n);
    EXPECT_EQ(values[0], static_cast<T>(n >= 1 ? 7 : 0));
    EXPECT_EQ(values[1], static_cast<T>(n >= 2 ? 8 : 0));
    EXPECT_EQ(values[2], T());
    EXPECT_EQ(text.fail(), n > 2);
    EXPECT_EQ(in.cur_in_offset(), offset);
}

// A count from 2^31 on is negative for the standard stream of a 32-bit
// program, which then reads nothing. Either way the stream fails and the buffer ends where it ends.
template <class Byte>
void read_bytes(std::uint32_t n) {
    std::istringstream text("ab");
    KEListream in(text);
    const std::unique_ptr<Byte[]> bytes(new Byte[2]());
    in.get(bytes.get(), n);
    const std::uint32_t taken = is_negative_count(n) ? 0 : std::min<std::uint32_t>(n, 2);
    EXPECT_EQ(bytes[0], static_cast<Byte>(taken >= 1 ? 'a' : 0));
    EXPECT_EQ(bytes[1], static_cast<Byte>(taken == 2 ? 'b' : 0));
    EXPECT_EQ(text.fail(), n > 2);
    EXPECT_EQ(in.cur_in_offset(), n);
}

}  // namespace

AT_BOUNDS(CharArray, ReadingEndsWithTheText, header, "n") { read_bytes<char>(n); }
AT_BOUNDS(UnsignedCharArray, ReadingEndsWithTheText, header, "n") { read_bytes<unsigned char>(n); }

AT_BOUNDS(WideArray, ReadingEndsWithTheText, header, "n") {
    read_array<wchar_t>(&KEListream::get, n, 4 * n + 1);
}
AT_BOUNDS(WideBuffer, ReadingEndsWithTheText, header, "n") {
    read_array<wchar_t>(&KEListream::get_wcbuf, n, 4 * n + 1);
}
AT_BOUNDS(ShortArray, ReadingEndsWithTheText, header, "n") {
    read_array<short>(&KEListream::get, n, 2 * n + 1);
}
AT_BOUNDS(UnsignedShortArray, ReadingEndsWithTheText, header, "n") {
    read_array<unsigned short>(&KEListream::get, n, 2 * n + 1);
}
AT_BOUNDS(IntArray, ReadingEndsWithTheText, header, "n") { read_array<int>(&KEListream::get, n, 4 * n + 1); }
AT_BOUNDS(UnsignedIntArray, ReadingEndsWithTheText, header, "n") {
    read_array<unsigned int>(&KEListream::get, n, 4 * n + 1);
}
AT_BOUNDS(LongArray, ReadingEndsWithTheText, header, "n") {
    read_array<long>(&KEListream::get, n, 4 * n + 1);
}
AT_BOUNDS(UnsignedLongArray, ReadingEndsWithTheText, header, "n") {
    read_array<unsigned long>(&KEListream::get, n, 4 * n + 1);
}
AT_BOUNDS(FloatArray, ReadingEndsWithTheText, header, "n") {
    read_array<float>(&KEListream::get, n, 4 * n + 1);
}
AT_BOUNDS(DoubleArray, ReadingEndsWithTheText, header, "n") {
    read_array<double>(&KEListream::get, n, 8 * n + 1);
}

const std::uint32_t seven_back = 0u - 7;
AT_BOUNDS(LongLongArray, ReadingEndsWithTheText, header, "n") {
    read_array<long long>(&KEListream::get, n, seven_back);
}
AT_BOUNDS(UnsignedLongLongArray, ReadingEndsWithTheText, header, "n") {
    read_array<unsigned long long>(&KEListream::get, n, seven_back);
}

AT_BOUNDS(AvailableBytes, AreNeverDenied, header, "n") { EXPECT_EQ(KEListream().is_available(n), 1); }

// The buffer has the room that it is said to have, up to the four bytes of the string.
AT_BOUNDS(QuotedString, IsCutAtTheEndOfItsBuffer, header, "len") {
    std::istringstream text("\"abc\"\n");
    KEListream in(text);
    const std::uint32_t room = std::min<std::uint32_t>(n, 4);
    const std::unique_ptr<char[]> buffer(new char[room]);
    const Reports reports;
    in.getCString(buffer.get(), n);
    if (n < 4) {
        EXPECT_EQ(reports.text(), overflow);
        EXPECT_EQ(std::string(buffer.get(), n), std::string("abc", n));
        EXPECT_EQ(in.cur_in_offset(), 1 + n + 1);  // the quote, what was stored and what stays unread
        EXPECT_EQ(text.peek(), "abc"[n]);
        return;
    }
    EXPECT_EQ(reports.text(), "");
    EXPECT_STREQ(buffer.get(), "abc");
    EXPECT_EQ(in.cur_in_offset(), 5u);
}

// At 64 bits the offset wraps to where it was.
TEST(QuotedString, WithoutAnEndFillsTheLargestRoomThatThereIs) {
#if defined(__SANITIZE_THREAD__)
    GTEST_SKIP() << "the thread sanitizer would keep four times the room in memory";
#endif
    const std::uint32_t room = sizeof(void*) == 4 ? 0x7fffffff : 0xffffffff;
    const AliasedRoom buffer = aliased_room(room);
    if (buffer == nullptr) GTEST_SKIP() << "there is no room of " << room << " bytes";
    std::istringstream text("\"");
    KEListream in(text);
    const Reports reports;
    in.getCString(buffer.get(), room);
    EXPECT_EQ(reports.text(), overflow);
    EXPECT_EQ(buffer[0], '\xff');
    EXPECT_EQ(buffer[room - 1], '\xff');
    EXPECT_EQ(in.cur_in_offset(), std::uint32_t(1 + room + 1));
}

AT_BOUNDS(NarrowString, IsNullWhenTheClaimedLengthIsRefused, header, "length of a string") {
    std::istringstream text(std::to_string(n) + "\"ab\"\n");
    KEListream in(text);
    char* s = CORBA::string_dup("before");
    if (n > 1) {
        EXPECT_THROW(in >> s, std::bad_alloc);
        EXPECT_EQ(s, nullptr);
        EXPECT_EQ(in.cur_in_offset(), 4u);
        return;
    }
    in >> s;
    EXPECT_STREQ(s, n == 0 ? nullptr : "ab");
    CORBA::string_free(s);
}

AT_BOUNDS(WideString, IsNullWhenTheClaimedCountIsRefused, header, "count of a wide string") {
    std::istringstream text(std::to_string(n) + " 65 ");
    KEListream in(text);
    wchar_t* ws = nullptr;
    if (n > 1) {
        EXPECT_TRUE(refused([&] { in >> ws; }));
        EXPECT_EQ(ws, nullptr);
        EXPECT_EQ(in.cur_in_offset(), 0u);
        return;
    }
    in >> ws;
    EXPECT_STREQ(ws, n == 0 ? L"" : L"A");
    EXPECT_EQ(in.cur_in_offset(), 8 * n + 1);
    delete[] ws;
}

// The caller's buffer has room for all that the text holds and for the character that cannot be read;
// the text claims more.
AT_BOUNDS(WideString, OfTheCallerEndsWithTheText, header, "count of a wide string") {
    std::istringstream text(std::to_string(n) + " 65 66 ");
    KEListream in(text);
    const std::unique_ptr<wchar_t[]> buffer(new wchar_t[3]());
    wchar_t* ws = buffer.get();
    in >> ws;
    EXPECT_EQ(ws, buffer.get());
    EXPECT_EQ(ws[0], n >= 1 ? L'A' : L'\0');
    EXPECT_EQ(ws[1], n >= 2 ? L'B' : L'\0');
    EXPECT_EQ(text.fail(), n > 2);
    EXPECT_EQ(in.cur_in_offset(), std::uint32_t(8 * n + 1));
}
