// What the library leaves alone in the process that it works for.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/kel.h>
#include <unistd.h>

#include <fstream>
#include <future>
#include <iostream>
#include <memory>
#include <string>
#include <thread>

#include "tests/support/child.h"

namespace {

// The calling thread's blocked signals, and those that the process ignores or catches.
std::string signals() {
    std::ifstream status("/proc/thread-self/status");
    std::string found;
    for (std::string line; std::getline(status, line);) {
        for (const char* field : {"SigBlk:", "SigIgn:", "SigCgt:"}) {
            if (line.rfind(field, 0) == 0) found += line + "\n";
        }
    }
    return found;
}

class Reporter : public KELThread {
public:
    explicit Reporter(std::promise<std::string>& seen) : KELThread(0), _seen(seen) {}
    void begin() override { _seen.set_value(signals()); }

private:
    std::promise<std::string>& _seen;
};

std::string signals_of_a_thread() {
    std::promise<std::string> seen;
    Reporter thread(seen);
    thread.run();
    return seen.get_future().get();
}

void fail_to_connect() {
    const int listener = KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0);
    const int port = KELPortable::saGetPort(listener);
    close(listener);
    try {
        KELPortable::tcpConnect("127.0.0.1", static_cast<unsigned short>(port), 1, nullptr);
    } catch (const CORBA_SystemException&) {
    }
}

// One call of each kind that has to do with the system.
void work() {
    KELPipe pipe;
    char byte = 'x';
    pipe.write(&byte, 1);
    pipe.read(&byte, 1);
    for (const KELPoll::SupportedAPIs api : {KELPoll::API_POLL, KELPoll::API_SELECT}) {
        const std::unique_ptr<KELPoll> poller(KELPoll::create(1, api));
        poller->waitForEvents(0);
    }
    fail_to_connect();
    KELLoadLibrary::instance()->Load("no such library");
    KELDebugLogger log;
    log.traceModule(1);
    log.start(1, 1, "file", 1) << "text" << endl;
    CORBA::current_environment();
}

TEST(ProcessState, SignalsStayAsTheyAre) {
    const kel::test::Outcome seen = kel::test::in_child([] {
        std::thread([] {}).join();  // the C library catches two signals of its own from the first thread on
        const std::string before = signals();
        if (before.empty()) std::cerr << "nothing to compare";
        work();
        std::cerr << (signals() == before) << (signals_of_a_thread() == before);
    });
    EXPECT_EQ(seen.err.substr(seen.err.size() - 2), "11") << seen.err;
}

}  // namespace
