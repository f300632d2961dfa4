// Socket addresses of hosts and peers, what counts as this machine, and the lock around it all.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/os/portable.h>
#include <unistd.h>

#include <cstddef>
#include <cstring>
#include <iostream>
#include <new>
#include <string>

#include "tests/os/fake_resolver.h"
#include "tests/os/fresh_process.h"
#include "tests/support/fault.h"

using namespace kel::test;

namespace {

class SocketAddressOfHost : public FaultTest {};
class TextOfSocketAddress : public FaultTest {};
class PeerAddress : public FaultTest {};
class Locality : public FaultTest {};
class AddressLock : public FaultTest {};

// --- IPv4 socket addresses --------------------------------------------------------------------

sockaddr_in filled_address() {
    sockaddr_in address;
    std::memset(&address, 0x5a, sizeof address);
    return address;
}

std::string converted(const char* host, unsigned short port) {
    sockaddr_in address = filled_address();
    KELPortable::convert(host, port, address);
    return bytes_text(AF_INET, &address.sin_addr) + ':' + std::to_string(ntohs(address.sin_port));
}

TEST_F(SocketAddressOfHost, OfANullOrEmptyHostIsAnyAddress) {
    Armed armed;
    EXPECT_EQ(converted("", 80), "0.0.0.0:80");
    EXPECT_EQ(converted(nullptr, 65535), "0.0.0.0:65535");
}

TEST_F(SocketAddressOfHost, LeavesTheFamilyToTheCaller) {
    sockaddr_in address = filled_address();
    KELPortable::convert("", 80, address);
    EXPECT_EQ(address.sin_family, 0);
    const sockaddr_in zero = {};
    address.sin_port = 0;
    EXPECT_EQ(std::memcmp(&address, &zero, 16), 0);
}

TEST_F(SocketAddressOfHost, OfAnAddressIsThatAddress) {
    EXPECT_EQ(
        said_on("192.0.2.7",
                [] { std::cout << converted("192.0.2.1", 80) << ' ' << seams::gethostbyname_r.calls(); }),
        "192.0.2.1:80 0");
}

TEST_F(SocketAddressOfHost, OfAShortFormIsTheAddressThatItStandsFor) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] { std::cout << converted("10.258", 80) << ' ' << seams::gethostbyname_r.calls(); }),
              "10.0.1.2:80 0");
}

TEST_F(SocketAddressOfHost, OfThisMachineIsTheLoopback) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] { std::cout << converted("192.0.2.7", 80) << ' ' << converted("127.0.0.1", 81); }),
              "127.0.0.1:80 127.0.0.1:81");
}

TEST_F(SocketAddressOfHost, OfANameIsItsFirstAddress) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeResolver resolver({}, "192.0.2.1");
                          std::cout << converted("somewhere", 80);
                      }),
              "192.0.2.1:80");
}

TEST_F(SocketAddressOfHost, AsksTheResolverForTheBroadcastAddress) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeResolver resolver({}, "192.0.2.1");
                          std::cout << converted("255.255.255.255", 80);
                      }),
              "192.0.2.1:80");
}

TEST_F(SocketAddressOfHost, OfAnUnknownNameIsACommunicationFailure) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeResolver resolver({HOST_NOT_FOUND}, "");
                          try {
                              converted("nowhere", 80);
                          } catch (const CORBA_COMM_FAILURE& e) {
                              const CORBA_COMM_FAILURE made_without_arguments;
                              std::cout << (e.minor() == made_without_arguments.minor()) << e.completed();
                          }
                      }),
              "11");
}

TEST_F(SocketAddressOfHost, IsLookedUpOnce) {
    // The test whether the host is this machine asks five times before.
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeResolver resolver({TRY_AGAIN}, "");
                          try {
                              converted("somewhere", 80);
                          } catch (const CORBA_COMM_FAILURE&) {
                              std::cout << resolver.names.size();
                          }
                      }),
              "6");
}

TEST_F(TextOfSocketAddress, IsTheDottedAddressAndThePort) {
    sockaddr_in address = sockaddr_in();
    inet_pton(AF_INET, "192.0.2.1", &address.sin_addr);
    address.sin_port = htons(4711);
    unsigned short port = 0;
    EXPECT_EQ(taken(KELPortable::convert(address, port)), "192.0.2.1");
    EXPECT_EQ(port, 4711);
}

// --- Peer address -----------------------------------------------------------------------------

// What the peer at `address` of `family` is called.
std::string peer_in(int family, const char* address) {
    seams::getpeername.script([=](int fd, sockaddr* peer, socklen_t* size) {
        const sockaddr_in6 zero = {};
        EXPECT_EQ(fd, 17);
        EXPECT_EQ(*size, 28u);
        EXPECT_EQ(std::memcmp(peer, &zero, 28), 0);
        peer->sa_family = static_cast<sa_family_t>(family);
        char* const bytes = reinterpret_cast<char*>(peer);
        if (family == AF_INET) inet_pton(family, address, bytes + offsetof(sockaddr_in, sin_addr));
        if (family == AF_INET6) inet_pton(family, address, bytes + offsetof(sockaddr_in6, sin6_addr));
        return 0;
    });
    unsigned short port = 0;
    Armed armed;
    return taken(KELPortable::peer_addr(17, port));
}

