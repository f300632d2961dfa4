// This machine's name and address, and the addresses of hosts as texts.
//
// SPDX-License-Identifier: MIT
#include <kel/os/portable.h>

#include <cstring>
#include <iostream>
#include <new>
#include <string>

#include "tests/os/fake_resolver.h"
#include "tests/os/fresh_process.h"
#include "tests/support/fault.h"

using namespace kel::test;

namespace {

class OwnName : public FaultTest {};
class OwnAddress : public FaultTest {};
class IPv4Text : public FaultTest {};
class FamilyText : public FaultTest {};

// --- This machine's name ----------------------------------------------------------------------

TEST_F(OwnName, IsAskedForOnceWith256Bytes) {
    EXPECT_EQ(said([] {
                  seams::gethostname.script([](char* buffer, size_t size) {
                      std::cout << size << ' ';
                      std::strcpy(buffer, "juno");
                      return 0;
                  });
                  const char* const name = KELPortable::host_name();
                  std::cout << name << ' ' << (KELPortable::host_name() == name)
                            << seams::gethostname.calls();
              }),
              "256 juno 11");
}

TEST_F(OwnName, ThatFillsTheBufferIsEnded) {
    EXPECT_EQ(said([] {
                  seams::gethostname.script([](char* buffer, size_t size) {
                      std::memset(buffer, 'x', size);
                      return 0;
                  });
                  std::cout << KELPortable::host_name();
              }),
              std::string(255, 'x'));
}

TEST_F(OwnName, IsEmptyWhenTheSystemDoesNotTellIt) {
    EXPECT_EQ(said([] {
                  seams::gethostname.fail(1, EPERM);
                  std::cout << '"' << KELPortable::host_name() << '"';
              }),
              "\"\"");
}

TEST_F(OwnName, OnceKnownIsReadWithoutTheLock) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          KELPortable::host_name();
                          const long locks = seams::pthread_mutex_lock.calls();
                          KELPortable::host_name();
                          std::cout << locks << seams::pthread_mutex_lock.calls() - locks;
                      }),
              "10");
}

TEST_F(OwnName, FoundByAnotherThreadMeanwhileIsNotAskedForAgain) {
    EXPECT_EQ(said([] {
                  const char* found_meanwhile = nullptr;
                  seams::pthread_mutex_lock.script([&](pthread_mutex_t* mutex) {
                      if (found_meanwhile == nullptr) found_meanwhile = KELPortable::host_name();
                      return seams::pthread_mutex_lock.real(mutex);
                  });
                  const char* const name = KELPortable::host_name();
                  std::cout << (name == found_meanwhile) << seams::gethostname.calls();
              }),
              "10");
}

// --- This machine's address -------------------------------------------------------------------

TEST_F(OwnAddress, OfIpAddrIsThatOfTheOwnNameForANullOrEmptyHost) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeResolver resolver({}, "192.0.2.7");
                          std::cout << taken(KELPortable::ip_addr(nullptr)) << ' '
                                    << taken(KELPortable::ip_addr("")) << ' ' << resolver.names.size()
                                    << resolver.names[0];
                      }),
              "192.0.2.7 192.0.2.7 1juno");
}

TEST_F(OwnAddress, IsANewCopyForEachCaller) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          char* const first = KELPortable::ip_addr(nullptr);
                          first[0] = '?';
                          std::cout << taken(KELPortable::ip_addr(nullptr)) << ' ';
                          CORBA::string_free(first);
                          char* const in_family = KELPortable::ipAddr(AF_INET, nullptr);
                          in_family[0] = '?';
                          std::cout << taken(KELPortable::ipAddr(AF_INET, nullptr));
                          CORBA::string_free(in_family);
                      }),
              "192.0.2.7 192.0.2.7");
}

TEST_F(OwnAddress, IpAddrKeepsANull) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeResolver first({HOST_NOT_FOUND}, "");
                          std::cout << taken(KELPortable::ip_addr(nullptr));
                          FakeResolver later({}, "192.0.2.7");
                          std::cout << taken(KELPortable::ip_addr(nullptr)) << later.names.size();
                      }),
              "(null)(null)0");
}

TEST_F(OwnAddress, IpAddrOfAFamilyAsksAgainWhileThereIsNone) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeAddressInfo resolver;
                          FakeResolver names({HOST_NOT_FOUND}, "");
                          std::cout << taken(KELPortable::ipAddr(AF_INET, nullptr)) << ' '
                                    << taken(KELPortable::ipAddr(AF_INET6, nullptr)) << ' ';
                          resolver.knows("juno", AF_INET, "192.0.2.7");
                          resolver.knows("juno", AF_INET6, "2001:db8::7");
                          std::cout << taken(KELPortable::ipAddr(AF_INET, nullptr)) << ' '
                                    << taken(KELPortable::ipAddr(AF_INET6, ""));
                      }),
              "(null) (null) 192.0.2.7 2001:db8::7");
}

