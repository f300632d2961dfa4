// SPDX-License-Identifier: MIT
#include <kel/core/condition.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>

#include <iostream>

// One call counter for each thread that counts.
class Calls : public KELThreadLocal {
public:
    // The calling thread's counter, made when the thread asks for the first time.
    static Calls& here() {
        KELThreadLocal* const found = KELThreadLocal::instance(slot());
        return found != 0 ? static_cast<Calls&>(*found) : *new Calls(slot());
    }

    int next() { return ++_count; }

private:
    explicit Calls(unsigned long slot) : KELThreadLocal(slot), _count(0) {}
    ~Calls() override;

    // The slot of the class, drawn once.
    static unsigned long slot() {
        KELRMutex_var hold(KELThreadLocal::_mutex, 1);
        static unsigned long drawn = KELThreadLocal::_cnt++;
        return drawn;
    }

    int _count;
};

// Counts twice. When its thread ends, the library destroys the thread's objects.
class Caller : public KELThread {
public:
    Caller() : KELThread(0) {}

    void begin() override {
        Calls::here().next();
        Calls::here().next();
    }

    static void wait_until(int ended) {
        KELMutex_var hold(_mutex, 1);
        while (_ended < ended) _changed.wait(_mutex);
    }

    static void note_end() {
        KELMutex_var hold(_mutex, 1);
        ++_ended;
        _changed.signal();
    }

private:
    static KELMutex _mutex;
    static KELCondition _changed;
    static int _ended;
};

KELMutex Caller::_mutex;
KELCondition Caller::_changed;
int Caller::_ended = 0;

Calls::~Calls() {
    std::cout << "a thread ends after " << _count << " calls\n";
    Caller::note_end();
}

int main() {
    Calls::here().next();
    Caller first;
    first.run();
    Caller::wait_until(1);
    std::cout << "the main thread's next call is number " << Calls::here().next() << "\n";
}
