// SPDX-License-Identifier: MIT
// Exceptions: raised and caught, and sent as text to where they are built again by their id.
#include <bench/support/bench.h>
#include <bench/support/shuffled.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <exception>
#include <map>
#include <memory>
#include <sstream>
#include <stdexcept>

using bench::growth;
using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

// In place: the class is known where it is thrown.
void throw_int(benchmark::State& state) {
    for (auto _ : state) {
        try {
            throw 4711;
        } catch (int& caught) {
            benchmark::DoNotOptimize(caught);
        }
    }
}

void throw_standard(benchmark::State& state) {
    for (auto _ : state) {
        try {
            throw std::runtime_error("no resources");
        } catch (const std::exception& caught) {
            benchmark::DoNotOptimize(&caught);
        }
    }
}

void throw_kel(benchmark::State& state) {
    for (auto _ : state) {
        try {
            throw CORBA::NO_RESOURCES(12, CORBA::COMPLETED_NO);
        } catch (const CORBA::SystemException& caught) {
            benchmark::DoNotOptimize(&caught);
        }
    }
}

// Raised: an exception came from elsewhere and is thrown by who does not know its class. That takes a
// virtual function, and so a frame more to unwind, whatever the class.
struct Raisable {
    virtual ~Raisable() = default;
    virtual void raise() const = 0;
};

struct RaisableInt : Raisable {
    [[noreturn]] __attribute__((noinline)) void raise() const override { throw 4711; }
};

struct RaisableError : Raisable, std::runtime_error {
    RaisableError() : std::runtime_error("no resources") {}
    [[noreturn]] __attribute__((noinline)) void raise() const override { throw *this; }
};

template <class Raised, class Caught>
void raise_standard(benchmark::State& state) {
    const std::unique_ptr<Raisable> received(new Raised);
    for (auto _ : state) {
        try {
            benchmark::DoNotOptimize(received.get());
            received->raise();
        } catch (const Caught& caught) {
            benchmark::DoNotOptimize(&caught);
        }
    }
}

void rethrow_standard(benchmark::State& state) {
    const std::exception_ptr received = std::make_exception_ptr(std::runtime_error("no resources"));
    for (auto _ : state) {
        try {
            std::rethrow_exception(received);
        } catch (const std::exception& caught) {
            benchmark::DoNotOptimize(&caught);
        }
    }
}

void raise_kel(benchmark::State& state) {
    const CORBA_Exception_var received(new CORBA::NO_RESOURCES(12, CORBA::COMPLETED_NO));
    for (auto _ : state) {
        try {
            received->_raise();
        } catch (const CORBA::SystemException& caught) {
            benchmark::DoNotOptimize(&caught);
        }
    }
}

// What one writes without the library: a base class, a registry of factories, standard streams.
struct Failure {
    explicit Failure(const char* name) : id(name) {}
    virtual ~Failure() = default;
    virtual void write(std::ostream& out) const { out << minor << ' ' << completed << '\n'; }
    virtual void read(std::istream& in) { in >> minor >> completed; }

    const char* id;
    unsigned long minor = 0x4f4d000b;  // as many digits as the library's
    unsigned long completed = 1;
};

template <int number>
std::unique_ptr<Failure> make(const char* id) {
    return std::unique_ptr<Failure>(new Failure(id));
}

typedef std::map<std::string, std::unique_ptr<Failure> (*)(const char*)> Factories;

const Factories& factories() {
#define KEL_STANDARD_EXCEPTION(X) {"IDL:omg.org/CORBA/" #X ":1.0", &make<__LINE__>},
    static const Factories all = {
#include <kel/exceptions/standard.inc>
    };
#undef KEL_STANDARD_EXCEPTION
    return all;
}

// Both ends of a connection, which stays with its streams: a hundred exceptions are sent over it and
// received, then it starts over. So one exception is what is measured, and not the going back.
const int batch = 100;

