// The addresses of hosts as bytes, and which texts are addresses.
//
// SPDX-License-Identifier: MIT
#include <kel/os/portable.h>

#include <cstring>
#include <iostream>
#include <string>

#include "tests/os/fake_resolver.h"
#include "tests/os/fresh_process.h"
#include "tests/support/fault.h"

using namespace kel::test;

namespace {

class AddressBytes : public FaultTest {};
class BytesOfEitherFamily : public FaultTest {};
class FamilyAndText : public FaultTest {};
class AddressLiteral : public FaultTest {};

// The address bytes of `host` as text, or "none"; 4 or 16 bytes may be written and no more.
std::string bytes_of(int family, const char* host) {
    unsigned char bytes[20];
    std::memset(bytes, 0x5a, sizeof bytes);
    const bool found = KELPortable::ipAddr(family, bytes, host);
    const unsigned size = !found ? 0 : family == AF_INET ? 4 : 16;
    EXPECT_EQ(bytes[size], 0x5a);
    return found ? bytes_text(family, bytes) : "none";
}

// --- Address bytes ----------------------------------------------------------------------------

TEST_F(AddressBytes, AreReadFromAnAddressOfTheFamily) {
    EXPECT_EQ(said([] {
                  unsigned char bytes[4];
                  std::cout << KELPortable::ipAddr(AF_INET, bytes, "10.1.2.3") << int(bytes[0])
                            << int(bytes[3]) << ' ' << bytes_of(AF_INET, "10.1.2.3") << ' '
                            << bytes_of(AF_INET6, "2001:db8::1");
              }),
              "1103 10.1.2.3 2001:db8::1");
}

TEST_F(AddressBytes, OfAnIPv4AddressInIPv6AreTheMappedOnes) {
    EXPECT_EQ(said([] { std::cout << bytes_of(AF_INET6, "10.1.2.3") << seams::getaddrinfo.calls(); }),
              "::ffff:10.1.2.30");
}

TEST_F(AddressBytes, OfAnIPv6AddressInIPv4AreAskedForAndNotFound) {
    EXPECT_EQ(said([] {
                  FakeAddressInfo resolver;
                  std::cout << bytes_of(AF_INET, "::1") << resolver.questions.size();
              }),
              "none1");
}

TEST_F(AddressBytes, OfANullOrEmptyHostAreThoseOfThisMachine) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] { std::cout << bytes_of(AF_INET, nullptr) << ' ' << bytes_of(AF_INET6, ""); }),
              "192.0.2.7 ::ffff:192.0.2.7");
}

TEST_F(AddressBytes, OfANameAreAskedForWithFamilyAndStreamTypeAlone) {
    FakeAddressInfo resolver;
    resolver.knows("somewhere", AF_INET6, "2001:db8::1");
    Armed armed;
    EXPECT_EQ(bytes_of(AF_INET6, "somewhere"), "2001:db8::1");
    ASSERT_EQ(resolver.questions.size(), 1u);
    addrinfo expected = addrinfo();
    expected.ai_family = AF_INET6;
    expected.ai_socktype = SOCK_STREAM;
    EXPECT_EQ(resolver.questions[0].host, "somewhere");
    EXPECT_FALSE(resolver.questions[0].has_service);
    EXPECT_EQ(std::memcmp(&resolver.questions[0].hints, &expected, sizeof expected), 0);
}

TEST_F(AddressBytes, ReleaseTheListThatTheyComeFrom) {
    FakeAddressInfo resolver;
    resolver.knows("somewhere", AF_INET, "192.0.2.1");
    Armed armed;
    EXPECT_EQ(bytes_of(AF_INET, "somewhere"), "192.0.2.1");
    EXPECT_EQ(resolver.released, 1);
    EXPECT_EQ(bytes_of(AF_INET, "nowhere"), "none");
    EXPECT_EQ(resolver.released, 1);
}

TEST_F(AddressBytes, AreNeverFoundInAForeignFamily) {
    Armed armed;
    EXPECT_EQ(bytes_of(AF_UNIX, "10.1.2.3"), "none");
    EXPECT_EQ(bytes_of(AF_UNSPEC, "localhost"), "none");
}

// The bytes of `host` and how many there are.
std::string either(const char* host) {
    unsigned char bytes[16];
    int length = -1;
    const bool found = KELPortable::ipAddr(bytes, length, host);
    const std::string size = std::to_string(length);
    return found ? bytes_text(length == 4 ? AF_INET : AF_INET6, bytes) + '/' + size : "none/" + size;
}

