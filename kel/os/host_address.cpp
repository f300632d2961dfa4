// SPDX-License-Identifier: MIT
#include <arpa/inet.h>
#include <kel/containers/strings.h>
#include <kel/exceptions/standard.h>
#include <kel/os/base_util.h>
#include <kel/os/internal/owners.h>
#include <kel/os/portable.h>
#include <unistd.h>

#include <cstring>

namespace {

// This machine's name. It is complete once the flag is set, which is read without the lock as well.
char own_name[256];
unsigned char own_name_known;

// Deliberate: the three kept addresses are separate. That of ip_addr is found once, a null included;
// those of ipAddr are asked for again while they are null. Pinned by OwnAddress.IpAddrKeepsANull,
// OwnAddress.IpAddrOfAFamilyAsksAgainWhileThereIsNone and OwnAddress.OfIpAddrAndOfAFamilyAreKeptApart.
char* own_ip KEL_GUARDED_BY(KELPortable::_mutex);
bool own_ip_known KEL_GUARDED_BY(KELPortable::_mutex);
char* own_ipv4_text KEL_GUARDED_BY(KELPortable::_mutex);
char* own_ipv6_text KEL_GUARDED_BY(KELPortable::_mutex);

// Deliberate: ip_addr gives up after five tries, where gethostbyname never does. Pinned by
// IPv4Text.IsTriedFiveTimesWhileTheResolverSaysTryAgain.
const int ip_addr_tries = 5;

const char loopback[] = "127.0.0.1";

bool is_loopback(const char* text) { return std::strcmp(text, loopback) == 0; }

bool is_empty(const char* text) { return text == nullptr || *text == '\0'; }

// This machine's name, or null when it has none. A null or empty name handed on would mean this
// machine again, and so on for ever.
const char* own_name_or_null() {
    const char* const name = KELPortable::host_name();
    return is_empty(name) ? nullptr : name;
}

// This machine's address for ip_addr; null when its name is unknown.
const char* own_ip_text() KEL_REQUIRES(KELPortable::_mutex) {
    if (!own_ip_known) {
        const char* const name = own_name_or_null();
        own_ip = name != nullptr ? KELPortable::ip_addr(name) : nullptr;
        own_ip_known = true;
    }
    return own_ip;
}

// This machine's address for ipAddr; null when its name is unknown or the family is not handled.
const char* own_text(int af) KEL_REQUIRES(KELPortable::_mutex) {
    if (af != AF_INET && af != AF_INET6) return nullptr;
    char*& text = af == AF_INET ? own_ipv4_text : own_ipv6_text;
    if (text == nullptr) {
        const char* const name = own_name_or_null();
        if (name != nullptr) text = KELPortable::ipAddr(af, name);
    }
    return text;
}

// Reads the text of an IPv4 address. inet_pton knows the common form alone and takes less than half the time;
// what it refuses may be another form. Deliberate: the broadcast address has the value that stands for "no
// address" and so counts as a name. Pinned by IPv4Text.AsksTheResolverForTheBroadcastAddress.
bool read_ipv4(const char* text, in_addr& address) {
    if (inet_pton(AF_INET, text, &address) != 1) address.s_addr = inet_addr(text);
    return address.s_addr != INADDR_NONE;
}

// Asks for the IPv4 address of `host`, up to `tries` times while the resolver says "try again".
bool look_up_ipv4(const char* host, int tries, in_addr& address) {
    vhostname record;
    const hostent* entry = nullptr;
    do {
        record._h_errno = 0;
        entry = BaseUtil::vgethostbyname_r(host, &record);
    } while (entry == nullptr && record._h_errno == TRY_AGAIN && --tries > 0);
    if (entry == nullptr || entry->h_addrtype != AF_INET || entry->h_addr_list[0] == nullptr) return false;
    std::memcpy(&address, entry->h_addr_list[0], sizeof address);
    return true;
}

// The text of the IPv4 address of `host`, or of this machine; null when unresolved. It lies in `host`, in
// what is kept of this machine or where the thread's next text of an address goes.
const char* ip_text(const char* host) KEL_REQUIRES(KELPortable::_mutex) {
    if (is_empty(host)) return own_ip_text();
    in_addr address;
    if (read_ipv4(host, address)) return host;
    return look_up_ipv4(host, ip_addr_tries, address) ? inet_ntoa(address) : nullptr;
}

// The IPv4 address under which to reach `host`; this machine is reached over the loopback.
in_addr ipv4_to_reach(const char* host) {
    if (KELPortable::is_local(host)) host = loopback;
    in_addr address;
    if (!read_ipv4(host, address) && !look_up_ipv4(host, 1, address)) throw CORBA_COMM_FAILURE();
    return address;
}

bool read_as_mapped_address(const char* ipv4, void* addr) {
    const char prefix[] = "::FFFF:";
    CORBA_String_var text(CORBA::string_alloc(sizeof prefix - 1 + std::strlen(ipv4)));
    std::strcpy(text, prefix);
    std::strcat(text, ipv4);
    return inet_pton(AF_INET6, text, addr) == 1;
}

// The first address that the system knows for `host` in one of the two families.
bool look_up_address(int af, const char* host, void* addr) {
    addrinfo hints = addrinfo();
    hints.ai_family = af;
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    if (getaddrinfo(host, nullptr, &hints, &found) != 0) return false;
    const kel::internal::AddressList list(found);
    if (af == AF_INET) {
        std::memcpy(addr, &reinterpret_cast<const sockaddr_in*>(list->ai_addr)->sin_addr, sizeof(in_addr));
    } else {
        std::memcpy(addr, &reinterpret_cast<const sockaddr_in6*>(list->ai_addr)->sin6_addr, sizeof(in6_addr));
    }
    return true;
}

}  // namespace

