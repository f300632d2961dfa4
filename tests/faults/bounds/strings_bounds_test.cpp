// Lengths of strings: those that a caller asks for and those that a peer claims.
// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/containers/wstrings.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>

#include <cstring>
#include <cwchar>
#include <sstream>

#include "tests/faults/bounds/bounds.h"

using kel::test::refused;

namespace {

// Delivers a length as a peer may claim it, and zeros as the characters.
class BinaryStream : public KEListream {
public:
    explicit BinaryStream(unsigned long length) : _length(length) {}

    using KEListream::get;
    using KEListream::operator>>;
    KEListream& operator>>(unsigned long& value) override {
        value = _length;
        return *this;
    }
    KEListream& get(char* bytes, unsigned int n) override {
        delivered = n;
        std::memset(bytes, 0, n);
        return *this;
    }

    unsigned int delivered = 0;

private:
    const unsigned long _length;
};

}  // namespace

// The guard behind the block tells that there is exactly as much room as was asked for.
AT_BOUNDS(NarrowString, HasRoomForItsTerminatorOrIsRefused, "kel/containers/strings.h", "len") {
    if (n > 1) {
        EXPECT_TRUE(refused([&] { CORBA::string_alloc(n); }));
        return;
    }
    char* const s = CORBA::string_alloc(n);
    std::memset(s, 'x', n + 1);
    CORBA::string_free(s);
}

AT_BOUNDS(WideString, HasRoomForItsTerminatorOrIsRefused, "kel/containers/wstrings.h", "len") {
    if (n > 1) {
        EXPECT_TRUE(refused([&] { CORBA::wstring_alloc(n); }));
        return;
    }
    wchar_t* const s = CORBA::wstring_alloc(n);
    std::wmemset(s, L'x', n + 1);
    CORBA::wstring_free(s);
}

AT_BOUNDS(NarrowHolder, KeepsItsStringWhenAClaimedLengthIsRefused, "kel/containers/strings.h",
          "length of a binary string") {
    BinaryStream in(n);
    CORBA_String_var holder("before");
    if (n > 1) {
        EXPECT_TRUE(refused([&] { in >> holder; }));
        EXPECT_STREQ(holder.in(), "before");
        EXPECT_EQ(in.delivered, 0u);
        return;
    }
    in >> holder;
    EXPECT_STREQ(holder.in(), n == 0 ? nullptr : "");
    EXPECT_EQ(in.delivered, n);
}

// A holder whose buffer is too small gets a new one of the claimed size.
AT_BOUNDS(NullHolder, StaysNullWhenAClaimedLengthIsRefused, "kel/containers/strings.h",
          "length of a binary string") {
    BinaryStream in(n);
    CORBA_String_var holder(static_cast<char*>(nullptr));
    if (n > 1) {
        EXPECT_TRUE(refused([&] { in >> holder; }));
        EXPECT_EQ(holder.in(), nullptr);
        return;
    }
    in >> holder;
    EXPECT_STREQ(holder.in(), n == 0 ? nullptr : "");
}

AT_BOUNDS(WideHolder, IsNullWhenAClaimedLengthIsRefused, "kel/containers/wstrings.h",
          "length of a wide string") {
    std::istringstream text(std::to_string(n) + " 65 ");
    KEListream in(text);
    CORBA_WString_var holder(L"before");
    if (n > 1) {
        EXPECT_THROW(in >> holder, std::bad_alloc);
        EXPECT_EQ(holder.in(), nullptr);
        return;
    }
    in >> holder;
    EXPECT_STREQ(holder.in(), n == 0 ? L"" : L"A");
}

// Where no length of zero is allowed, that one is refused and every other ends as before.
TEST(NarrowHolder, RefusesOnlyAClaimedZeroWhereNullIsNotAllowed) {
    CORBA_String_var::allowing_null_string(0);
    for (const std::uint32_t n : kel::test::bounds) {
        SCOPED_TRACE("n = " + std::to_string(n));
        BinaryStream in(n);
        CORBA_String_var holder("before");
        if (n == 0) {
            EXPECT_THROW(in >> holder, CORBA_MARSHAL);
        } else if (n > 1) {
            EXPECT_THROW(in >> holder, std::bad_alloc);
        } else {
            in >> holder;
        }
        EXPECT_STREQ(holder.in(), n == 1 ? "" : "before");
    }
    CORBA_String_var::allowing_null_string(1);
}