TEST_F(OwnAddress, OfAFamilyIsLookedUpOnce) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeAddressInfo resolver;
                          resolver.knows("juno", AF_INET, "192.0.2.7");
                          resolver.knows("juno", AF_INET6, "2001:db8::7");
                          for (int i = 0; i < 3; ++i) {
                              taken(KELPortable::ipAddr(AF_INET, nullptr));
                              taken(KELPortable::ipAddr(AF_INET6, nullptr));
                          }
                          std::cout << resolver.questions.size() << resolver.released;
                      }),
              "22");
}

TEST_F(OwnAddress, OfIpAddrAndOfAFamilyAreKeptApart) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeAddressInfo resolver;
                          resolver.knows("juno", AF_INET, "192.0.2.7");
                          FakeResolver names({}, "192.0.2.8");
                          std::cout << taken(KELPortable::ip_addr(nullptr)) << ' '
                                    << taken(KELPortable::ipAddr(AF_INET, nullptr));
                      }),
              "192.0.2.8 192.0.2.7");
}

TEST_F(OwnAddress, OfIPv4MayComeFromIpAddrAndIsKeptThen) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeAddressInfo resolver;
                          FakeResolver names({}, "192.0.2.8");
                          std::cout << taken(KELPortable::ipAddr(AF_INET, nullptr)) << ' '
                                    << taken(KELPortable::ipAddr(AF_INET, "")) << ' '
                                    << resolver.questions.size() << names.names.size();
                      }),
              "192.0.2.8 192.0.2.8 11");
}

TEST_F(OwnAddress, IsFoundByALaterCallWhenThereWasNoMemory) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          // No memory for the text that is kept, then for the caller's copy of it.
                          for (int allocation = 1; allocation <= 2; ++allocation) {
                              AllocationPlan::fail(AllocationPlan::calls() + allocation);
                              EXPECT_THROW(KELPortable::ip_addr(nullptr), std::bad_alloc);
                              AllocationPlan::fail(AllocationPlan::calls() + allocation);
                              EXPECT_THROW(KELPortable::ipAddr(AF_INET, nullptr), std::bad_alloc);
                          }
                          AllocationPlan::fail(0);
                          std::cout << taken(KELPortable::ip_addr(nullptr)) << ' '
                                    << taken(KELPortable::ipAddr(AF_INET, nullptr));
                      }),
              "192.0.2.7 192.0.2.7");
}

TEST_F(OwnAddress, OfAForeignFamilyIsNull) {
    EXPECT_EQ(said_on("192.0.2.7", [] { std::cout << taken(KELPortable::ipAddr(AF_UNIX, nullptr)); }),
              "(null)");
}

TEST_F(OwnAddress, IsUnknownEverywhereWithoutAName) {
    EXPECT_EQ(said_on("",
                      [] {
                          char bytes[16];
                          int length = 0;
                          int family = 0;
                          std::cout << taken(KELPortable::ip_addr(nullptr))
                                    << taken(KELPortable::ipAddr(AF_INET, ""))
                                    << taken(KELPortable::ipAddr(AF_INET6, nullptr))
                                    << taken(KELPortable::host2ip(family, nullptr))
                                    << KELPortable::ipAddr(AF_INET, bytes, nullptr)
                                    << KELPortable::ipAddr(AF_INET6, bytes, "")
                                    << KELPortable::ipAddr(bytes, length, nullptr)
                                    << KELPortable::is_local(nullptr) << KELPortable::is_local("192.0.2.1")
                                    << KELPortable::isLocal("192.0.2.1");
                          std::cout << seams::getaddrinfo.calls() << seams::gethostbyname_r.calls();
                      }),
              "(null)(null)(null)(null)00000000");
}

// --- IPv4 text --------------------------------------------------------------------------------

TEST_F(IPv4Text, OfAnAddressIsTheTextItself) {
    EXPECT_EQ(said([] {
                  for (const char* host : {"10.1.2.3", "10.258", "0x7f.1"}) {
                      std::cout << taken(KELPortable::ip_addr(host)) << ' ';
                  }
                  std::cout << seams::gethostbyname_r.calls();
              }),
              "10.1.2.3 10.258 0x7f.1 0");
}

TEST_F(IPv4Text, OfANameIsItsFirstAddress) {
    EXPECT_EQ(said([] {
                  FakeResolver resolver({}, "192.0.2.1");
                  std::cout << taken(KELPortable::ip_addr("somewhere")) << ' ' << resolver.names[0];
              }),
              "192.0.2.1 somewhere");
}

