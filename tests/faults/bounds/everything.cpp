// Uses every family of the library once and prints what comes of it, byte for byte where a structure
// is filled. Two runs print the same unless something is printed that nobody has written.
//
//   everything FOLDER    where it may write its log
//
// SPDX-License-Identifier: MIT
#include <kel/kel.h>
#include <netinet/in.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <fstream>
#include <iostream>
#include <memory>
#include <sstream>
#include <string>

namespace {

template <class T>
void say(const char* what, const T& value) {
    std::cout << what << ": " << value << "\n";
}

// The bytes of `object`, those between its fields included.
void say_bytes(const char* what, const void* object, std::size_t n) {
    std::cout << what << ":";
    for (std::size_t i = 0; i < n; ++i) {
        std::cout << " " << static_cast<int>(static_cast<const unsigned char*>(object)[i]);
    }
    std::cout << "\n";
}

// ---- containers and counters ----

void use_strings() {
    CORBA::String_var held("twenty characters..");
    held = "fewer";
    const CORBA::String_var copy(held);
    say("string", copy);
    say("hash", CORBA::hash(held.in()));
    say("order", compare(held, CORBA_String_var("few")) > 0);
    CORBA::WString_var wide(L"wide");
    say("wide hash", _kel_hash(wide));
    say("default", CORBA::String_var());
}

void use_dictionary() {
    KELDictionary<KELUniqueId, unsigned long> table;
    for (unsigned long i = 0; i < 100; ++i) table.add(i * 7, i);
    for (unsigned long i = 0; i < 100; i += 3) table.removeKey(i * 7);
    say("capacity", table.capacity());
    KELDictionary<KELUniqueId, unsigned long>::Iterator entry(table);
    while (++entry != nullptr) {
        if (entry.entry() != nullptr) std::cout << " " << entry.entry()->_value;
    }
    std::cout << "\n";
}

void use_resources() {
    KELResource* const counted = new KELResource;
    say("references", counted->_num_refs());
    say("references", counted->_ref());
    say("references", counted->_deref());
    say("references", counted->_unref());
}

// ---- streams and exceptions ----

template <class T>
void write_and_read(T value) {
    std::stringstream text;
    KELostream out(text);
    const T two[2] = {value, value};
    out << value;
    out.put(two, 2);
    say("text", text.str());
    KEListream in(text);
    T single = T(), array[2] = {T(), T()};
    in >> single;
    in.get(array, 2);
    say("read", (single == value) + (array[0] == value) + (array[1] == value));
    in >> single;  // there is no more
    say("offset", in.cur_in_offset());
}

void read_from_nothing() {
    std::istringstream nothing;
    KEListream in(nothing);
    unsigned char c = 7;
    wchar_t w = L'w';
    unsigned short s = 9;
    in >> c >> w >> s;
    std::cout << "unread: " << int(c) << " " << int(w) << " " << s << "\n";
    CORBA::String_var text;
    std::istringstream cut("5\"ab\\x");
    KEListream broken(cut);
    broken >> text;
    say_bytes("cut string", text.in(), 6);
}

void write_and_read_strings() {
    std::stringstream text;
    KELostream out(text);
    out << "a {brace}\t\"quote\"\n\x01"
        << "" << static_cast<const char*>(nullptr);
    KEListream in(text);
    for (int i = 0; i < 3; ++i) {
        CORBA::String_var s;
        in >> s;
        say("string", s);
    }
    std::istringstream numbers("3 65 66 67 ");
    KEListream wide_in(numbers);
    CORBA::WString_var wide;
    wide_in >> wide;
    say_bytes("wide string", wide.in(), 4 * sizeof(wchar_t));
}

struct Table : KELOffsetTable {
    int kind() override { return ValueIndirections; }
};

void use_tables() {
    Table* const table = new Table;
    std::cout << "table: " << table->_mark << table->_spare << table->_in_use << table->_depth << "\n";
    KELostream out;
    out.set_out_table(KELOffsetTable::ValueIndirections, table);
    table->_by_object.add(table, 12);
    table->_in_use = 1;
    out.reset();
    say("entries", table->_by_object.count());
    KELostream shared;
    shared.copy_out_tables(out);
    say("shared", shared.get_out_table(KELOffsetTable::ValueIndirections) == table);
}

void use_exceptions() {
    std::stringstream wire;
    KELostream out(wire);
#define KEL_STANDARD_EXCEPTION(X) out << CORBA_##X(1, CORBA::COMPLETED_MAYBE, "why");
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
    KEListream in(wire);
    for (int i = 0; i < 36; ++i) {
        CORBA::Exception_var e;
        in >> e.out();
        const CORBA::Exception_var copy(e->_deep_copy());
        try {
            copy->_raise();
        } catch (const CORBA::SystemException& caught) {
            std::cout << caught;
        }
    }
    std::istringstream unknown("20 \"IDL:test/None:1.0\"\n");
    KEListream other(unknown);
    CORBA::Exception_var e;
    other >> e.out();
    std::cout << *e.in();
    const KELLoadLibrary::LoadError plain;
    std::cout << plain << plain.code() << plain.message() << "\n";
}

// ---- the system ----

void use_time() {
    timeval tv;
    KELPortable::convert(1999, tv);
    say_bytes("time", &tv, sizeof tv);
    const timeval difference = KELPortable::elapsed(tv, timeval{3, 0});
    say_bytes("elapsed", &difference, sizeof difference);
    KELPoll::TimeVal time;
    say_bytes("poll time", &time._tv, sizeof time._tv);
    time.set(1500);
    say_bytes("poll time", &time._tv, sizeof time._tv);
    KELMutex mutex;
    KELCondition condition;
    KELMutex_var hold(mutex, 1);
    say("timed out", int(condition.timedwait(mutex, 1ull)));
}

void use_system() {
    KELSysVersion version = {};
    say("version", KELPortable::get_sysversion(version));
    std::cout << BaseUtil::user_name() << "\n";
    char found[1024];
    say("whence", KELPortable::vwhence("sh", found));
    say("at", found);
    say("error", CORBA::String_var(KELPortable::_get_error_str()).in() != nullptr);
}

void use_addresses() {
    addrinfo* const list = Getaddrinfo(nullptr, 80, SOCK_STREAM, 0);
    for (addrinfo* node = list; node != nullptr; node = node->ai_next) {
        say_bytes("wildcard", node->ai_addr, node->ai_addrlen);
        KELPortable::saSetLoopback(node->ai_addr);
        KELSetLinkLocal(node);
        say_bytes("loopback", node->ai_addr, node->ai_addrlen);
    }
    Freeaddrinfo(list);
    sockaddr_in sa;
    KELPortable::convert("127.0.0.1", 80, sa);
    say_bytes("socket address", &sa, sizeof sa);
    unsigned short port;
    say("text", CORBA::String_var(KELPortable::convert(sa, port)));
    unsigned char bytes[16] = {};
    int length;
    say("found", KELPortable::ipAddr(bytes, length, "10.1.2.3"));
    say_bytes("address", bytes, sizeof bytes);
    say("found", KELPortable::ipAddr(AF_INET6, bytes, "10.1.2.3"));
    say_bytes("mapped", bytes, sizeof bytes);
    int family;
    say("own", CORBA::String_var(KELPortable::host2ip(family, "::1")));
    say("family", family);
}

// One byte each way through a pipe, watched by the poller.
void use_pollers(KELPoll::SupportedAPIs api) {
    KELPipe pipe;
    const std::unique_ptr<KELPoll> poller(KELPoll::create(1, api));
    poller->add(pipe._read_fd, KELPoll::evMaskRead, &pipe);
    poller->add(pipe._return_read_fd, KELPoll::evMaskRead, nullptr);
    pipe.write("x", 1);
    say("ready", poller->waitForEvents(1000));
    for (int i = 0; i < poller->count(); ++i) say("event", poller->reportedEvent(i));
    char c;
    pipe.read(&c, 1);
    say("byte", c);
}

void use_sockets() {
    const int listener = KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0);
    const auto port = static_cast<unsigned short>(KELPortable::saGetPort(listener));
    const int client = KELPortable::tcpConnect("127.0.0.1", port, 5000, "127.0.0.1");
    const int server = KELPortable::socketAccept(listener);
    unsigned short peer_port = 5;
    say("peer", CORBA::String_var(KELPortable::peer_addr(server, peer_port)));
    say("peer port", peer_port);
    for (const int fd : {server, client, listener}) close(fd);
    try {
        KELPortable::tcpConnect("127.0.0.1", port, 0, "no.such.name.invalid");
    } catch (const CORBA::SystemException& refused) {
        std::cout << refused;
    }
}

