// SPDX-License-Identifier: MIT
#include <kel/core/condition.h>
#include <kel/core/thread.h>
#include <kel/exceptions/standard.h>

#include <iostream>

// Nobody joins a thread of the library: they are detached. Whoever has to know that one is done
// gives it something to say so.
class Finish {
public:
    void reach() {
        KELMutex_var hold(_mutex, 1);
        ++_reached;
        _changed.signal();
    }

    void wait_for(int threads) {
        KELMutex_var hold(_mutex, 1);
        while (_reached < threads) _changed.wait(_mutex);
    }

private:
    KELMutex _mutex;
    KELCondition _changed;
    int _reached KEL_GUARDED_BY(_mutex) = 0;
};

class Summer : public KELThread {
public:
    Summer(int first, int last, Finish& finish)
        : KELThread(128 * 1024), _first(first), _last(last), _sum(0), _finish(finish) {}  // bytes of stack

    void begin() override {
        for (int i = _first; i <= _last; ++i) _sum += i;
        _finish.reach();
    }

    int sum() const { return _sum; }

private:
    int _first, _last, _sum;
    Finish& _finish;
};

// A thread that nobody waits for: its object goes with it.
class Errand : public KELThread {
public:
    explicit Errand(Finish& finish) : KELThread(0), _finish(finish) {}

    void begin() override {
        Finish& finish = _finish;
        delete this;  // the last act but one: nothing of the object is used below
        finish.reach();
    }

private:
    Finish& _finish;
};

int main() {
    Finish summed;
    Summer low(1, 50, summed);
    Summer high(51, 100, summed);
    low.run();
    high.run();
    summed.wait_for(2);
    std::cout << "sum " << low.sum() + high.sum() << "\n";

    // Each object is in a list until it is destroyed, the newest first.
    {
        KELMutex_var hold(KELThread::_mutex, 1);  // nobody comes or goes meanwhile
        std::cout << (KELThread::_first == &high && high._next == &low ? "two registered" : "?") << "\n";
    }

    Finish errand;
    (new Errand(errand))->run();
    errand.wait_for(1);
    {
        KELMutex_var hold(KELThread::_mutex, 1);
        std::cout << (KELThread::_first == &high ? "the errand is gone" : "?") << "\n";
    }

    try {
        throw CORBA_NO_RESOURCES(11, CORBA::COMPLETED_NO);  // what run() throws when there is no thread
    } catch (const CORBA::SystemException& refused) {
        std::cout << "no thread: errno " << (refused.minor() & 0xfff) << "\n";
    }
}
