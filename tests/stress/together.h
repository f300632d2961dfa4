// Several threads that do the same at the same time.
//
//   crowd       how many threads a test uses unless it says otherwise
//   Start       holds threads back until all have arrived; may be used again for the next round
//   together    runs a function in `n` threads that begin at once, and waits for them
//
//     together(crowd, [&](int i) { results[i] = ask(); });
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STRESS_TOGETHER_H
#define KEL_TESTS_STRESS_TOGETHER_H

#include <pthread.h>

#include <thread>
#include <vector>

namespace kel {
namespace test {

const int crowd = 4;

class Start {
public:
    explicit Start(int threads) { pthread_barrier_init(&_barrier, nullptr, static_cast<unsigned>(threads)); }
    ~Start() { pthread_barrier_destroy(&_barrier); }
    Start(const Start&) = delete;
    Start& operator=(const Start&) = delete;

    void arrive() { pthread_barrier_wait(&_barrier); }

private:
    pthread_barrier_t _barrier;
};

// `body` gets the number of its thread, from 0.
template <class Body>
void together(int n, Body body) {
    Start start(n);
    std::vector<std::thread> threads;
    for (int i = 0; i < n; ++i) {
        threads.emplace_back([&start, &body, i] {
            start.arrive();
            body(i);
        });
    }
    for (std::thread& thread : threads) thread.join();
}

}  // namespace test
}  // namespace kel

#endif
