// SPDX-License-Identifier: MIT
// Reading holders from marshalling streams, also when the peer sends nonsense.
#include <kel/containers/strings.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cstring>
#include <iostream>
#include <new>
#include <sstream>
#include <string>

#include "tests/containers/mirrors.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {
namespace {

// A binary stream that delivers one length and then bytes.
class BinaryStream : public KEListream {
public:
    BinaryStream(unsigned long length, const std::string& bytes) : _length(length), _bytes(bytes) {}

    using KEListream::operator>>;
    using KEListream::get;

    KEListream& operator>>(unsigned long& n) override {
        ++length_reads;
        n = _length;
        return *this;
    }
    KEListream& get(char* buffer, unsigned int n) override {
        asked_for = n;
        const std::size_t given = _bytes.size() < n ? _bytes.size() : n;
        std::memcpy(buffer, _bytes.data(), given);
        if (broken) throw CORBA_COMM_FAILURE();
        return *this;
    }

    unsigned int asked_for = 0;
    int length_reads = 0;
    bool broken = false;

private:
    unsigned long _length;
    std::string _bytes;
};

// `text` as a peer sends it: with its terminator, which the length counts.
BinaryStream binary(const std::string& text) {
    return BinaryStream(text.size() + 1, std::string(text.c_str(), text.size() + 1));
}

class BinaryStrings : public FaultTest {
protected:
    void TearDown() override {
        CORBA_String_var::allowing_null_string(1);
        FaultTest::TearDown();
    }

    long blocks_before = AllocationPlan::live_blocks();
};

TEST_F(BinaryStrings, LengthCountsTheTerminator) {
    BinaryStream in = binary("vesta");
    CORBA_String_var holder;
    EXPECT_EQ(&(in >> holder), &in);
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(in.asked_for, 6u);
    EXPECT_EQ(in.length_reads, 1);
}

TEST_F(BinaryStrings, NewBufferHasOneByteMoreThanTheLength) {
    BinaryStream in = binary("vesta");
    CORBA_String_var holder;
    in >> holder;
    EXPECT_EQ(capacity_of(holder), 7u);
}

TEST_F(BinaryStrings, BufferOfKnownSizeIsReused) {
    CORBA_String_var holder("a long text");
    const char* const buffer = holder.in();
    BinaryStream in = binary("vesta");
    Armed armed;
    in >> holder;
    EXPECT_EQ(holder.in(), buffer);
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 12u);
    EXPECT_EQ(AllocationPlan::calls(), 0);
}

