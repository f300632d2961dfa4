// Makes the library's function-local objects before there are threads, for drd, which cannot see that
// their first use is ordered. The thread sanitizer can, and watches these first uses.
//
// SPDX-License-Identifier: MIT
#ifdef KEL_TESTS_STRESS_VISIBLE_ATOMICS_H

#include <gtest/gtest.h>
#include <kel/core/resource.h>
#include <kel/core/spin_mutex.h>
#include <kel/core/unique_id.h>
#include <kel/streams/ostream.h>

#include <sstream>

namespace {

class FirstUse : public testing::Environment {
    void SetUp() override {
        KELSpinMutex();
        KELRSpinMutex();
        KELUniqueId();
        KELResource* const counted = new KELResource;
        counted->_ref();
        counted->_unref();
        counted->_unref();
        std::stringstream text;
        KELostream(text) << "long enough for sixteen characters at once";
    }
};

[[maybe_unused]] testing::Environment* const first_use = testing::AddGlobalTestEnvironment(new FirstUse);

}  // namespace

#endif
