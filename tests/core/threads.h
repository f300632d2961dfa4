// Thread objects for tests.
//
//   Body           a thread whose body is a function
//   ThreadFixture  runs bodies and waits for the end of all threads that a test leaves
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CORE_THREADS_H
#define KEL_TESTS_CORE_THREADS_H

#include <kel/core/thread.h>
#include <kel/core/thread_local.h>

#include <functional>
#include <thread>
#include <utility>

#include "tests/core/gate.h"
#include "tests/core/probe.h"
#include "tests/support/fault.h"
#include "tests/support/tasks.h"

namespace kel {
namespace test {

class Body : public KELThread {
public:
    Body() : Body([] {}) {}
    explicit Body(std::function<void()> body, long stacksize = 0)
        : KELThread(stacksize), _body(std::move(body)) {}
    void begin() override { _body(); }

private:
    std::function<void()> _body;
};

// Waits for the end of the threads that it leaves, so that later tests may fork.
class ThreadFixture : public FaultTest {
protected:
    void TearDown() override {
        wait_for_the_end_of_threads();
        KELThread::_inheritsched = -1;
        KELThread::_factory = &KELThread::_create_thread;
        FaultTest::TearDown();
    }

    static KELThread* first() {
        KELMutex_var hold(KELThread::_mutex, 1);
        return KELThread::_first;
    }

    // Runs `body` in a thread of its own and waits for the end of the body.
    static void run(const std::function<void()>& body) {
        Gate done;
        Body thread([&] {
            body();
            done.open();
        });
        thread.run();
        done.wait();
        wait_for_the_end_of_threads();
    }

    // A thread that has ended has released its slots; taking the mutex orders that before what follows.
    static void wait_for_the_end_of_threads() {
        ASSERT_TRUE(others_end());
        KELRMutex_var after_the_last_release(KELThreadLocal::_mutex, 1);
    }
};

}  // namespace test
}  // namespace kel

#endif