TEST_F(PeerAddress, IsATextInItsFamily) {
    EXPECT_EQ(peer_in(AF_INET, "192.0.2.1"), "192.0.2.1");
    EXPECT_EQ(peer_in(AF_INET6, "2001:db8::1"), "2001:db8::1");
    EXPECT_EQ(peer_in(AF_INET6, "ffff:ffff:ffff:ffff:ffff:ffff:255.255.255.255"),
              "ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff");
}

TEST_F(PeerAddress, OfAForeignFamilyIsNull) {
    EXPECT_EQ(peer_in(AF_UNIX, ""), "(null)");
    EXPECT_EQ(peer_in(0, ""), "(null)");
}

TEST_F(PeerAddress, OfADescriptorThatIsNotConnectedIsNull) {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    unsigned short port = 0;
    EXPECT_EQ(KELPortable::peer_addr(fd, port), nullptr);
    close(fd);
}

TEST_F(PeerAddress, DoesNotWriteThePort) {
    unsigned short port = 4711;
    seams::getpeername.script([](int, sockaddr* peer, socklen_t*) {
        peer->sa_family = AF_INET;
        KELPortable::saSetPort(peer, 80);
        return 0;
    });
    Armed armed;
    EXPECT_EQ(taken(KELPortable::peer_addr(17, port)), "0.0.0.0");
    EXPECT_EQ(port, 4711);
}

TEST_F(PeerAddress, OfANegativeDescriptorIsACallOutOfOrder) {
    unsigned short port = 0;
    try {
        KELPortable::peer_addr(-1, port);
        FAIL();
    } catch (const CORBA_BAD_INV_ORDER& e) {
        EXPECT_EQ(e.minor(), 0x4f4d0004UL);
        EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
    }
}

// --- Locality ---------------------------------------------------------------------------------

TEST_F(Locality, WeakTestKnowsTheLoopbackAndTheOwnAddress) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          std::cout << KELPortable::is_local("127.0.0.1")
                                    << KELPortable::is_local("192.0.2.7") << KELPortable::is_local(nullptr)
                                    << KELPortable::is_local("");
                      }),
              "1111");
}

TEST_F(Locality, WeakTestKnowsNoOtherAddress) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          std::cout << KELPortable::is_local("192.0.2.70")
                                    << KELPortable::is_local("127.0.0.10")
                                    << KELPortable::is_local("127.0.0.2");
                      }),
              "000");
}

TEST_F(Locality, WeakTestKnowsTheLoopbackOnAMachineWithoutAnAddress) {
    EXPECT_EQ(said_on("", [] { std::cout << KELPortable::is_local("127.0.0.1"); }), "1");
}

TEST_F(Locality, WeakTestAsksForTheOwnAddressWhateverTheHost) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeResolver resolver({}, "192.0.2.7");
                          std::cout << KELPortable::is_local("127.0.0.1") << resolver.names.size();
                      }),
              "11");
}

TEST_F(Locality, WeakTestIsFalseForAnUnknownHost) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeResolver resolver({HOST_NOT_FOUND}, "");
                          std::cout << KELPortable::is_local("nowhere");
                      }),
              "0");
}

TEST_F(Locality, WeakTestMakesNoIPv6Test) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeResolver resolver({HOST_NOT_FOUND}, "");
                          std::cout << KELPortable::is_local("::1") << seams::getaddrinfo.calls();
                      }),
              "00");
}

TEST_F(Locality, WeakTestLeavesNothingBehind) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          KELPortable::is_local("192.0.2.1");
                          const long blocks = AllocationPlan::live_blocks();
                          KELPortable::is_local("192.0.2.1");
                          std::cout << AllocationPlan::live_blocks() - blocks;
                      }),
              "0");
}

TEST_F(Locality, StrongTestTakesANullOrEmptyHostForThisMachine) {
    EXPECT_EQ(said_on("", [] { std::cout << KELPortable::isLocal(nullptr) << KELPortable::isLocal(""); }),
              "11");
}

TEST_F(Locality, StrongTestKnowsWhatTheWeakOneKnows) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          std::cout << KELPortable::isLocal("192.0.2.7") << KELPortable::isLocal("127.0.0.1")
                                    << seams::getaddrinfo.calls();
                      }),
              "110");
}

// A machine "juno" with an IPv6 address, and a few other hosts.
std::string strong_test_of(const char* host) {
    return said_on("juno", [host] {
        FakeResolver names({HOST_NOT_FOUND}, "");
        FakeAddressInfo resolver;
        resolver.knows("juno", AF_INET6, "2001:db8::7");
        resolver.knows("alias", AF_INET6, "2001:db8::7");
        resolver.knows("loop", AF_INET6, "::1");
        resolver.knows("other", AF_INET6, "2001:db8::8");
        std::cout << KELPortable::isLocal(host);
    });
}

