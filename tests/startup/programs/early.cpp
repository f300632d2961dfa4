// Looks at the library before any of its initialisers has run, and reports from main.
//
// SPDX-License-Identifier: MIT
#include <kel/core/portlib.h>
#include <kel/core/resource.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/core/unique_id.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>

#include <cstdio>
#include <cstring>

namespace {

struct Findings {
    char ifname[sizeof KELPortLibManager::ifname];
    long debug_level;
    long inited;
    bool first_thread_is_null;
    long inheritsched;
    bool factory_is_create_thread;
    bool key_dict_is_null;
    unsigned next_slot;
    unsigned init_sharing;
    unsigned next_id;
    bool registry_is_empty;
    bool description_is_zero;
    unsigned long refused_minor;
    unsigned long refused_status;
    bool pointer_was_cleared;
};

Findings early;

// There is no other thread yet.
void look_at_static_data() KEL_NO_THREAD_SAFETY_ANALYSIS {
    std::memcpy(early.ifname, KELPortLibManager::ifname, sizeof early.ifname);
    early.debug_level = KELPortLibManager::debug_level;
    early.inited = KELPortLibManager::inited;
    early.first_thread_is_null = KELThread::_first == nullptr;
    early.inheritsched = KELThread::_inheritsched;
    early.factory_is_create_thread = KELThread::_factory == &KELThread::_create_thread;
    early.key_dict_is_null = KELThreadLocal::_key_dict == nullptr;
    early.next_slot = KELThreadLocal::_cnt;
    early.init_sharing = KELResourceImpl::_init_sharing;
    early.next_id = KELUniqueId::_globalId;
}

void look_at_the_registry() {
    early.registry_is_empty = CORBA_Exception::Description::desc("IDL:omg.org/CORBA/UNKNOWN:1.0") == nullptr;
    const unsigned char zeros[sizeof(CORBA_Exception::Description)] = {};
    const void* const description = &CORBA_SystemException::_description;
    early.description_is_zero = std::memcmp(description, zeros, sizeof zeros) == 0;
}

void read_an_exception() {
    KEListream in;
    CORBA_Exception* e = reinterpret_cast<CORBA_Exception*>(&early);
    try {
        in >> e;
    } catch (const CORBA_BAD_INV_ORDER& refused) {
        early.refused_minor = refused.minor();
        early.refused_status = refused.completed();
    }
    early.pointer_was_cleared = e == nullptr;
}

void look(int, char**, char**) {
    look_at_static_data();
    look_at_the_registry();
    read_an_exception();
}

// The loader calls these before the initialisers of any library.
__attribute__((section(".preinit_array"), used)) void (*const before_all)(int, char**, char**) = look;

}  // namespace

int main() {
    std::printf("ifname %s\n", early.ifname);
    std::printf("debug_level %ld\n", early.debug_level);
    std::printf("inited %ld\n", early.inited);
    std::printf("_first is null %d\n", early.first_thread_is_null);
    std::printf("_inheritsched %ld\n", early.inheritsched);
    std::printf("_factory is _create_thread %d\n", early.factory_is_create_thread);
    std::printf("_key_dict is null %d\n", early.key_dict_is_null);
    std::printf("_cnt %u\n", early.next_slot);
    std::printf("_init_sharing %u\n", early.init_sharing);
    std::printf("_globalId %u\n", early.next_id);
    std::printf("registry is empty %d\n", early.registry_is_empty);
    std::printf("description is zero %d\n", early.description_is_zero);
    std::printf("refused with minor %#lx status %lu\n", early.refused_minor, early.refused_status);
    std::printf("pointer was cleared %d\n", early.pointer_was_cleared);
    return 0;
}
