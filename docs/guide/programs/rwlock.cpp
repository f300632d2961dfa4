// SPDX-License-Identifier: MIT
#include <kel/core/rwlock.h>

#include <iostream>

// A table that is read often and changed seldom.
class Rates {
public:
    int of(int currency) {
        KELRLock_var hold(_lock);  // many readers at once
        return _rates[currency];
    }

    void set(int currency, int rate) {
        KELWLock_var hold(_lock);  // alone
        _rates[currency] = rate;
    }

    // Who holds the lock: the number of readers, 0 for nobody, -1 for a writer.
    int state() const KEL_NO_THREAD_SAFETY_ANALYSIS { return _lock._state; }

    int state_while_two_read() KEL_NO_THREAD_SAFETY_ANALYSIS {
        KELRLock_var one(_lock);
        KELRLock_var two(_lock);  // safe only as long as no writer can wait
        return state();
    }

    int state_while_one_writes() {
        KELWLock_var hold(_lock);
        return state();
    }

private:
    KELRWLock _lock;
    int _rates[3] = {};
};

int main() {
    Rates rates;
    rates.set(1, 42);
    std::cout << "rate " << rates.of(1) << "\n";
    std::cout << "two readers: " << rates.state_while_two_read() << "\n";
    std::cout << "a writer: " << rates.state_while_one_writes() << "\n";
    std::cout << "nobody: " << rates.state() << "\n";
}