TEST_F(BytesOfEitherFamily, OfAnAddressAreThoseOfItsOwnFamily) {
    Armed armed;
    EXPECT_EQ(either("2001:db8::1"), "2001:db8::1/16");
    EXPECT_EQ(either("10.1.2.3"), "10.1.2.3/4");
    EXPECT_EQ(seams::getaddrinfo.calls(), 0);
}

TEST_F(BytesOfEitherFamily, OfANameAreIPv6First) {
    FakeAddressInfo resolver;
    resolver.knows("both", AF_INET, "192.0.2.1");
    resolver.knows("both", AF_INET6, "2001:db8::1");
    Armed armed;
    EXPECT_EQ(either("both"), "2001:db8::1/16");
    EXPECT_EQ(resolver.questions.size(), 1u);
}

TEST_F(BytesOfEitherFamily, OfANameWithoutIPv6AreIPv4) {
    FakeAddressInfo resolver;
    resolver.knows("old", AF_INET, "192.0.2.1");
    Armed armed;
    EXPECT_EQ(either("old"), "192.0.2.1/4");
    ASSERT_EQ(resolver.questions.size(), 2u);
    EXPECT_EQ(resolver.questions[0].hints.ai_family, AF_INET6);
    EXPECT_EQ(resolver.questions[1].hints.ai_family, AF_INET);
}

TEST_F(BytesOfEitherFamily, OfAnUnknownNameAreNone) {
    FakeAddressInfo resolver;
    Armed armed;
    EXPECT_EQ(either("nowhere"), "none/4");
}

TEST_F(BytesOfEitherFamily, OfANullOrEmptyHostAreThoseOfThisMachine) {
    EXPECT_EQ(said_on("192.0.2.7", [] { std::cout << either(nullptr) << ' ' << either(""); }),
              "192.0.2.7/4 192.0.2.7/4");
}

// --- Family and text --------------------------------------------------------------------------

std::string family_and_text(const char* host) {
    int family = 0;
    const std::string text = taken(KELPortable::host2ip(family, host));
    return std::to_string(family) + ' ' + text;
}

TEST_F(FamilyAndText, OfAnAddressAreItsOwn) {
    Armed armed;
    EXPECT_EQ(family_and_text("2001:DB8::1"), "10 2001:DB8::1");
    EXPECT_EQ(family_and_text("10.1.2.3"), "2 10.1.2.3");
    EXPECT_EQ(seams::getaddrinfo.calls(), 0);
}

TEST_F(FamilyAndText, OfANameAreItsIPv4Address) {
    FakeAddressInfo resolver;
    resolver.knows("both", AF_INET, "192.0.2.1");
    resolver.knows("both", AF_INET6, "2001:db8::1");
    Armed armed;
    EXPECT_EQ(family_and_text("both"), "2 192.0.2.1");
}

TEST_F(FamilyAndText, OfAnUnknownNameAreThisMachinesIPv4Address) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeAddressInfo resolver;
                          std::cout << family_and_text("no.such.name");
                      }),
              "2 192.0.2.7");
}

TEST_F(FamilyAndText, OfANullOrEmptyHostAreThisMachinesIPv4Address) {
    EXPECT_EQ(
        said_on("192.0.2.7", [] { std::cout << family_and_text(nullptr) << ' ' << family_and_text(""); }),
        "2 192.0.2.7 2 192.0.2.7");
}

// --- Literals ---------------------------------------------------------------------------------

TEST_F(AddressLiteral, BelongsToItsFamily) {
    EXPECT_TRUE(KELPortable::isValidIP(AF_INET, "10.1.2.3"));
    EXPECT_TRUE(KELPortable::isValidIP(AF_INET6, "2001:db8::1"));
    EXPECT_TRUE(KELPortable::isValidIP(AF_INET6, "::ffff:10.1.2.3"));
    EXPECT_FALSE(KELPortable::isValidIP(AF_INET, "2001:db8::1"));
    EXPECT_FALSE(KELPortable::isValidIP(AF_INET6, "10.1.2.3"));
}

TEST_F(AddressLiteral, IsNeitherANameNorEmptyNorAShortForm) {
    EXPECT_FALSE(KELPortable::isValidIP(AF_INET, "localhost"));
    EXPECT_FALSE(KELPortable::isValidIP(AF_INET, ""));
    EXPECT_FALSE(KELPortable::isValidIP(AF_INET6, ""));
    EXPECT_FALSE(KELPortable::isValidIP(AF_INET, "10.258"));
}

TEST_F(AddressLiteral, DoesNotExistInAForeignFamily) {
    EXPECT_FALSE(KELPortable::isValidIP(AF_UNIX, "10.1.2.3"));
    EXPECT_FALSE(KELPortable::isValidIP(0, "10.1.2.3"));
}

}  // namespace