TEST_F(BinaryStrings, BufferThatJustFitsIsReused) {
    CORBA_String_var holder("vesta");
    const char* const buffer = holder.in();
    BinaryStream in = binary("ceres");
    in >> holder;
    EXPECT_EQ(holder.in(), buffer);
    EXPECT_STREQ(holder, "ceres");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(BinaryStrings, BufferThatIsTooSmallIsReplaced) {
    CORBA_String_var holder("juno");
    BinaryStream in = binary("vesta");
    in >> holder;
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 7u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(BinaryStrings, AdoptedStringIsReplaced) {
    CORBA_String_var holder(CORBA::string_dup("a long text"));
    BinaryStream in = binary("x");
    in >> holder;
    EXPECT_STREQ(holder, "x");
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(BinaryStrings, NullHolderGetsABuffer) {
    CORBA_String_var holder(static_cast<const char*>(nullptr));
    BinaryStream in = binary("vesta");
    in >> holder;
    EXPECT_STREQ(holder, "vesta");
}

TEST_F(BinaryStrings, LengthOfOneIsTheEmptyString) {
    CORBA_String_var holder("vesta");
    BinaryStream in = binary("");
    in >> holder;
    EXPECT_STREQ(holder, "");
    EXPECT_EQ(in.asked_for, 1u);
}

// Zero lengths

TEST_F(BinaryStrings, ZeroLengthReadsAsNullByDefault) {
    EXPECT_EQ(CORBA_String_var::_allowing_null_string, 1);
    CORBA_String_var holder("vesta");
    BinaryStream in(0, "");
    EXPECT_EQ(&(in >> holder), &in);
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(in.asked_for, 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(BinaryStrings, ZeroLengthIsAMarshalErrorWhenNullIsNotAllowed) {
    CORBA_String_var::allowing_null_string(0);
    EXPECT_EQ(CORBA_String_var::_allowing_null_string, 0);
    CORBA_String_var holder("vesta");
    const char* const buffer = holder.in();
    BinaryStream in(0, "");
    try {
        in >> holder;
        FAIL() << "nothing was thrown";
    } catch (const CORBA_MARSHAL& e) {
        const CORBA_MARSHAL expected;
        EXPECT_EQ(e.minor(), expected.minor());
        EXPECT_EQ(e.completed(), expected.completed());
    }
    EXPECT_EQ(holder.in(), buffer);
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(BinaryStrings, AllowanceCanBeGivenBack) {
    CORBA_String_var::allowing_null_string(0);
    CORBA_String_var::allowing_null_string(1);
    CORBA_String_var holder("vesta");
    BinaryStream in(0, "");
    in >> holder;
    EXPECT_EQ(holder.in(), nullptr);
}

// Hostile peers

TEST_F(BinaryStrings, NewBufferWithoutATerminatorGetsOneBehindTheBytes) {
    CORBA_String_var holder;
    const std::string text = "as long as its block is";
    BinaryStream in(text.size(), text);
    // The block that the buffer will get holds no zero where the terminator belongs.
    char* const used = CORBA::string_alloc(text.size());
    std::memset(used, 'x', text.size() + 1);
    CORBA::string_free(used);
    in >> holder;
    EXPECT_STREQ(holder, text.c_str());
}

TEST_F(BinaryStrings, ReusedBufferWithoutATerminatorGetsOneBehindTheBytesWhereThereIsRoom) {
    CORBA_String_var holder("pallas");
    BinaryStream in(6, "ceres!");
    in >> holder;
    EXPECT_STREQ(holder, "ceres!");
}

TEST_F(BinaryStrings, FullBufferWithoutATerminatorLosesItsLastByte) {
    CORBA_String_var holder("vesta");
    BinaryStream in(6, "pallas");
    in >> holder;
    EXPECT_STREQ(holder, "palla");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(BinaryStrings, TerminatorWithinTheBytesEndsTheString) {
    CORBA_String_var holder;
    BinaryStream in(6, std::string("ve\0ta\0", 6));
    in >> holder;
    EXPECT_STREQ(holder, "ve");
}

TEST_F(BinaryStrings, NothingDeliveredReadsAsTheEmptyString) {
    CORBA_String_var holder;
    BinaryStream in(100, "");
    in >> holder;
    EXPECT_STREQ(holder, "");
}

TEST_F(BinaryStrings, HugeLengthsFindNoMemoryAndLeaveTheHolderAsItWas) {
    for (const unsigned long n : {0x7ffffffful, 0x80000000ul, 0xfffffffeul, 0xfffffffful}) {
        CORBA_String_var holder("vesta");
        BinaryStream in(n, "");
        EXPECT_THROW(in >> holder, std::bad_alloc) << n;
        EXPECT_STREQ(holder, "vesta");
        EXPECT_EQ(capacity_of(holder), 6u);
        EXPECT_EQ(in.asked_for, 0u);
    }
}

TEST_F(BinaryStrings, MissingMemoryLeavesTheHolderAsItWas) {
    CORBA_String_var holder("vesta");
    BinaryStream in = binary("a longer text");
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(in >> holder, std::bad_alloc);
    }
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(BinaryStrings, BrokenStreamLeavesAnEmptyString) {
    CORBA_String_var fresh, reused("a long text");
    BinaryStream in = binary("vesta");
    in.broken = true;
    EXPECT_THROW(in >> fresh, CORBA_COMM_FAILURE);
    EXPECT_THROW(in >> reused, CORBA_COMM_FAILURE);
    EXPECT_STREQ(fresh, "");
    EXPECT_STREQ(reused, "");
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 2);
}

// Streams over a standard stream

class TextStream : public KEListream {
public:
    explicit TextStream(std::istream& in) : KEListream(in) {}

    using KEListream::operator>>;

    KEListream& operator>>(char*& s) override {
        given = s;
        if (broken) throw CORBA_COMM_FAILURE();
        s = CORBA::string_dup("from the stream");
        return *this;
    }
    KEListream& operator>>(unsigned long& n) override {
        ADD_FAILURE() << "the text form has its own length";
        n = 0;
        return *this;
    }

    char* given = const_cast<char*>("not called");
    bool broken = false;
};

class TextStrings : public FaultTest {
protected:
    long blocks_before = AllocationPlan::live_blocks();
    std::istringstream nothing;
};

TEST_F(TextStrings, StreamReadsIntoANullPointer) {
    const long before = AllocationPlan::live_blocks();
    TextStream in(nothing);
    CORBA_String_var holder("a long text");
    EXPECT_EQ(&(in >> holder), &in);
    EXPECT_EQ(in.given, nullptr);
    EXPECT_STREQ(holder, "from the stream");
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), before + 1);
}

TEST_F(TextStrings, BrokenStreamLeavesNull) {
    TextStream in(nothing);
    in.broken = true;
    CORBA_String_var holder("vesta");
    EXPECT_THROW(in >> holder, CORBA_COMM_FAILURE);
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(capacity_of(holder), 0u);
}

TEST_F(TextStrings, HolderReadsBackWhatAStreamWrote) {
    std::stringstream text;
    KELostream out(text);
    const CORBA_String_var first("vesta"), second(static_cast<const char*>(nullptr)), third("");
    out << first << second << third;
    KEListream in(text);
    CORBA_String_var holder;
    in >> holder;
    EXPECT_STREQ(holder, "vesta");
    in >> holder;
    EXPECT_EQ(holder.in(), nullptr);
    in >> holder;
    EXPECT_STREQ(holder, "");
}

// Standard input extracts into the caller's buffer, which a holder cannot offer.
TEST_F(TextStrings, HolderOverStandardInputFailsTheStream) {
    std::istringstream word("vesta ");
    std::streambuf* const real = std::cin.rdbuf(word.rdbuf());
    {
        KEListream in(std::cin);
        CORBA_String_var holder("juno");
        in >> holder;
        EXPECT_EQ(holder.in(), nullptr);
        EXPECT_TRUE(std::cin.fail());
    }
    std::cin.rdbuf(real);
    std::cin.clear();
}

}  // namespace
}  // namespace test
}  // namespace kel
