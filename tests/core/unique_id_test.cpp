// Process-unique integers.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/core/unique_id.h>

#include <set>
#include <thread>
#include <vector>

#include "tests/core/fresh.h"
#include "tests/core/reports.h"

namespace {

using namespace kel::test;

using UniqueId = FaultTest;

const FreshScene first_ids("first_ids", [] {
    const std::uint32_t at_start = KELUniqueId::_globalId;
    KELUniqueId a;
    KELUniqueId b;
    KELUniqueId c;
    std::cout << at_start << ": " << a.value() << ' ' << b.value() << ' ' << c.value();
});

TEST_F(UniqueId, StartsAtZero) { EXPECT_EQ(first_ids.play().out, "0: 0 1 2"); }

TEST_F(UniqueId, CountsInTheOrderOfConstruction) {
    const KELUniqueId a;
    const KELUniqueId b;
    EXPECT_EQ(b.value(), a.value() + 1);
}

TEST_F(UniqueId, TakesTheCounterAndIncrementsIt) {
    const std::uint32_t next = KELUniqueId::_globalId;
    const KELUniqueId id;
    EXPECT_EQ(id.value(), next);
    EXPECT_EQ(KELUniqueId::_globalId, next + 1);
}

TEST_F(UniqueId, WrapsAfterThirtyTwoBits) {
    const std::uint32_t next = KELUniqueId::_globalId;
    KELUniqueId::_globalId = 0xffffffffu;
    const KELUniqueId last;
    const KELUniqueId first;
    KELUniqueId::_globalId = next;
    EXPECT_EQ(last.value(), 0xfffffffful);
    EXPECT_EQ(first.value(), 0ul);
}

TEST_F(UniqueId, WrappingAValueDrawsNone) {
    const std::uint32_t next = KELUniqueId::_globalId;
    const KELUniqueId id(1234ul);
    EXPECT_EQ(id.value(), 1234ul);
    EXPECT_EQ(KELUniqueId::_globalId, next);
}

TEST_F(UniqueId, CopiesKeepTheValue) {
    const KELUniqueId id;
    const KELUniqueId copy(id);
    EXPECT_EQ(copy.value(), id.value());
}

TEST_F(UniqueId, IsOneThirtyTwoBitInteger) { EXPECT_EQ(sizeof(KELUniqueId), 4u); }

TEST_F(UniqueId, HashIsTheInteger) {
    EXPECT_EQ(_kel_hash(KELUniqueId(0ul)), 0ul);
    EXPECT_EQ(_kel_hash(KELUniqueId(0xfffffffful)), 0xfffffffful);
}

TEST_F(UniqueId, EqualityIsThatOfTheIntegers) {
    EXPECT_EQ(compare(KELUniqueId(7ul), KELUniqueId(7ul)), 0);
    EXPECT_LT(compare(KELUniqueId(7ul), KELUniqueId(0xfffffffful)), 0);
    EXPECT_GT(compare(KELUniqueId(8ul), KELUniqueId(7ul)), 0);
    EXPECT_TRUE(KELUniqueId(7ul) == KELUniqueId(7ul));
    EXPECT_TRUE(KELUniqueId(7ul) != KELUniqueId(8ul));
}

TEST_F(UniqueId, IsUniqueAcrossThreads) {
    std::vector<std::vector<unsigned long>> drawn(4);
    std::vector<std::thread> threads;
    const KELUniqueId before;
    for (auto& mine : drawn) {
        threads.emplace_back([&mine] {
            for (int i = 0; i < 1000; ++i) mine.push_back(KELUniqueId().value());
        });
    }
    std::set<unsigned long> all;
    for (int i = 0; i < 4; ++i) {
        threads[i].join();
        all.insert(drawn[i].begin(), drawn[i].end());
    }
    EXPECT_EQ(all.size(), 4000u);
    EXPECT_EQ(*all.begin(), before.value() + 1);
    EXPECT_EQ(*all.rbegin(), before.value() + 4000);
}

TEST_F(UniqueId, DrawsUnderALock) {
    KELUniqueId made_the_lock;
    Armed armed;
    KELUniqueId id;
    EXPECT_EQ(seams::pthread_mutex_init.calls(), 0);
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 1);
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 1);
}

const FreshScene no_lock_for_ids("no_lock_for_ids", [] {
    const FailedCreation seen = fail_creation(seams::pthread_mutex_init, ENOMEM, 3, [] { KELUniqueId(); });
    std::cout << (seen.thrown ? "thrown " : "not thrown ") << seen.printed << ' ' << KELUniqueId().value();
});

TEST_F(UniqueId, FirstDrawThrowsNoResourcesWithoutALockAndDrawsNone) {
    EXPECT_EQ(no_lock_for_ids.play().out, "thrown pthread_mutex_init 0");
}

}  // namespace
