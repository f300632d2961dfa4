// Counted objects, their records and the pool of records, as the tests look at them.
//
//   Counted         an object that tells when it is deleted
//   count_of, ...   what a record holds
//   ResourceTest    starts and ends with an empty pool and the initial sharing on
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CORE_RECORDS_H
#define KEL_TESTS_CORE_RECORDS_H

#include <kel/core/resource.h>

#include <vector>

#include "tests/core/probe.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {

class Counted : public KELResource {
public:
    explicit Counted(int* deleted = nullptr) : _deleted(deleted) {}
    ~Counted() override {
        if (_deleted != nullptr) ++*_deleted;
    }

private:
    int* _deleted;
};

// What a record holds: count, sharing, mutex.
inline std::int32_t count_of(KELResourceImpl* r) { return field_at<std::int32_t>(r, 0); }
inline unsigned char sharing_of(KELResourceImpl* r) { return field_at<unsigned char>(r, 4); }
inline KELSpinMutex& mutex_of(KELResourceImpl* r) {
    return *reinterpret_cast<KELSpinMutex*>(reinterpret_cast<unsigned char*>(r) + 8);
}
inline pthread_mutex_t* native(KELResourceImpl* r) { return native(*impl_of(mutex_of(r))); }

// Starts with an empty pool and the initial sharing on.
class ResourceTest : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        KELResource::garbage_collect();
    }
    void TearDown() override {
        KELResource::set_init_sharing(1);
        KELResource::garbage_collect();
        FaultTest::TearDown();
    }

    std::uint32_t parked() const { return field_at<std::uint32_t>(pool, 2 * word); }

    void record_locks() {
        seams::pthread_mutex_lock.script([this](pthread_mutex_t* m) {
            locked.push_back(m);
            return seams::pthread_mutex_lock.real(m);
        });
    }

    KELResourceImplFactory* const pool = KELResourceImplFactory::instance();
    std::vector<pthread_mutex_t*> locked;
};

}  // namespace test
}  // namespace kel

#endif
