// What is stated for names and addresses.
//
// SPDX-License-Identifier: MIT
#include <netdb.h>

#include "tests/faults/matrix/stated.h"

namespace kel {
namespace test {

namespace {

// A machine without a name has no address, and that is kept. The first failure is kept by ip_addr, not
// by ipAddr.
std::vector<Row> first_time_rows() {
    return {
        {"FirstHostName", "gethostname", {}, any, gives("<>").afterwards("<>")},
        {"FirstOwn*", "gethostname", {}, any, gives("null").afterwards("null")},
        {"FirstOwnAddress", "gethostbyname_r", {TRY_AGAIN}, once, ignored()},
        {"FirstOwnAddress", "gethostbyname_r", {}, any, gives("null").afterwards("null")},
        // In IPv4 the address that ip_addr finds stands in, and stays.
        {"FirstOwnIpv4Address", "getaddrinfo", {}, any, ignored().afterwards("192.0.2.7")},
        {"FirstOwnIpv4Address", "gethostbyname_r", {}, any, gives("null")},
        {"FirstOwnIpv6Address", "getaddrinfo", {}, any, gives("null")},
    };
}

std::vector<Row> text_rows() {
    return {
        {"Ipv4Text WeakLocality", "gethostbyname_r", {TRY_AGAIN}, once, ignored()},
        {"Ipv4Text", "gethostbyname_r", {}, any, gives("null")},
        {"TextInFamilyIpv4 TextAndFamily", "getaddrinfo", {}, any, gives("192.0.2.7")},
        {"TextInFamilyIpv6", "getaddrinfo", {}, any, gives("null")},
        {"BytesInIpv4 BytesInIpv6", "getaddrinfo", {}, any, gives("0, 0")},
        {"BytesInEitherFamily", "getaddrinfo", {}, once, gives("1, 4 bytes")},
        {"BytesInEitherFamily", "getaddrinfo", {}, for_ever, gives("0, 4 bytes")},
        // The first question asks whether the host is this machine, the second for its address.
        {"SocketAddressOfAHost", "gethostbyname_r", {}, nth_once(1), ignored()},
        {"SocketAddressOfAHost", "gethostbyname_r", {}, any, throws("COMM_FAILURE", "0x4f4d0000")},
        {"WeakLocality", "gethostbyname_r", {}, any, gives("0")},
        {"StrongLocality", "gethostbyname_r", {}, any, ignored()},
        {"StrongLocality", "getaddrinfo", {}, any, gives("0")},
    };
}

std::vector<Row> socket_address_rows() {
    return {
        {"PeerAddress", "getpeername", {}, any, gives("null")},
        {"LocalPort", "getsockname", {}, any, gives("-1")},
        {"ScopeOfALinkLocalAddress", "if_nametoindex", {}, any, gives("0")},
        {"AddressBecomesTheOwn", "getaddrinfo", {}, any, gives("127.0.0.1:80")},
        {"ListToListen ListForReal", "getaddrinfo", {}, any, throws("COMM_FAILURE", "{code}")},
        {"ListToConnect", "getaddrinfo", {}, any, throws("TRANSIENT", "{code}")},
    };
}

}  // namespace

std::vector<Row> address_rows() {
    std::vector<Row> all;
    for (const auto& part : {first_time_rows(), text_rows(), socket_address_rows()}) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}

std::vector<PairRow> address_pair_rows() {
    const std::vector<int> try_again = {TRY_AGAIN};
    const std::vector<int> for_good = {HOST_NOT_FOUND, NO_RECOVERY, NO_DATA, NETDB_INTERNAL};
    const Stated no_address = throws("COMM_FAILURE", "0x4f4d0000");
    return {
        // Both ways to the own address fail: null now, and the first way is tried again.
        {"FirstOwnIpv4Address", "getaddrinfo", {}, "gethostbyname_r", try_again, Taken::as_the_first},
        {"FirstOwnIpv4Address", "getaddrinfo", {}, "gethostbyname_r", {}, Taken::as_the_second},
        {"BytesInEitherFamily", "getaddrinfo", {}, "getaddrinfo", {}, Taken::own, gives("0, 4 bytes")},
        // The second try is still about the locality.
        {"SocketAddressOfAHost",
         "gethostbyname_r",
         try_again,
         "gethostbyname_r",
         {},
         Taken::own,
         ignored(),
         2},
        {"SocketAddressOfAHost",
         "gethostbyname_r",
         try_again,
         "gethostbyname_r",
         {},
         Taken::own,
         no_address,
         3},
        {"Ipv4Text FirstOwnAddress WeakLocality", "gethostbyname_r", try_again, "gethostbyname_r", for_good,
         Taken::as_the_second},
    };
}

}  // namespace test
}  // namespace kel