const char* KELPortable::host_name() {
    if (__atomic_load_n(&own_name_known, __ATOMIC_ACQUIRE)) return own_name;
    KELRMutex_var hold(_mutex, 1);
    if (own_name_known) return own_name;
    // A failed call leaves the name empty, which counts as unknown; a cut one is ended here.
    gethostname(own_name, sizeof own_name);
    own_name[sizeof own_name - 1] = '\0';
    __atomic_store_n(&own_name_known, 1, __ATOMIC_RELEASE);
    return own_name;
}

char* KELPortable::ip_addr(const char* host) {
    // Deliberate: the lock is held while the resolver works, so that the own address is asked for once
    // however many threads need it. Pinned by AddressLock.IsHeldWhileTheResolverWorksAndFreeAfterwards.
    KELRMutex_var hold(_mutex, 1);
    return CORBA::string_dup(ip_text(host));
}

char* KELPortable::ipAddr(int af, const char* host) {
    KELRMutex_var hold(_mutex, 1);
    if (is_empty(host)) return CORBA::string_dup(own_text(af));
    unsigned char address[sizeof(in6_addr)];
    if (inet_pton(af, host, address) == 1) return CORBA::string_dup(host);
    if (ipAddr(af, address, host)) {
        char text[128];
        return CORBA::string_dup(inet_ntop(af, address, text, sizeof text));
    }
    // Deliberate: an unknown host has this machine's address in IPv4 and none in IPv6. Pinned by
    // FamilyText.AnUnknownHostHasTheOwnAddressInIPv4.
    return af == AF_INET ? ip_addr(nullptr) : nullptr;
}

bool KELPortable::ipAddr(int af, void* addr, const char* host) {
    if (is_empty(host)) host = own_name_or_null();
    if (host == nullptr || (af != AF_INET && af != AF_INET6)) return false;
    if (inet_pton(af, host, addr) == 1) return true;
    if (af == AF_INET6 && isValidIP(AF_INET, host)) return read_as_mapped_address(host, addr);
    return look_up_address(af, host, addr);
}

bool KELPortable::ipAddr(void* addr, int& len, const char* host) {
    if (is_empty(host)) host = host_name();
    // The text of an IPv4 address must not reach the IPv6 look-up, which would map it.
    if (isValidIP(AF_INET, host) || !ipAddr(AF_INET6, addr, host)) {
        len = sizeof(in_addr);
        return ipAddr(AF_INET, addr, host);
    }
    len = sizeof(in6_addr);
    return true;
}

char* KELPortable::host2ip(int& af, const char* host) {
    const int family = !is_empty(host) && isValidIP(AF_INET6, host) ? AF_INET6 : AF_INET;
    char* const text = ipAddr(family, host);
    af = family;
    return text;
}

void KELPortable::convert(const char* host, unsigned short port, sockaddr_in& sa) {
    KELRMutex_var hold(_mutex, 1);
    // Deliberate: the family stays 0, callers set it. Pinned by
    // SocketAddressOfHost.LeavesTheFamilyToTheCaller.
    sa = sockaddr_in();
    if (!is_empty(host)) sa.sin_addr = ipv4_to_reach(host);
    sa.sin_port = htons(port);
}

char* KELPortable::convert(const sockaddr_in& sa, unsigned short& port) {
    KELRMutex_var hold(_mutex, 1);
    char* const text = CORBA::string_dup(inet_ntoa(sa.sin_addr));
    port = ntohs(sa.sin_port);
    return text;
}

// Deliberate: the port is not written; callers keep the one they had. Pinned by
// PeerAddress.DoesNotWriteThePort.
char* KELPortable::peer_addr(int fd, unsigned short&) {
    if (fd < 0) throw CORBA_BAD_INV_ORDER(4, CORBA::COMPLETED_MAYBE);
    sockaddr_in6 peer = sockaddr_in6();
    socklen_t size = sizeof peer;
    if (getpeername(fd, reinterpret_cast<sockaddr*>(&peer), &size) != 0) return nullptr;
    const void* address = &peer.sin6_addr;  // inet_ntop gives null for a foreign family
    if (peer.sin6_family == AF_INET) address = &reinterpret_cast<const sockaddr_in&>(peer).sin_addr;
    char text[INET6_ADDRSTRLEN];
    return CORBA::string_dup(inet_ntop(peer.sin6_family, address, text, sizeof text));
}

bool KELPortable::is_local(const char* host) {
    KELRMutex_var hold(_mutex, 1);
    const char* const own = own_ip_text();  // asked for once, whatever the first host is
    // The usual text is not read as an address first, which would take a two-hundredth of a whole connect.
    if (host != nullptr && is_loopback(host)) return true;
    const char* const asked = ip_text(host);
    if (asked == nullptr) return false;
    if (is_loopback(asked)) return true;
    return own != nullptr && std::strcmp(own, asked) == 0;
}

bool KELPortable::isLocal(const char* host) {
    if (is_empty(host) || is_local(host)) return true;
    in6_addr address;
    if (!ipAddr(AF_INET6, &address, host)) return false;
    if (IN6_IS_ADDR_LOOPBACK(&address)) return true;
    in6_addr own;
    return ipAddr(AF_INET6, &own, nullptr) && std::memcmp(&address, &own, sizeof own) == 0;
}

bool KELPortable::isValidIP(int af, const char* text) {
    unsigned char address[sizeof(in6_addr)];
    return inet_pton(af, text, address) == 1;
}
