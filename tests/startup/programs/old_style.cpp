// A program of an older kind: its code lies at a fixed address, and at 32 bits its stack is aligned to words
// only.
//
//   old_style    prints "factories agree" and "texts agree" when they do
//
// SPDX-License-Identifier: MIT
#include <kel/core/thread.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <iostream>
#include <sstream>
#include <string>

namespace {

class Started : public KELThread {
public:
    Started() : KELThread(0) {}
    void begin() override {}
};

void* (*handed_to_factory)(void*);
void remember(unsigned long, void* (*start)(void*), void*) { handed_to_factory = start; }

bool start_routines_agree() {
    KELThread::_factory = remember;
    Started().run();
    return handed_to_factory == &KELThread::_start;
}

// The library handed the addresses out; this program has its own idea of them.
bool factories_agree() {
    const CORBA::Exception::Description* const described =
        CORBA::Exception::Description::desc("IDL:omg.org/CORBA/TRANSIENT:1.0");
    return described == &CORBA::TRANSIENT::_description &&
           described->factory() == &CORBA::TRANSIENT::_factory &&
           KELThread::_factory == &KELThread::_create_thread && start_routines_agree();
}

bool goes_and_comes(const std::string& sent) {
    std::stringstream text;
    text << std::string(4 * sent.size() + 100, ' ');
    text.seekp(0);
    KELostream(text) << sent.c_str() << 7;
    char* received = nullptr;
    KEListream(text) >> received;
    const bool same = sent == received;
    CORBA::string_free(received);
    return same;
}

// Each level moves the stack by words.
bool texts_agree(int levels) {
    volatile char moved[4] = {};
    for (std::size_t length = 1; length < 100; ++length) {
        if (!goes_and_comes(std::string(length, 'a')) || !goes_and_comes(std::string(length, 'a') + "\"b"))
            return false;
    }
    return levels == moved[0] || texts_agree(levels - 1);
}

}  // namespace

int main() {
    if (factories_agree()) std::cout << "factories agree" << std::endl;
    if (texts_agree(8)) std::cout << "texts agree" << std::endl;
}
