// A library with a static object that uses everything while it is built and while it is destroyed.
// It logs "built" and "destroyed"; whatever does not work ends the process.
//
// SPDX-License-Identifier: MIT
#include <kel/core/mutex.h>
#include <kel/core/resource.h>
#include <kel/core/spin_mutex.h>
#include <kel/core/thread.h>
#include <kel/exceptions/standard.h>
#include <kel/services/debug_logger.h>
#include <kel/services/environment.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cstdlib>
#include <cstring>
#include <sstream>

namespace {

const unsigned int module = 0x10000001;

void check(bool works) {
    if (!works) std::abort();
}

void log(const char* text) {
    KELDebugLogger& logger = *KELDebugLogger::instance();
    logger.traceModule(module);
    logger.start(1, module, "client.cpp", 1) << text << endl;
}

// The library's own locks work before and after their life, which a sanitizer could not know.
template <class Mutex>
__attribute__((no_sanitize("vptr"))) void lock_and_unlock(Mutex& mutex) {
    mutex.lock();
    mutex.unlock();
}

void throw_and_catch() {
    bool caught = false;
    try {
        throw CORBA_BAD_PARAM(5, CORBA::COMPLETED_NO, "from a static object");
    } catch (const CORBA_SystemException& e) {
        caught = CORBA_BAD_PARAM::_downcast(&e) != nullptr && e.completed() == CORBA::COMPLETED_NO;
    }
    check(caught);
}

void remember_in_the_environment() {
    CORBA_Environment* const environment = CORBA::current_environment();
    environment->exception(new CORBA_TRANSIENT);
    check(CORBA::current_environment()->exception() != nullptr);
    environment->clear();
}

void write_and_read() {
    std::stringstream text;
    KELostream out(text);
    out << 4711 << 1.5 << "text";
    KEListream in(text);
    int number = 0;
    double decimal = 0;
    CORBA_String_var string;
    in >> number >> decimal >> string;
    check(number == 4711 && decimal > 1.4 && std::strcmp(string.in(), "text") == 0);
}

// Builds and releases one of each kind.
void use_others() {
    KELMutex plain;
    lock_and_unlock(plain);
    KELSpinMutex pooled;
    lock_and_unlock(pooled);
    lock_and_unlock(KELThread::_mutex);
    KELResource* const counted = new KELResource;
    counted->_ref();
    counted->_unref();
    counted->_unref();
    throw_and_catch();
    remember_in_the_environment();
    write_and_read();
}

// What one keeps from load to exit is used again at exit.
class Client {
public:
    Client() : _name(CORBA::string_dup("client")), _resource(new KELResource), _exception(new CORBA_MARSHAL) {
        _resource->_ref();
        use_own();
        use_others();
        log("built");
    }
    ~Client() {
        use_own();
        use_others();
        check(_resource->_unref() == 1);
        check(_resource->_unref() == 0);
        log("destroyed");
    }
    Client(const Client&) = delete;
    Client& operator=(const Client&) = delete;

private:
    void use_own() {
        lock_and_unlock(_mutex);
        lock_and_unlock(_pooled);
        check(std::strcmp(_name.in(), "client") == 0);
        check(CORBA_MARSHAL::_downcast(_exception.in()) != nullptr);
    }

    KELMutex _mutex;
    KELRSpinMutex _pooled;
    CORBA_String_var _name;
    KELResource* const _resource;
    CORBA_Exception_var _exception;
};

Client client;

}  // namespace
