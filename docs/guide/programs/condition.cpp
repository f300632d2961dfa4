// SPDX-License-Identifier: MIT
#include <kel/core/condition.h>
#include <kel/core/thread.h>

#include <iostream>

// A place for one letter. Who takes waits until there is one, who puts waits until there is room.
class Mailbox {
public:
    void put(int letter) {
        KELMutex_var hold(_mutex, 1);
        while (_full) _changed.wait(_mutex);  // frees the mutex while it waits
        _letter = letter;
        _full = true;
        _changed.broadcast();
    }

    int take() {
        KELMutex_var hold(_mutex, 1);
        while (!_full) _changed.wait(_mutex);  // a wake-up proves nothing: look again
        _full = false;
        _changed.broadcast();
        return _letter;
    }

    // Waits no longer than so many milliseconds. An unsigned long would count seconds.
    bool arrives_within(unsigned long long milliseconds) {
        KELMutex_var hold(_mutex, 1);
        while (!_full) {
            if (_changed.timedwait(_mutex, milliseconds)) return false;
        }
        return true;
    }

private:
    KELMutex _mutex;
    KELCondition _changed;
    bool _full KEL_GUARDED_BY(_mutex) = false;
    int _letter KEL_GUARDED_BY(_mutex) = 0;
};

class Sender : public KELThread {
public:
    explicit Sender(Mailbox& mailbox) : KELThread(0), _mailbox(mailbox) {}

    void begin() override {
        for (int letter = 1; letter <= 3; ++letter) _mailbox.put(letter);
        _mailbox.put(0);  // the last one
    }

private:
    Mailbox& _mailbox;
};

int main() {
    Mailbox mailbox;
    if (!mailbox.arrives_within(20)) std::cout << "no letter yet\n";

    Sender sender(mailbox);
    sender.run();
    while (const int letter = mailbox.take()) std::cout << "letter " << letter << "\n";
}
