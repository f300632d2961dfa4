// Empties the library's pools for a scenario and leaves them as they were.
//
//   EmptyPool<Factory, Impl>   nothing is parked while it lives
//   EmptyPlainPool, EmptyRecursivePool
//
// What the scenario parks is deleted at the end.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_POOLS_H
#define KEL_TESTS_FAULTS_MATRIX_POOLS_H

#include <kel/core/resource.h>
#include <kel/core/spin_mutex.h>

#include <vector>

#include "tests/core/probe.h"

namespace kel {
namespace test {

template <class Factory, class Impl>
class EmptyPool {
public:
    EmptyPool() {
        while (parked() > 0) _kept.push_back(pool->create());
    }
    EmptyPool(const EmptyPool&) = delete;
    EmptyPool& operator=(const EmptyPool&) = delete;
    ~EmptyPool() {
        while (parked() > 0) delete pool->create();
        for (; !_kept.empty(); _kept.pop_back()) pool->destroy(_kept.back());
    }

    int parked() const { return field_at<std::int32_t>(pool, 0); }

    void park(int n) {
        for (int i = 0; i < n; ++i) pool->destroy(new Impl);
    }

    Factory* const pool = Factory::instance();

private:
    std::vector<Impl*> _kept;
};

typedef EmptyPool<KELSpinMutexImplFactory, KELSpinMutexImpl> EmptyPlainPool;
typedef EmptyPool<KELRSpinMutexImplFactory, KELRSpinMutexImpl> EmptyRecursivePool;

}  // namespace test
}  // namespace kel

#endif
