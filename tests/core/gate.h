// Lets one thread wait for another without sleeping.
//
//     Gate done;
//     std::thread worker([&] { ...; done.open(); });
//     done.wait();
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CORE_GATE_H
#define KEL_TESTS_CORE_GATE_H

#include <kel/core/condition.h>

namespace kel {
namespace test {

class Gate {
public:
    // Once open it stays open.
    void open() {
        KELMutex_var hold(_mutex, 1);
        _open = true;
        _opened.broadcast();
    }

    void wait() {
        KELMutex_var hold(_mutex, 1);
        while (!_open) _opened.wait(_mutex);
    }

private:
    KELMutex _mutex;
    KELCondition _opened;
    bool _open KEL_GUARDED_BY(_mutex) = false;
};

}  // namespace test
}  // namespace kel

#endif
