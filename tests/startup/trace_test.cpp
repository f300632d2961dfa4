// The report of exception descriptions that DEBUG_STATIC turns on.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "tests/startup/start.h"

namespace {

using kel::test::Outcome;
using kel::test::start;

typedef std::vector<std::pair<std::string, std::string>> Places;  // name and address

// What the program says about addresses on standard error.
Places places(const Outcome& o) {
    Places found;
    std::istringstream lines(o.err);
    std::string name, address;
    while (lines >> name >> address) found.emplace_back(name, address);
    return found;
}

std::string block(const std::string& name, const std::string& address, const std::string& base) {
    return "Statically initializing class: " + name + ", " + address +
           "\n"
           "The class has the following base:\n" +
           base + "\n\n";
}

std::string base(const std::string& name, const std::string& address) { return name + ", " + address; }

// The 41 blocks of the library. The 36 standard exceptions come before their base has a name.
std::string expected_trace(const Places& p) {
    const std::size_t root = 36, system = 37, user = 38, remarshal = 39, load_error = 40;
    std::string text;
    for (std::size_t i = 0; i < 36; ++i)
        text += block(p[i].first, p[i].second, base("(null)", p[system].second));
    text += block(p[root].first, p[root].second, "(null)");
    for (std::size_t i : {system, user}) {
        text += block(p[i].first, p[i].second, base("CORBA::Exception", p[root].second));
    }
    for (std::size_t i : {remarshal, load_error}) {
        text += block(p[i].first, p[i].second, base("CORBA::UserException", p[user].second));
    }
    return text;
}

std::size_t blocks(const std::string& text) {
    std::size_t n = 0;
    for (std::size_t at = 0; (at = text.find("Statically initializing class: ", at)) != std::string::npos;
         ++at)
        ++n;
    return n;
}

TEST(Trace, IsSilentWithoutTheVariable) {
    const Outcome o = start({"describe"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.exit_code, 0);
    EXPECT_EQ(o.out, "");
    EXPECT_EQ(o.err, "");
}

class TraceValue : public testing::TestWithParam<const char*> {};

TEST_P(TraceValue, ReportsEveryDescriptionInTheOrderOfConstruction) {
    const Outcome o = start({"describe", "addresses"}, {std::string("DEBUG_STATIC=") + GetParam()});
    const Places p = places(o);
    ASSERT_EQ(p.size(), 41u);
    EXPECT_EQ(o.out, expected_trace(p));
}

INSTANTIATE_TEST_SUITE_P(Trace, TraceValue, testing::Values("1", "0", "no", ""));

TEST(Trace, HasFortyOneBlocks) { EXPECT_EQ(blocks(start({"describe"}, {"DEBUG_STATIC=1"}).out), 41u); }

TEST(Trace, BeginsWithTheFirstStandardException) {
    const Outcome o = start({"describe", "addresses"}, {"DEBUG_STATIC=1"});
    EXPECT_EQ(o.out.rfind("Statically initializing class: CORBA::UNKNOWN, 0x", 0), 0u);
}

TEST(Trace, StandardExceptionsAreDescribedBeforeTheirBaseHasAName) {
    const Outcome o = start({"describe", "addresses"}, {"DEBUG_STATIC=1"});
    const Places p = places(o);
    ASSERT_EQ(p.size(), 41u);
    const std::string last = block("CORBA::CODESET_INCOMPATIBLE", p[35].second, "(null), " + p[37].second);
    EXPECT_NE(o.out.find(last), std::string::npos);
    EXPECT_EQ(o.out.find("CORBA::SystemException, " + p[37].second),
              o.out.find("Statically initializing class: CORBA::SystemException") + 31);
}

TEST(Trace, GoesToStandardOutputOnly) { EXPECT_EQ(start({"describe"}, {"DEBUG_STATIC=1"}).err, ""); }

TEST(Trace, VariableThatIsSetAfterLoadingComesTooLate) {
    EXPECT_EQ(start({"describe", "later", "set"}, {"DEBUG_STATIC"}).out, "");
}

class LaterTrace : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(_places.size(), 5u);
        ASSERT_EQ(blocks(_outcome.out), 46u);
    }
    std::string address(std::size_t i) const { return _places[i].second; }
    bool has(const std::string& block) const { return _outcome.out.find(block) != std::string::npos; }

    const Outcome _outcome = start({"describe", "later", "unset"}, {"DEBUG_STATIC=1"});
    const Places _places = places(_outcome);
};

TEST_F(LaterTrace, GoesOnAfterTheVariableIsGone) { EXPECT_TRUE(has(block("Base", address(0), "(null)"))); }

TEST_F(LaterTrace, NamesTheBaseAndItsAddress) {
    EXPECT_TRUE(has(block("Derived", address(1), "Base, " + address(0))));
}

TEST_F(LaterTrace, PrintsANullName) { EXPECT_TRUE(has(block("(null)", address(2), "(null)"))); }

TEST_F(LaterTrace, PrintsTheNullNameOfABase) {
    EXPECT_TRUE(has(block("OfNameless", address(3), "(null), " + address(2))));
}

TEST_F(LaterTrace, ReportsADescriptionThatStaysUnregistered) {
    EXPECT_TRUE(has(block("Twin", address(4), "(null)")));
}

}  // namespace