struct Standard {
    void send() {
        stream << sent.id << ' ';
        sent.write(stream);
    }
    void receive() {
        std::string id;
        stream >> id;
        const auto found = factories().find(id);
        std::unique_ptr<Failure> received = found->second(found->first.c_str());
        received->read(stream);
        benchmark::DoNotOptimize(received);
    }

    const Failure sent{"IDL:omg.org/CORBA/TRANSIENT:1.0"};
    std::stringstream stream;
};

struct Kel {
    void send() { out << sent; }
    void receive() {
        CORBA_Exception_var received;
        in >> received.out();
        benchmark::DoNotOptimize(received.in());
    }

    const CORBA::TRANSIENT sent{11, CORBA::COMPLETED_NO};
    std::stringstream stream;
    KELostream out{stream};
    KEListream in{stream};
};

template <class Contender>
void there_and_back(benchmark::State& state) {
    Contender connection;
    for (auto _ : state) {
        connection.stream.clear();
        connection.stream.seekp(0);
        connection.stream.seekg(0);
        for (int i = 0; i < batch; ++i) connection.send();
        for (int i = 0; i < batch; ++i) connection.receive();
    }
    state.counters["items"] = batch;  // the time is that of one, as for the limit
}

// The least: the same bytes copied there and back, one object made.
void there_and_back_copied(benchmark::State& state) {
    const std::string sent = "32\"IDL:omg.org/CORBA/TRANSIENT:1.0\"\n1330446347 1 ";
    for (auto _ : state) {
        std::string wire = sent;
        benchmark::DoNotOptimize(wire);
        std::unique_ptr<Failure> received(new Failure(wire.c_str()));
        benchmark::DoNotOptimize(received);
    }
}

CORBA_Exception* no_object() { return nullptr; }

// Look-ups of ids among `n` descriptions.
void look_up_kel(benchmark::State& state, long n) {
    const std::vector<std::string> ids = bench::random_names(n);
    std::vector<std::unique_ptr<CORBA_Exception::Description>> all;
    for (const std::string& id : ids) {
        all.emplace_back(
            new CORBA_Exception::Description(id.c_str(), id.c_str(), no_object, nullptr, nullptr));
    }
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(CORBA_Exception::Description::desc(ids[i].c_str()));
        if (++i == ids.size()) i = 0;
    }
}

void look_up_standard(benchmark::State& state, long n) {
    const std::vector<std::string> ids = bench::random_names(n);
    Factories all;
    for (const std::string& id : ids) all.emplace(id, &make<0>);
    std::size_t i = 0;
    for (auto _ : state) {
        const char* const asked = ids[i].c_str();
        benchmark::DoNotOptimize(all.find(asked)->second);
        if (++i == ids.size()) i = 0;
    }
}

// Many ids are looked up once each: to register them takes far longer, and would be done for each repetition.
void look_up(const std::string& who, long n, void (*work)(benchmark::State&, long)) {
    benchmark::internal::Benchmark* const point =
        growth("registry of exceptions, look-up", who, n, [=](benchmark::State& state) { work(state, n); });
    if (n > 1 << 16) point->Iterations(n)->Repetitions(1);
}

const bool registered = [] {
    line("throw + catch", kLimit, throw_int);
    line("throw + catch", "std::runtime_error", throw_standard);
    line("throw + catch", kKel, throw_kel);

    line("raise + catch", kLimit, raise_standard<RaisableInt, int>);
    line("raise + catch", "std::runtime_error", raise_standard<RaisableError, std::exception>);
    line("raise + catch", "std::rethrow_exception", rethrow_standard);
    line("raise + catch", kKel, raise_kel);

    line("to text and back by id", kLimit, there_and_back_copied);
    line("to text and back by id", "stringstream + map", there_and_back<Standard>);
    line("to text and back by id", kKel, there_and_back<Kel>);

    for (long n = 16; n <= 1 << 20; n *= 4) {
        look_up("std::map", n, look_up_standard);
        look_up(kKel, n, look_up_kel);
    }
    return true;
}();

}  // namespace
