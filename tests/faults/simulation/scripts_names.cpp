// The resolver, the own name and the interfaces.
//
// SPDX-License-Identifier: MIT
#include <netinet/in.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "tests/faults/simulation/scripts.h"
#include "tests/support/fault.h"

namespace kel {
namespace sim {

namespace seams = test::seams;

namespace {

// The lists that the resolver made and that are not released. A task needs two at a time.
addrinfo* made[16];

// One block for each node, the address right behind it, as far away from the next as the heap keeps it.
addrinfo* node_of(const Address& address) {
    void* const block = std::calloc(1, sizeof(addrinfo) + address.size);
    addrinfo* const node = static_cast<addrinfo*>(block);
    node->ai_family = address.family();
    node->ai_socktype = SOCK_STREAM;
    node->ai_protocol = IPPROTO_TCP;
    node->ai_addrlen = address.size;
    node->ai_addr = reinterpret_cast<sockaddr*>(node + 1);
    std::memcpy(node->ai_addr, address.bytes, address.size);
    return node;
}

// What is read after its release reads as no address of any family.
void drop(addrinfo* list) {
    while (list != nullptr) {
        addrinfo* const next = list->ai_next;
        std::memset(list, 0xdd, sizeof *list + list->ai_addrlen);
        std::free(list);
        list = next;
    }
}

addrinfo* kept(addrinfo* list) {
    for (addrinfo*& place : made) {
        if (place == nullptr) return place = list;
    }
    playing.world->fatal("more lists are open than", 16);
}

int name_or_fatal(const char* text) {
    const int index = index_of(*playing.machine, text);
    if (index < 0) playing.world->fatal(text, index);
    return index;
}

int answer_list(unsigned name, const char* service, addrinfo** list) {
    const Task& task = playing.world->task();
    char port[16];
    std::snprintf(port, sizeof port, "%u", task.port);
    if (std::strcmp(service, port) != 0)
        playing.world->fatal("another port is looked up than", static_cast<int>(task.port));
    const ListAnswer answer = playing.world->list(name, task.port);
    if (answer.code != 0) return answer.code;
    addrinfo* first = nullptr;
    for (unsigned i = answer.count; i-- > 0;) {
        addrinfo* const node = node_of(answer.nodes[i]);
        node->ai_next = first;
        first = node;
    }
    *list = kept(first);
    return 0;
}

int answer_getaddrinfo(const char* host, const char* service, const addrinfo* hints, addrinfo** list) {
    World& world = *playing.world;
    const unsigned name = static_cast<unsigned>(name_or_fatal(host));
    const bool plain = hints != nullptr && hints->ai_flags == 0 && hints->ai_protocol == 0;
    if (!plain || hints->ai_socktype != SOCK_STREAM) world.fatal("the resolver gets other hints", 0);
    if (hints->ai_family == AF_UNSPEC && service != nullptr) return answer_list(name, service, list);
    const LookUp answer = world.look_up(name, hints->ai_family);
    if (answer.code == 0) *list = kept(node_of(answer.address));
    return answer.code;
}

void answer_freeaddrinfo(addrinfo* list) {
    for (addrinfo*& place : made) {
        if (place == nullptr || place != list) continue;
        place = nullptr;
        drop(list);
        playing.world->release_list();
        return;
    }
    playing.world->release_own_list();
    seams::freeaddrinfo.real(list);
}

// While the library learns its own address the machine's entry answers, try by try.
bool found_entry(const char* name, bool& again, HostEntry& answer) {
    static unsigned tries = 0;
    const unsigned index = static_cast<unsigned>(name_or_fatal(name));
    if (playing.world != nullptr) return playing.world->host_entry(index, again, answer);
    answer = playing.machine->entry;
    again = tries++ < answer.again;
    return !again && answer.entry == Entry::found;
}

// Fills `entry` and puts what it points at into `buffer`.
void fill(hostent* entry, char* buffer, const HostEntry& answer) {
    char** const addresses = reinterpret_cast<char**>(buffer);
    char* const bytes = buffer + 2 * sizeof(char*);
    std::memcpy(bytes, answer.ip.bytes, 16);
    addresses[0] = answer.entry == Entry::no_address ? nullptr : bytes;
    addresses[1] = nullptr;
    std::memset(entry, 0, sizeof *entry);
    entry->h_addrtype = answer.entry == Entry::foreign ? AF_INET6 : AF_INET;
    entry->h_length = answer.entry == Entry::foreign ? 16 : 4;
    entry->h_addr_list = addresses;
}

int answer_gethostbyname_r(const char* name, hostent* entry, char* buffer, size_t n, hostent** found,
                           int* error) {
    bool again = false;
    HostEntry answer{};
    *found = nullptr;
    const bool good = found_entry(name, again, answer);
    if (again) {
        *error = TRY_AGAIN;
        return EAGAIN;
    }
    if (answer.entry == Entry::unknown) {
        *error = HOST_NOT_FOUND;
        return 0;
    }
    if (answer.entry == Entry::no_room || n < 64) {
        *error = NETDB_INTERNAL;
        return ERANGE;
    }
    fill(entry, buffer, answer);
    *error = good ? 0 : NO_DATA;
    *found = entry;
    return 0;
}

// A name that fills the buffer comes without an end.
int answer_gethostname(char* name, size_t n) {
    const Machine& machine = *playing.machine;
    if (!machine.readable) {
        errno = EFAULT;
        return -1;
    }
    std::memset(name, 'z', n);
    const size_t length = std::strlen(machine.name.text);
    std::memcpy(name, machine.name.text, length + (length + 1 < n ? 1 : 0));
    return 0;
}

unsigned answer_if_nametoindex(const char* name) {
    World& world = *playing.world;
    const char* const expected = interface_of(world.task());
    const size_t length = std::strlen(name);
    if (length > 80 || std::strncmp(name, expected, length) != 0)
        world.fatal("another interface is asked for", 0);
    return world.interface_index();
}

}  // namespace

Playing playing = {nullptr, nullptr};

void script_names() {
    seams::getaddrinfo.script(answer_getaddrinfo);
    seams::freeaddrinfo.script(answer_freeaddrinfo);
    seams::gethostbyname_r.script(answer_gethostbyname_r);
    seams::gethostname.script(answer_gethostname);
    seams::if_nametoindex.script(answer_if_nametoindex);
}

void drop_lists() {
    for (addrinfo*& place : made) {
        drop(place);
        place = nullptr;
    }
}

}  // namespace sim
}  // namespace kel
