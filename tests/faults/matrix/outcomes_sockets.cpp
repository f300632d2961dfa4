// What is stated for connecting, listening and accepting.
//
// SPDX-License-Identifier: MIT
#include <netdb.h>

#include <cerrno>

#include "tests/faults/matrix/stated.h"

namespace kel {
namespace test {

namespace {

// Errors that mean that the system has nothing left; all others are the connection's.
const std::vector<int> out_of_resources = {ENOMEM, EMFILE};
// Errors of connect that end an address. The others are tried again or wait.
const std::vector<int> final_errors = {ETIMEDOUT, EHOSTUNREACH, ENETUNREACH, EINTR, EACCES};
const std::vector<int> refused = {ECONNREFUSED};
const std::vector<int> in_use = {EADDRINUSE};
const std::vector<int> pending = {EINPROGRESS, EAGAIN};
const char* const refused_minor = "0x4f4d006f";

const char* const interrupted_for_ever =
    "every interruption waits again: Connect.AnInterruptedWaitStartsAgainInFull";

std::vector<Row> listen_rows() {
    return {
        {"Listen*", "getaddrinfo", {}, any, throws("COMM_FAILURE", "{code}")},
        {"ListenEverywhere", "socket bind", {}, once, ignored()},
        {"ListenOnARangeOfPorts", "bind", {}, once, ignored()},
        {"Listen*", "socket", out_of_resources, any, throws("NO_RESOURCES")},
        {"Listen*", "socket bind listen", {}, any, throws("COMM_FAILURE")},
        {"Accept*", "accept", out_of_resources, any, throws("NO_RESOURCES")},
        {"Accept*", "accept", {}, any, throws("COMM_FAILURE")},
    };
}

std::vector<Row> socket_rows_of_one() {
    return {
        {"Socket*", "connect", pending, any, ignored()},
        {"SocketConnectsTooLate", "poll", {EINTR}, once, ignored()},
        {"Socket*", "poll", {EINTR}, once, ignored()},
        {"Socket*", "poll", {EINTR}, for_ever, left_out(interrupted_for_ever)},
        {"Socket*", "connect poll", {}, any, gives("error {error}, closed")},
        {"Socket*", "getsockopt getsockname", {}, any, gives("error 111, closed")},
    };
}

// What is asked about the host before it is connected to.
std::vector<Row> look_up_rows() {
    const std::string name = "client bind on [me] failed; improper bind name for ";
    const Stated no_name = throws("BAD_PARAM", "0x4f4d0008", "NO", name + "IPv4 socket.");
    const Stated no_name_in_ipv6 = throws("BAD_PARAM", "0x4f4d0008", "NO", name + "IPv6 socket.");
    return {
        {"Connect*", "getaddrinfo", {}, nth(1), throws("TRANSIENT", "{code}")},
        // The bind name is the fourth; without an answer to the second the third is not asked.
        {"ConnectBoundByNameInIpv6", "getaddrinfo", {}, nth(4), no_name_in_ipv6},
        {"ConnectBoundByNameInIpv6", "getaddrinfo", {}, for_ever, no_name_in_ipv6},
        {"ConnectBoundByName", "gethostbyname_r", {TRY_AGAIN}, once, ignored()},
        {"ConnectBoundByName", "gethostbyname_r", {}, nth_once(2), no_name},
        {"ConnectBoundByName", "gethostbyname_r", {}, for_ever, no_name},
        // A host that is not known to be local counts as remote.
        {"Connect*", "getaddrinfo gethostbyname_r", {}, any, ignored()},
    };
}

std::vector<Row> attempt_rows() {
    const Stated not_bound =
        throws("BAD_PARAM", "0x4f4d0008", "NO", "client bind on [10.9.9.9] failed; {text}");
    return {
        {"ConnectTwo", "socket poll", {}, once, ignored()},
        {"Connect*", "socket", out_of_resources, any, throws("NO_RESOURCES")},
        {"Connect*", "socket", {}, any, throws("TRANSIENT")},
        {"ConnectBound", "bind", {}, any, not_bound},
        {"ConnectBoundInIpv6",
         "bind",
         {},
         any,
         throws("BAD_PARAM", "0x4f4d0008", "NO", "client bind on [2001:db8::5] failed; {text}")},
        {"ConnectBoundByName*",
         "bind",
         {},
         any,
         throws("BAD_PARAM", "0x4f4d0008", "NO", "client bind on [me] failed; {text}")},
        // A refusal and an address in use are tried again; the next address takes over from other errors.
        {"Connect*", "connect", refused, once, ignored()},
        {"Connect*", "connect", in_use, once, ignored()},
        {"ConnectRefused", "connect", pending, any, gives("connected")},
        {"Connect*", "connect", pending, any, ignored()},
        {"ConnectTwo", "connect", {}, once, ignored()},
        {"Connect*", "connect", {ENOMEM}, any, throws("NO_RESOURCES")},
        {"Connect*", "connect", {}, any, throws("TRANSIENT")},
        // A socket whose own address or whose error is unknown counts as refused.
        {"Connect*", "getsockname getsockopt", {}, once, ignored()},
        {"Connect*", "getsockname getsockopt", {}, for_ever, throws("TRANSIENT", refused_minor)},
        {"Connect*", "poll", {EINTR}, once, ignored()},
        {"ConnectInTimeBySelect", "select", {EINTR}, once, ignored()},
        {"Connect*", "poll", {EINTR}, for_ever, left_out(interrupted_for_ever)},
        {"ConnectInTimeBySelect", "select", {EINTR}, for_ever, left_out(interrupted_for_ever)},
        {"Connect*", "poll", {ENOMEM}, any, throws("NO_RESOURCES")},
        {"ConnectInTimeBySelect", "select", {ENOMEM}, any, throws("NO_RESOURCES")},
        {"Connect*", "poll", {}, any, throws("TRANSIENT")},
        {"ConnectInTimeBySelect", "select", {}, any, throws("TRANSIENT")},
        // Pauses between attempts.
        {"Connect*", "select sleep", {}, any, ignored()},
    };
}

}  // namespace

std::vector<Row> socket_rows() {
    std::vector<Row> all;
    for (const auto& part : {listen_rows(), socket_rows_of_one(), look_up_rows(), attempt_rows()}) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}

namespace {

std::vector<PairRow> listen_pair_rows() {
    const Stated no_resources = throws("NO_RESOURCES");
    const Stated failed = throws("COMM_FAILURE");
    return {
        // The minor code of a failed listen is read after the socket is closed.
        {"Listen*", "listen", {}, "close", {}, Taken::own, failed},
        // Neither of the two addresses can be had.
        {"ListenEverywhere", "socket bind", {}, "socket", out_of_resources, Taken::own, no_resources},
        {"ListenEverywhere", "socket bind", {}, "socket bind", {}, Taken::own, failed},
        // No port of three is left: of the two that were free before, the last to fail counts.
        {"ListenOnARangeOfPorts",
         "bind",
         {},
         "bind",
         {},
         Taken::own,
         throws("COMM_FAILURE", "0x4f4d0062"),
         2},
        {"ListenOnARangeOfPorts", "bind", {}, "bind", {}, Taken::own, failed, 3},
    };
}

// Without a time-out the second refusal ends an address.
std::vector<PairRow> refusal_pair_rows() {
    const char* const one_address =
        "ConnectOne ConnectForReal ConnectLoopback ConnectLinkLocal ConnectBound*";
    const Stated twice = throws("TRANSIENT", refused_minor);
    return {
        {one_address, "connect", refused, "connect", refused, Taken::own, twice},
        {one_address, "connect", refused, "getsockname", {}, Taken::own, twice},
        {one_address, "getsockname", {}, "connect", refused, Taken::own, twice},
        {one_address, "getsockname", {}, "getsockname", {}, Taken::own, twice},
        // A connection that fails after all is refused like those before and after it.
        {"ConnectRefused", "connect", pending, "getsockopt getsockname", {}, Taken::own, twice},
        {"ConnectRefused", "connect", pending, "poll", {EINTR}, Taken::as_the_first},
        {"ConnectRefused", "connect", pending, "poll", {}, Taken::as_the_second},
    };
}

// The bind name is looked up for every attempt anew.
std::vector<PairRow> bind_name_pair_rows() {
    const std::vector<int> try_again = {TRY_AGAIN};
    const std::vector<int> for_good = {HOST_NOT_FOUND, NO_RECOVERY, NO_DATA, NETDB_INTERNAL};
    const std::string name = "client bind on [me] failed; improper bind name for ";
    const Stated no_name = throws("BAD_PARAM", "0x4f4d0008", "NO", name + "IPv4 socket.");
    const Stated no_name_in_ipv6 = throws("BAD_PARAM", "0x4f4d0008", "NO", name + "IPv6 socket.");
    return {
        {"ConnectBoundByName", "gethostbyname_r", try_again, "gethostbyname_r", {}, Taken::own, ignored(), 2},
        {"ConnectBoundByName",
         "gethostbyname_r connect getsockname",
         {},
         "gethostbyname_r",
         for_good,
         Taken::own,
         no_name,
         3},
        {"ConnectBoundByNameInIpv6",
         "getaddrinfo connect getsockname",
         {},
         "getaddrinfo",
         {},
         Taken::own,
         no_name_in_ipv6},
    };
}

// Two addresses: a failure that ends the first leaves the second alone, a second one leaves none. The
// next attempt on the same address needs a socket at once.
std::vector<PairRow> two_address_pair_rows() {
    const Stated no_resources = throws("NO_RESOURCES");
    const Stated failed = throws("TRANSIENT");
    std::vector<int> ending = final_errors;
    ending.push_back(ENOMEM);
    return {
        {"ConnectTwo",
         "socket connect getsockname",
         {},
         "socket",
         out_of_resources,
         Taken::own,
         no_resources},
        {"ConnectTwo", "socket connect getsockname", {}, "socket", {}, Taken::own, failed},
        {"ConnectTwo", "socket", {}, "connect", {ENOMEM}, Taken::own, no_resources},
        {"ConnectTwo", "connect", ending, "connect", {ENOMEM}, Taken::own, no_resources},
        {"ConnectTwo", "socket", {}, "connect", final_errors, Taken::own, failed},
        {"ConnectTwo", "connect", ending, "connect", final_errors, Taken::own, failed},
    };
}

}  // namespace

std::vector<PairRow> socket_pair_rows() {
    std::vector<PairRow> all;
    for (const auto& part :
         {listen_pair_rows(), refusal_pair_rows(), bind_name_pair_rows(), two_address_pair_rows()}) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}

}  // namespace test
}  // namespace kel
