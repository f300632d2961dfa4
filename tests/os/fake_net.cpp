// SPDX-License-Identifier: MIT
#include "tests/os/fake_net.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <kel/containers/strings.h>
#include <kel/os/portable.h>
#include <netinet/in.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace kel {
namespace test {

namespace {

// From "10.0.0.1" or "::1".
SocketAddress from_text(const std::string& text, int port) {
    SocketAddress address;
    std::memset(&address, 0, sizeof address);
    if (inet_pton(AF_INET6, text.c_str(), &address.v6.sin6_addr) == 1) {
        address.v6.sin6_family = AF_INET6;
        address.v6.sin6_port = htons(static_cast<std::uint16_t>(port));
    } else {
        EXPECT_EQ(inet_pton(AF_INET, text.c_str(), &address.v4.sin_addr), 1) << text;
        address.v4.sin_family = AF_INET;
        address.v4.sin_port = htons(static_cast<std::uint16_t>(port));
    }
    return address;
}

bool is_literal(const std::string& host) {
    unsigned char bytes[16];
    return inet_pton(AF_INET, host.c_str(), bytes) == 1 || inet_pton(AF_INET6, host.c_str(), bytes) == 1;
}

std::string join(std::initializer_list<std::string> words) {
    std::string text;
    for (const std::string& word : words) text += (text.empty() ? "" : " ") + word;
    return text;
}

std::string hex(int value) {
    char text[16];
    std::snprintf(text, sizeof text, "0x%x", static_cast<unsigned>(value));
    return text;
}

std::string seconds(const timeval* tv) {
    if (tv == nullptr) return "no limit";
    char text[48];
    std::snprintf(text, sizeof text, "%ld.%06ld", static_cast<long>(tv->tv_sec),
                  static_cast<long>(tv->tv_usec));
    return text;
}

int fail_with(int error) {
    errno = error;
    return -1;
}

using std::to_string;

}  // namespace

SocketAddress socket_address(const std::string& text) {
    const std::size_t colon = text.rfind(':');
    std::string host = text.substr(0, colon);
    if (host.front() == '[') host = host.substr(1, host.size() - 2);
    return from_text(host, std::stoi(text.substr(colon + 1)));
}

std::string to_text(const sockaddr* address) {
    char text[INET6_ADDRSTRLEN];
    if (address->sa_family == AF_INET6) {
        const auto* v6 = reinterpret_cast<const sockaddr_in6*>(address);
        const std::string scope = v6->sin6_scope_id != 0 ? "%" + to_string(v6->sin6_scope_id) : "";
        const char* const host = inet_ntop(AF_INET6, &v6->sin6_addr, text, sizeof text);
        return "[" + std::string(host) + scope + "]:" + to_string(ntohs(v6->sin6_port));
    }
    const auto* v4 = reinterpret_cast<const sockaddr_in*>(address);
    const char* const host = inet_ntop(AF_INET, &v4->sin_addr, text, sizeof text);
    return std::string(host) + ":" + to_string(ntohs(v4->sin_port));
}

FakeNet::Errors& FakeNet::Errors::operator=(std::deque<int> errors) {
    queue = std::move(errors);
    return *this;
}

int FakeNet::Errors::next() {
    if (!queue.empty()) {
        last = queue.front();
        queue.pop_front();
    }
    return last;
}

int FakeNet::answer(Errors& errors) {
    const int error = errors.next();
    return error == 0 ? 0 : fail_with(error);
}

FakeNet::Socket& FakeNet::known(int fd) {
    static Socket unknown = {AF_UNSPEC, 0};
    const auto found = _open.find(fd);
    if (found != _open.end()) return found->second;
    ADD_FAILURE() << "descriptor " << fd << " is used and not open";
    return unknown;
}

void FakeNet::install() {
    // The library keeps what it finds out first; it must not be the script's answer.
    CORBA::string_free(KELPortable::ip_addr(nullptr));
    resolve(KELPortable::host_name(), {"192.0.2.7", "2001:db8::7"});
    script_sockets();
    script_options();
    script_waits();
    script_resolver();
}

void FakeNet::check_balance() const {
    EXPECT_EQ(_open.size(), 0u) << "descriptors are left open";
    EXPECT_EQ(_lists.size(), 0u) << "address lists are left";
}

void FakeNet::resolve(const std::string& host, const std::vector<std::string>& addresses) {
    _hosts[host] = addresses;
}

int FakeNet::open_socket(int family) {
    _open[_next_fd] = {family, O_RDWR};
    return _next_fd++;
}

void FakeNet::forget(int fd) { EXPECT_EQ(_open.erase(fd), 1u) << "descriptor " << fd << " is not open"; }

std::vector<std::string> FakeNet::log(const std::string& name) const {
    std::vector<std::string> found;
    for (const Call& call : _calls) {
        if (call.name == name) found.push_back(call.arguments);
    }
    return found;
}

std::vector<std::string> FakeNet::order(const std::set<std::string>& names) const {
    std::vector<std::string> found;
    for (const Call& call : _calls) {
        if (names.count(call.name) != 0) found.push_back(call.name);
    }
    return found;
}

void FakeNet::script_sockets() {
    seams::socket.script([this](int family, int type, int protocol) {
        const std::string name = family == AF_INET    ? "inet"
                                 : family == AF_INET6 ? "inet6"
                                                      : to_string(family);
        note("socket", join({name, to_string(type), to_string(protocol)}));
        return answer(sockets) == 0 ? open_socket(family) : -1;
    });
    seams::close.script([this](int fd) {
        if (_open.count(fd) == 0 && fd >= 0 && fd < 500) return seams::close.real(fd);
        note("close", to_string(fd));
        if (_open.erase(fd) == 0) ADD_FAILURE() << "descriptor " << fd << " is closed and not open";
        if (errno_after_close != 0) errno = errno_after_close;
        return 0;
    });
    seams::bind.script([this](int fd, const sockaddr* address, socklen_t size) {
        known(fd);
        note("bind", join({to_string(fd), to_text(address), to_string(size)}));
        return answer(binds);
    });
    seams::connect.script([this](int fd, const sockaddr* address, socklen_t size) {
        known(fd);
        EXPECT_EQ(size, address->sa_family == AF_INET6 ? sizeof(sockaddr_in6) : sizeof(sockaddr_in));
        note("connect", join({to_string(fd), to_text(address)}));
        return answer(connects);
    });
    seams::listen.script([this](int fd, int backlog) {
        known(fd);
        note("listen", join({to_string(fd), to_string(backlog)}));
        return answer(listens);
    });
    seams::accept.script([this](int fd, sockaddr*, socklen_t* size) {
        known(fd);
        note("accept", join({to_string(fd), to_string(*size)}));
        return answer(accepts) == 0 ? open_socket() : -1;
    });
}

void FakeNet::script_options() {
    seams::fcntl64.script([this](int fd, int command, void* argument) {
        Socket& socket = known(fd);
        const int value = static_cast<int>(reinterpret_cast<std::intptr_t>(argument));
        note("fcntl", command == F_GETFL ? join({to_string(fd), "F_GETFL"})
                                         : join({to_string(fd), to_string(command), hex(value)}));
        if (answer(fcntls) != 0) return -1;
        if (command == F_GETFL) return socket.flags;
        if (command == F_SETFL) socket.flags = value;
        return 0;
    });
    seams::getsockname.script([this](int fd, sockaddr* address, socklen_t* size) {
        known(fd);
        note("getsockname", join({to_string(fd), to_string(*size)}));
        if (answer(getsocknames) != 0) return -1;
        const SocketAddress local = socket_address(local_address);
        std::memcpy(address, &local, std::min(*size, local.size()));
        *size = local.size();
        return 0;
    });
    seams::getsockopt.script([this](int fd, int level, int name, void* value, socklen_t* size) {
        known(fd);
        note("getsockopt", join({to_string(fd), to_string(level), to_string(name), to_string(*size)}));
        if (answer(getsockopts) != 0) return -1;
        std::memcpy(value, &so_error, sizeof so_error);
        return 0;
    });
    seams::setsockopt.script([this](int fd, int level, int name, const void* value, socklen_t size) {
        known(fd);
        const int number = *static_cast<const int*>(value);
        note("setsockopt",
             join({to_string(fd), to_string(level), to_string(name), to_string(number), to_string(size)}));
        return 0;
    });
}

int FakeNet::wait_answer(long long limit_ms) {
    if (waits.empty()) {
        ADD_FAILURE() << "an unexpected wait";
        return 1;
    }
    const Wait wait = waits.front();
    waits.pop_front();
    if (wait.result == 0) now_ms += limit_ms;
    return wait.result < 0 ? (errno = wait.error, wait.result) : wait.result;
}

void FakeNet::script_waits() {
    seams::poll.script([this](pollfd* entries, nfds_t n, int ms) {
        EXPECT_EQ(n, 1u);
        known(entries->fd);
        note("poll", join({to_string(entries->fd), hex(entries->events), to_string(ms)}));
        return wait_answer(ms);
    });
    seams::select.script([this](int n, fd_set* r, fd_set* w, fd_set* e, timeval* tv) {
        EXPECT_EQ(r, nullptr);
        if (w != nullptr) {
            EXPECT_EQ(e, nullptr);
            EXPECT_TRUE(FD_ISSET(n - 1, w));
            note("select", join({to_string(n - 1), seconds(tv)}));
            return wait_answer(tv == nullptr ? 0 : tv->tv_sec * 1000LL + tv->tv_usec / 1000);
        }
        // A sleep: nothing happens to descriptor 0 until the time is over.
        EXPECT_TRUE(n == 1 && e != nullptr && FD_ISSET(0, e));
        sleeps.push_back("select " + seconds(tv));
        now_ms += tv->tv_sec * 1000LL + tv->tv_usec / 1000;
        return 0;
    });
    seams::sleep.script([this](unsigned s) {
        sleeps.push_back("sleep " + to_string(s));
        now_ms += s * 1000LL;
        return 0u;
    });
}

void FakeNet::script_resolver() {
    seams::getaddrinfo.script([this](const char* host, const char* service, const addrinfo* hints,
                                     addrinfo** list) {
        note("getaddrinfo", join({host, service == nullptr ? "null" : service, to_string(hints->ai_family),
                                  to_string(hints->ai_socktype), to_string(hints->ai_flags)}));
        std::vector<std::string> addresses = {host};
        if (!is_literal(host)) addresses = _hosts[host];
        *list = nullptr;
        addrinfo** tail = list;
        for (const std::string& text : addresses) {
            SocketAddress address = from_text(text, service == nullptr ? 0 : std::atoi(service));
            if (address.any.sa_family == AF_INET6) address.v6.sin6_scope_id = resolved_scope;
            if (hints->ai_family != AF_UNSPEC && hints->ai_family != address.any.sa_family) continue;
            // One block, as the system makes it: the real freeaddrinfo releases it.
            auto* node = static_cast<addrinfo*>(std::calloc(1, sizeof(addrinfo) + sizeof(SocketAddress)));
            node->ai_family = address.any.sa_family;
            node->ai_socktype = hints->ai_socktype;
            node->ai_addrlen = address.size();
            node->ai_addr = static_cast<sockaddr*>(std::memcpy(node + 1, &address, sizeof address));
            *tail = node;
            tail = &node->ai_next;
        }
        if (*list == nullptr) return EAI_NONAME;
        _lists.insert(*list);
        return 0;
    });
    seams::freeaddrinfo.script([this](addrinfo* list) {
        note("freeaddrinfo", "");
        _lists.erase(list);
        seams::freeaddrinfo.real(list);
    });
    seams::gethostbyname_r.script(
        [this](const char* name, hostent* entry, char* buffer, std::size_t, hostent** found, int* error) {
            *found = nullptr;
            *error = HOST_NOT_FOUND;
            for (const std::string& text : _hosts[name]) {
                const SocketAddress address = from_text(text, 0);
                if (address.any.sa_family != AF_INET) continue;
                // Two pointers, then the bytes they lead to.
                auto** addresses = reinterpret_cast<char**>(buffer);
                addresses[0] = static_cast<char*>(std::memcpy(addresses + 2, &address.v4.sin_addr, 4));
                addresses[1] = nullptr;
                *entry = hostent();
                entry->h_addrtype = AF_INET;
                entry->h_length = 4;
                entry->h_addr_list = addresses;
                *found = entry;
                *error = 0;
                break;
            }
            return 0;
        });
    seams::if_nametoindex.script([this](const char* name) {
        note("if_nametoindex", name);
        return 7u;
    });
}

}  // namespace test
}  // namespace kel