// ---- threads and services ----

KELMutex ended_mutex;
KELCondition ended_changed;
bool ended = false;

class Raising : public KELThread {
public:
    Raising() : KELThread(0) {}
    void begin() override {
        CORBA::current_environment()->exception(new CORBA_TRANSIENT(3, CORBA::COMPLETED_NO));
        std::cout << *CORBA::current_environment()->exception();
        KELMutex_var hold(ended_mutex, 1);
        ended = true;
        ended_changed.signal();
    }
};

void use_threads() {
    Raising thread;
    thread.run();
    ended_mutex.lock();
    while (!ended) ended_changed.wait(ended_mutex);
    ended_mutex.unlock();
    say("environment", CORBA::current_environment()->exception() == nullptr);
}

void use_services(const std::string& folder) {
    char program[] = "p", name[] = "-Xname", value[] = "value", flag[] = "-Xflag", rest[] = "rest";
    char* argv[] = {program, name, value, flag, rest, nullptr};
    int argc = 5;
    KELArgList options;
    options.argInit(argc, argv, "-X");
    say("arguments", argc);
    say("value", CORBA::String_var(options.getArgValue("Xname")));
    say("count", options.getArgCount());

    const std::string path = folder + "/everything.log";
    std::remove(path.c_str());
    {
        KELDebugLogger log(path.c_str());
        log.traceModule(0x10000001);
        log.start(3, 0x10000001, "everything.cpp", 1) << "logged " << 7L << endl;
    }
    std::ifstream log(path);
    std::string line;
    std::getline(log, line);  // the header has the time
    while (std::getline(log, line)) say("log", line);
    KELLoadLibrary::instance()->Load("no_such_library");
}

}  // namespace

int main(int, char** argv) {
    use_strings();
    use_dictionary();
    use_resources();
    write_and_read<short>(-2);
    write_and_read<unsigned short>(2);
    write_and_read<int>(-7);
    write_and_read<unsigned long>(7);
    write_and_read<float>(1.5f);
    write_and_read<double>(2.5);
    write_and_read<long long>(-1099511627776LL);
    write_and_read<wchar_t>(L'w');
    read_from_nothing();
    write_and_read_strings();
    use_tables();
    use_exceptions();
    use_time();
    use_system();
    use_addresses();
    use_pollers(KELPoll::API_POLL);
    use_pollers(KELPoll::API_SELECT);
    use_sockets();
    use_threads();
    use_services(argv[1]);
    return 0;
}
