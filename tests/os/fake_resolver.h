// Answers the resolver's calls and names this machine, in place of the system.
//
//   answer_address   what a successful gethostbyname_r does for one IPv4 address
//   answer_code      what a failing one does
//   FakeResolver     scripts gethostbyname_r: some codes, then an address or a last code
//   FakeAddressInfo  scripts getaddrinfo and freeaddrinfo: one address per name and family
//   name_machine     scripts gethostname
//
//     FakeResolver resolver({TRY_AGAIN, TRY_AGAIN}, "192.0.2.1");
//     { Armed armed; ...; }
//     EXPECT_EQ(resolver.names.size(), 3u);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_OS_FAKE_RESOLVER_H
#define KEL_TESTS_OS_FAKE_RESOLVER_H

#include <arpa/inet.h>
#include <netdb.h>
#include <netinet/in.h>

#include <cstring>
#include <deque>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "tests/support/fault.h"

namespace kel {
namespace test {

// Lays out the entry of `ipv4` in `buffer`, as the system does.
inline int answer_address(const char* ipv4, hostent* entry, char* buffer, hostent** found) {
    char** const lists = reinterpret_cast<char**>(buffer);
    char* const address = buffer + 3 * sizeof(char*);
    inet_pton(AF_INET, ipv4, address);
    lists[0] = address;
    lists[1] = nullptr;
    lists[2] = nullptr;
    entry->h_name = std::strcpy(address + sizeof(in_addr), "found");
    entry->h_aliases = lists + 2;
    entry->h_addrtype = AF_INET;
    entry->h_length = sizeof(in_addr);
    entry->h_addr_list = lists;
    *found = entry;
    return 0;
}

inline int answer_code(int code, hostent** found, int* error) {
    *found = nullptr;
    *error = code;
    return code == TRY_AGAIN ? EAGAIN : 0;
}

class FakeResolver {
public:
    FakeResolver(std::deque<int> codes, const char* address) : _codes(std::move(codes)), _address(address) {
        seams::gethostbyname_r.script(
            [this](const char* name, hostent* entry, char* buffer, size_t, hostent** found, int* error) {
                names.push_back(name);
                if (_codes.empty()) return answer_address(_address.c_str(), entry, buffer, found);
                const int code = _codes.front();
                if (_codes.size() > 1 || !_address.empty()) _codes.pop_front();
                return answer_code(code, found, error);
            });
    }

    std::vector<std::string> names;  // asked for so far

private:
    std::deque<int> _codes;  // answered first; the last one for ever when there is no address
    std::string _address;
};

class FakeAddressInfo {
public:
    struct Question {
        std::string host;
        bool has_service;
        addrinfo hints;
    };

    FakeAddressInfo() {
        seams::getaddrinfo.script(
            [this](const char* host, const char* service, const addrinfo* hints, addrinfo** list) {
                questions.push_back({host, service != nullptr, *hints});
                return answer(host, hints->ai_family, list);
            });
        seams::freeaddrinfo.script([this](addrinfo* list) {
            ++released;
            delete reinterpret_cast<Node*>(list);
        });
    }

    // `text` is the address of `host` in `family`.
    void knows(const char* host, int family, const char* text) { _known[{host, family}] = text; }

    std::vector<Question> questions;
    int released = 0;

private:
    struct Node {
        addrinfo info;
        sockaddr_in ipv4;
        sockaddr_in6 ipv6;
    };

    int answer(const char* host, int family, addrinfo** list) {
        const auto known = _known.find({host, family});
        if (known == _known.end()) return EAI_NONAME;
        Node* const node = new Node();
        node->info.ai_family = family;
        const bool is_ipv4 = family == AF_INET;
        node->info.ai_addrlen = is_ipv4 ? sizeof node->ipv4 : sizeof node->ipv6;
        node->info.ai_addr =
            is_ipv4 ? reinterpret_cast<sockaddr*>(&node->ipv4) : reinterpret_cast<sockaddr*>(&node->ipv6);
        node->info.ai_addr->sa_family = static_cast<sa_family_t>(family);
        inet_pton(family, known->second.c_str(),
                  is_ipv4 ? static_cast<void*>(&node->ipv4.sin_addr) : &node->ipv6.sin6_addr);
        *list = &node->info;
        return 0;
    }

    std::map<std::pair<std::string, int>, std::string> _known;
};

inline void name_machine(const std::string& name) {
    seams::gethostname.script([name](char* buffer, size_t size) {
        std::strncpy(buffer, name.c_str(), size);
        return 0;
    });
}

}  // namespace test
}  // namespace kel

#endif
