// One object of each kind that the printers of gdb/kel-gdb.py show, with known contents.
//
// SPDX-License-Identifier: MIT
#include <kel/kel.h>

#include <cerrno>
#include <cstring>
#include <sstream>

namespace {

class Listener : public KELThread {
public:
    Listener() : KELThread(65536) {}
    void begin() override {}
};

class Trace : public KELThreadLocal {
public:
    explicit Trace(unsigned long slot) : KELThreadLocal(slot) {}
    void finalize() override {}
};

class ValueTable : public KELOffsetTable {
public:
    int kind() override { return ValueIndirections; }
};

unsigned long drawn_slot() {
    KELRMutex_var hold(KELThreadLocal::_mutex, 1);
    return KELThreadLocal::_cnt++;
}

// A string that lies where nothing may be read.
union Nowhere {
    Nowhere() : text(reinterpret_cast<const char*>(8)) {}
    KELStringWrapper text;
};

}  // namespace

// The debugger stops here and looks at the caller.
extern "C" __attribute__((noinline)) void look() { __asm__ volatile("" ::: "memory"); }

int main() KEL_NO_THREAD_SAFETY_ANALYSIS {
    CORBA::String_var name = CORBA::string_dup("vesta");
    CORBA::String_var marks = CORBA::string_dup("a \"b\"\n");
    CORBA::String_var nothing(static_cast<char*>(0));
    KELStringWrapper borrowed("juno");
    CORBA::WString_var title = CORBA::wstring_dup(L"r\u00e9sum\u00e9");
    const Nowhere nowhere;

    alignas(8) unsigned char scribbled[1024];  // whatever once was there, its pointers lead nowhere
    std::memset(scribbled, 0x11, sizeof scribbled);

    CORBA::TRANSIENT refused(ECONNREFUSED, CORBA::COMPLETED_NO);
    CORBA::TIMEOUT late(0x4b450001, CORBA::COMPLETED_MAYBE);
    CORBA::COMM_FAILURE unknown_host(static_cast<std::uint32_t>(-2), CORBA::COMPLETED_NO);
    CORBA::BAD_PARAM foreign(0x12345007, CORBA::COMPLETED_YES, "the name is empty");
    CORBA::Exception_var holder(CORBA_TRANSIENT::_factory());
    const CORBA::SystemException& seen_by_base = foreign;
    const CORBA::Exception& seen_by_root = late;
    const CORBA::BAD_PARAM no_errno(5, CORBA::COMPLETED_NO);
    const KELRemarshal again;
    const CORBA::Exception& user_seen_by_root = again;

    KELDictionary<KELStringWrapper, int> sizes;
    sizes.add("latin-1", 1);
    sizes.add("utf-16", 2);
    KELDictionary_r<KELUniqueId, CORBA_String_var> locked;
    locked.add(KELUniqueId(7), CORBA_String_var("seven"));

    KELRWLock lock;
    lock.read_lock();
    KELMutex mutex;
    KELRMutex recursive;
    recursive.lock();
    recursive.lock();

    Listener listener;
    const unsigned long slot = drawn_slot();
    Trace trace(slot);

    KELImplPoll poller(4);
    poller.add(0, KELPoll::evMaskRead, &poller);
    poller.add(1, KELPoll::evMaskRead | KELPoll::evMaskWrite, 0);
    KELImplSelect selector(4);
    selector.add(2, KELPoll::evMaskError, 0);

    std::stringstream text;
    KELostream out(text);
    out << 7 << 'x';
    out.set_out_table(KELOffsetTable::ValueIndirections, new ValueTable);
    KEListream in(text);

    KELResource counted;
    counted._ref();
    KELDebugLogger logger;
    logger.traceModule(0x10000001);
    CORBA_Environment environment;
    environment.exception(CORBA_TIMEOUT::_factory());

    look();

    counted._unref();
    recursive.unlock();
    recursive.unlock();
    lock.unlock();
    return static_cast<int>(
        seen_by_base.minor() & no_errno.minor() &
        static_cast<unsigned long>(&seen_by_root == &user_seen_by_root) &
        static_cast<unsigned long>(borrowed.in() == 0 && scribbled[0] == 0 && nowhere.text.in() == 0));
}