TEST_F(Locality, StrongTestKnowsTheIPv6Loopback) {
    EXPECT_EQ(strong_test_of("::1"), "1");
    EXPECT_EQ(strong_test_of("loop"), "1");
}

TEST_F(Locality, StrongTestLooksAtEveryPartOfAnIPv6Address) {
    for (const char* almost : {"::2", "0:0:0:0:1::1", "0:0:1::1", "1::1"}) {
        EXPECT_EQ(strong_test_of(almost), "0") << almost;
    }
}

TEST_F(Locality, StrongTestComparesIPv6Addresses) {
    EXPECT_EQ(strong_test_of("2001:db8::7"), "1");
    EXPECT_EQ(strong_test_of("alias"), "1");
    EXPECT_EQ(strong_test_of("other"), "0");
    EXPECT_EQ(strong_test_of("2001:db8::"), "0");
}

TEST_F(Locality, StrongTestComparesAnIPv4AddressAsTheMappedOne) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeResolver names({HOST_NOT_FOUND}, "");
                          FakeAddressInfo resolver;
                          resolver.knows("juno", AF_INET6, "::ffff:192.0.2.9");
                          std::cout << KELPortable::isLocal("192.0.2.9") << KELPortable::isLocal("192.0.2.8");
                      }),
              "10");
}

TEST_F(Locality, StrongTestKnowsTheIPv6LoopbackOnAMachineWithoutAnAddress) {
    EXPECT_EQ(said_on("",
                      [] {
                          FakeResolver names({HOST_NOT_FOUND}, "");
                          std::cout << KELPortable::isLocal("::1") << KELPortable::isLocal("::2");
                      }),
              "10");
}

TEST_F(Locality, StrongTestIsFalseForAnUnknownHost) { EXPECT_EQ(strong_test_of("nowhere"), "0"); }

TEST_F(Locality, StrongTestIsFalseOnAMachineWithoutAnIPv6Address) {
    EXPECT_EQ(said_on("juno",
                      [] {
                          FakeResolver names({HOST_NOT_FOUND}, "");
                          FakeAddressInfo resolver;
                          resolver.knows("other", AF_INET6, "2001:db8::8");
                          std::cout << KELPortable::isLocal("other");
                      }),
              "0");
}

// --- The lock ---------------------------------------------------------------------------------

long locks_held() { return seams::pthread_mutex_lock.calls() - seams::pthread_mutex_unlock.calls(); }

TEST_F(AddressLock, IsHeldWhileTheResolverWorksAndFreeAfterwards) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          seams::gethostbyname_r.script(
                              [](const char*, hostent* entry, char* buffer, size_t, hostent** found, int*) {
                                  std::cout << (locks_held() > 0);
                                  return answer_address("192.0.2.1", entry, buffer, found);
                              });
                          taken(KELPortable::ip_addr("somewhere"));
                          sockaddr_in address;
                          KELPortable::convert("somewhere", 80, address);
                          std::cout << ' ' << locks_held();
                      }),
              "111 0");
}

TEST_F(AddressLock, IsHeldForATextOfAFamilyToo) {
    EXPECT_EQ(said([] {
                  seams::getaddrinfo.script([](const char*, const char*, const addrinfo*, addrinfo**) {
                      std::cout << (locks_held() > 0);
                      return EAI_NONAME;
                  });
                  std::cout << taken(KELPortable::ipAddr(AF_INET6, "somewhere")) << locks_held();
              }),
              "1(null)0");
}

TEST_F(AddressLock, IsFreeAfterMemoryRanOut) {
    EXPECT_EQ(said([] {
                  unsigned short port = 0;
                  AllocationPlan::fail(AllocationPlan::calls() + 1, true);
                  EXPECT_THROW(KELPortable::ip_addr("192.0.2.1"), std::bad_alloc);
                  EXPECT_THROW(KELPortable::ipAddr(AF_INET, "192.0.2.1"), std::bad_alloc);
                  EXPECT_THROW(KELPortable::convert(sockaddr_in(), port), std::bad_alloc);
                  std::cout << seams::pthread_mutex_lock.calls() << locks_held();
              }),
              "30");
}

TEST_F(AddressLock, IsFreeAfterAnExceptionLeft) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          FakeResolver resolver({HOST_NOT_FOUND}, "");
                          try {
                              converted("nowhere", 80);
                          } catch (const CORBA_COMM_FAILURE&) {
                              std::cout << locks_held();
                          }
                      }),
              "0");
}

TEST_F(AddressLock, GuardsTheSystemsSharedTextBuffer) {
    sockaddr_in address = sockaddr_in();
    unsigned short port = 0;
    Armed armed;
    taken(KELPortable::convert(address, port));
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 1);
    EXPECT_EQ(locks_held(), 0);
}

TEST_F(AddressLock, IsRecursive) {
    EXPECT_EQ(said_on("192.0.2.7",
                      [] {
                          KELPortable::_mutex.lock();
                          std::cout << taken(KELPortable::ipAddr(AF_INET, nullptr));
                          KELPortable::_mutex.unlock();
                      }),
              "192.0.2.7");
}

}  // namespace
