// SPDX-License-Identifier: MIT
#include <kel/core/mutex.h>

#include <iostream>

// An account that any number of threads may use.
class Account {
public:
    void pay_in(long amount) {
        KELMutex_var hold(_mutex, 1);  // locked here, unlocked at the end of the scope
        _balance += amount;
    }

    long balance() {
        KELMutex_var hold(_mutex, 1);
        return _balance;
    }

private:
    KELMutex _mutex;
    long _balance KEL_GUARDED_BY(_mutex) = 0;  // clang's -Wthread-safety checks that
};

// A journal whose operations call each other: its mutex lets the same thread in again.
class Journal {
public:
    void note(const char* line) {
        KELRMutex_var hold(_mutex, 1);
        ++_lines;
        std::cout << _lines << ". " << line << "\n";
    }

    void note_transfer(const char* from, const char* to) {
        KELRMutex_var hold(_mutex, 1);  // both lines or none of them
        note(from);
        note(to);
    }

private:
    KELRMutex _mutex;
    int _lines = 0;
};

// Locks only when there is something to lock.
void pay_all(Account* accounts, int count, KELMutex* shared_with_others) {
    KELDMutex_var hold(shared_with_others, 1);
    for (int i = 0; i < count; ++i) accounts[i].pay_in(10);
}

int main() {
    Account accounts[2];
    accounts[0].pay_in(5);
    pay_all(accounts, 2, 0);
    KELMutex others;
    pay_all(accounts, 2, &others);
    std::cout << accounts[0].balance() << " and " << accounts[1].balance() << "\n";

    Journal journal;
    journal.note("opened");
    journal.note_transfer("10 from vesta", "10 to juno");
}
