// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/stage.h"

#include <kel/kel.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <new>
#include <typeinfo>

#include "tests/faults/simulation/oracle.h"
#include "tests/faults/simulation/scripts.h"
#include "tests/support/fault.h"

namespace kel {
namespace sim {

namespace {

// The end of a page that is followed by one that cannot be touched.
std::uint8_t* guarded_end() {
    static std::uint8_t* end = nullptr;
    if (end != nullptr) return end;
    const std::size_t page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
    void* const pages = mmap(nullptr, 2 * page, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (pages == MAP_FAILED) throw std::bad_alloc();
    mprotect(static_cast<std::uint8_t*>(pages) + page, page, PROT_NONE);
    return end = static_cast<std::uint8_t*>(pages) + page;
}

Thrown kind_of(const CORBA_SystemException& exception) {
    const std::type_info& type = typeid(exception);
    if (type == typeid(CORBA_NO_RESOURCES)) return Thrown::no_resources;
    if (type == typeid(CORBA_TRANSIENT)) return Thrown::transient;
    if (type == typeid(CORBA_COMM_FAILURE)) return Thrown::comm_failure;
    if (type == typeid(CORBA_TIMEOUT)) return Thrown::timeout;
    if (type == typeid(CORBA_BAD_PARAM)) return Thrown::bad_param;
    return Thrown::something_else;
}

void connect_host(const Task& task, Ending& ending) {
    const char* const host = name_of(*task.machine, task.host).text;
    const char* const local = name_of(*task.machine, task.bind_host).text;
    ending.descriptor =
        KELPortable::tcpConnect(host, static_cast<unsigned short>(task.port), task.timeout, local);
}

void connect_socket(const Task& task, Ending& ending) {
    std::uint8_t* const address = guarded_end() - task.peer.size;
    std::memcpy(address, task.peer.bytes, task.peer.size);
    KELPortable::tcpConnect(ending.descriptor, ending.error, reinterpret_cast<sockaddr*>(address),
                            task.peer.size, task.timeout);
}

void listen_on(const Task& task, Ending& ending) {
    const char* const host = name_of(*task.machine, task.host).text;
    ending.descriptor =
        KELPortable::createTcpListenerSocket(host, static_cast<unsigned short>(task.port), task.range);
}

void call(const Task& task, int given, Ending& ending) {
    switch (task.job) {
        case Job::connect_host:
            return connect_host(task, ending);
        case Job::connect_socket:
            return connect_socket(task, ending);
        case Job::listen_on:
            return listen_on(task, ending);
        case Job::accept_one:
            ending.descriptor = KELPortable::socketAccept(given);
            return;
        case Job::bind_name:
            return KELSetBindName(ending.descriptor, name_of(*task.machine, task.bind_host).text,
                                  task.family);
    }
}

void call_and_catch(const Task& task, int given, Ending& ending) {
    try {
        test::Armed armed;
        errno = stale_error;
        call(task, given, ending);
    } catch (const CORBA_SystemException& exception) {
        ending.thrown = kind_of(exception);
        if (static_cast<std::uint64_t>(exception.minor()) >> 32 != 0) ending.thrown = Thrown::something_else;
        ending.minor = static_cast<std::uint32_t>(exception.minor());
        ending.completed = static_cast<unsigned>(exception.completed());
        const char* const reason = exception.reason();
        std::snprintf(ending.reason, sizeof ending.reason, "%s", reason != nullptr ? reason : "");
    } catch (const std::bad_alloc&) {
        ending.thrown = Thrown::bad_alloc;
    } catch (const std::exception&) {
        ending.thrown = Thrown::something_else;
    }
}

void set_up_library(const Task& task) {
    KELPoll::defaultAPI(task.selecting ? KELPoll::API_SELECT : KELPoll::API_POLL);
    std::memset(KELPortLibManager::ifname, 'x', sizeof KELPortLibManager::ifname);
    const char* const interface = interface_of(task);
    const std::size_t size = std::strlen(interface) + 1;
    const std::size_t room = sizeof KELPortLibManager::ifname;
    std::memcpy(KELPortLibManager::ifname, interface, size < room ? size : room);
}

bool given_a_descriptor(Job job) {
    return job == Job::connect_socket || job == Job::accept_one || job == Job::bind_name;
}

}  // namespace

Stage::Stage(const Machine& machine) {
    test::reset_faults();
    playing = {nullptr, &machine};
    script_names();
    script_sockets();
    test::Armed armed;
    CORBA_String_var known(KELPortable::ip_addr(nullptr));
    Ip ip{};
    char expected[20] = "";
    if (own_v4(machine, ip)) {
        std::snprintf(expected, sizeof expected, "%u.%u.%u.%u", ip.bytes[0], ip.bytes[1], ip.bytes[2],
                      ip.bytes[3]);
    }
    _knows_itself = std::strcmp(known.in() != nullptr ? known.in() : "", expected) == 0;
}

Stage::~Stage() {
    test::reset_faults();
    playing = {nullptr, nullptr};
}

void Stage::act(const Task& task) {
    _world.begin(task);
    playing.world = &_world;
    set_up_library(task);
    Ending& ending = story().ending;
    const int given = given_a_descriptor(task.job) ? _world.given() : -1;
    ending.descriptor = task.job == Job::accept_one ? -1 : given;
    ending.error = task.job == Job::connect_socket ? 4711 : 0;
    const long blocks = test::AllocationPlan::live_blocks();
    call_and_catch(task, given, ending);
    test::AllocationPlan::fail(0);
    ending.blocks = static_cast<int>(test::AllocationPlan::live_blocks() - blocks);
    _world.finish(ending.descriptor);
    drop_lists();
    playing.world = nullptr;
}

}  // namespace sim
}  // namespace kel