TEST_F(IPv4Text, IsTriedFiveTimesWhileTheResolverSaysTryAgain) {
    EXPECT_EQ(said([] {
                  FakeResolver resolver({TRY_AGAIN}, "");
                  std::cout << taken(KELPortable::ip_addr("somewhere")) << resolver.names.size();
              }),
              "(null)5");
}

TEST_F(IPv4Text, IsFoundInTheFifthTry) {
    EXPECT_EQ(said([] {
                  FakeResolver resolver(std::deque<int>(4, TRY_AGAIN), "192.0.2.1");
                  std::cout << taken(KELPortable::ip_addr("somewhere")) << ' ' << resolver.names.size();
              }),
              "192.0.2.1 5");
}

TEST_F(IPv4Text, IsNullAtOnceForAnyOtherCode) {
    EXPECT_EQ(said([] {
                  FakeResolver resolver({HOST_NOT_FOUND}, "");
                  std::cout << taken(KELPortable::ip_addr("somewhere")) << resolver.names.size();
              }),
              "(null)1");
}

TEST_F(IPv4Text, AsksTheResolverForTheBroadcastAddress) {
    EXPECT_EQ(said([] {
                  FakeResolver resolver({}, "192.0.2.1");
                  std::cout << taken(KELPortable::ip_addr("255.255.255.255")) << ' ' << resolver.names[0];
              }),
              "192.0.2.1 255.255.255.255");
}

TEST_F(IPv4Text, IsNullForAnEntryThatHoldsNoIPv4Address) {
    EXPECT_EQ(said([] {
                  static int family = AF_INET6;
                  seams::gethostbyname_r.script(
                      [](const char*, hostent* entry, char* buffer, size_t, hostent** found, int*) {
                          answer_address("192.0.2.1", entry, buffer, found);
                          entry->h_addrtype = family;
                          if (family == AF_INET) entry->h_addr_list[0] = nullptr;
                          return 0;
                      });
                  std::cout << taken(KELPortable::ip_addr("somewhere"));
                  family = AF_INET;
                  std::cout << taken(KELPortable::ip_addr("somewhere"));
              }),
              "(null)(null)");
}

// --- Text in a family -------------------------------------------------------------------------

TEST_F(FamilyText, OfAnAddressOfTheFamilyIsTheTextItself) {
    EXPECT_EQ(said([] {
                  std::cout << taken(KELPortable::ipAddr(AF_INET, "10.1.2.3")) << ' '
                            << taken(KELPortable::ipAddr(AF_INET6, "2001:DB8:0::1")) << ' '
                            << seams::getaddrinfo.calls();
              }),
              "10.1.2.3 2001:DB8:0::1 0");
}

TEST_F(FamilyText, OfANameIsThatOfItsAddress) {
    EXPECT_EQ(said([] {
                  FakeAddressInfo resolver;
                  resolver.knows("somewhere", AF_INET, "192.0.2.1");
                  resolver.knows("somewhere", AF_INET6, "2001:db8::1");
                  std::cout << taken(KELPortable::ipAddr(AF_INET, "somewhere")) << ' '
                            << taken(KELPortable::ipAddr(AF_INET6, "somewhere"));
              }),
              "192.0.2.1 2001:db8::1");
}

TEST_F(FamilyText, OfAnIPv4AddressInIPv6IsTheMappedOne) {
    EXPECT_EQ(said([] { std::cout << taken(KELPortable::ipAddr(AF_INET6, "10.1.2.3")); }), "::ffff:10.1.2.3");
}

TEST_F(FamilyText, AnUnknownHostHasTheOwnAddressInIPv4) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeAddressInfo resolver;
                          std::cout << taken(KELPortable::ipAddr(AF_INET, "no.such.name"));
                      }),
              "192.0.2.7");
}

TEST_F(FamilyText, TheOwnAddressOfAnUnknownHostIsThatOfIpAddr) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeAddressInfo resolver;
                          resolver.knows("juno", AF_INET, "192.0.2.7");
                          FakeResolver names({}, "192.0.2.8");
                          std::cout << taken(KELPortable::ipAddr(AF_INET, "no.such.name"));
                      }),
              "192.0.2.8");
}

TEST_F(FamilyText, AnUnknownHostIsNullInIPv6) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeAddressInfo resolver;
                          std::cout << taken(KELPortable::ipAddr(AF_INET6, "no.such.name"));
                      }),
              "(null)");
}

TEST_F(FamilyText, IsNullInAForeignFamily) {
    EXPECT_EQ(said_on("192.0.2.7", [] { std::cout << taken(KELPortable::ipAddr(AF_UNIX, "10.1.2.3")); }),
              "(null)");
}

}  // namespace
