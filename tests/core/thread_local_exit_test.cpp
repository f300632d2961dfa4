// The clean-up of per-thread objects at the end of a thread.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/core/probe.h"
#include "tests/core/thread_locals.h"

namespace {

using namespace kel::test;

using ThreadLocal = ThreadLocalFixture;

TEST_F(ThreadLocal, DefaultFinalizeDeletesTheObject) {
    class Noted : public KELThreadLocal {
    public:
        Noted(unsigned long its_slot, bool& deleted) : KELThreadLocal(its_slot), _deleted(deleted) {}
        ~Noted() override { _deleted = true; }

    private:
        bool& _deleted;
    };
    bool deleted = false;
    new Noted(slot, deleted);
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_TRUE(deleted);
}

TEST_F(ThreadLocal, CleanUpFinalizesEachObjectOnceInTableOrder) {
    std::vector<unsigned long> slots, finalized;
    for (int i = 0; i < 12; ++i) {
        const unsigned long drawn = draw_slot();
        slots.push_back(drawn);
        new Local(drawn, [&finalized, drawn] { finalized.push_back(drawn); });
    }
    const std::vector<unsigned long> expected = in_table_order(slots);
    ASSERT_NE(expected, slots) << "or the order would show nothing";
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(finalized, expected);
}

TEST_F(ThreadLocal, CleanUpRemovesAndFreesTheTable) {
    { Local warm_up(slot); }
    const long blocks = AllocationPlan::live_blocks();
    new Local(slot);
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(my_table(), nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
}

TEST_F(ThreadLocal, CleanUpHoldsTheMutexWhileFinalizing) {
    bool held = false;
    new Local(slot, [&] { held = is_held(KELThreadLocal::_mutex); });
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_TRUE(held);
    EXPECT_FALSE(is_held(KELThreadLocal::_mutex));
}

TEST_F(ThreadLocal, SecondCleanUpFindsNothing) {
    int finalized = 0;
    new Local(slot, [&] { ++finalized; });
    KELThreadLocal::_exit_thread(nullptr);
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(finalized, 1);
    EXPECT_FALSE(is_held(KELThreadLocal::_mutex));
}

TEST_F(ThreadLocal, CleanUpIgnoresItsArgument) {
    Survivor object(slot);
    int anything = 0;
    KELThreadLocal::_exit_thread(&anything);
    EXPECT_EQ(object.finalized, 1);
}

TEST_F(ThreadLocal, CleanUpLeavesOtherThreadsAlone) {
    Survivor mine(slot);
    in_another_thread([&] {
        new Local(slot);
        KELThreadLocal::_exit_thread(nullptr);
    });
    EXPECT_EQ(mine.finalized, 0);
    EXPECT_EQ(KELThreadLocal::instance(slot), &mine);
}

TEST_F(ThreadLocal, ObjectsAreOutOfTheTableWhileTheyAreFinalized) {
    KELThreadLocal* found = nullptr;
    new Local(slot, [&] { found = KELThreadLocal::instance(slot); });
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(found, nullptr);
}

TEST_F(ThreadLocal, FinalizeMayDeleteASibling) {
    const unsigned long other = draw_slot();
    int finalized = 0;
    Local *a = nullptr, *b = nullptr;
    a = new Local(slot, [&] {
        ++finalized;
        delete b;
    });
    b = new Local(other, [&] {
        ++finalized;
        delete a;
    });
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(finalized, 1) << "the deleted one is not finalized any more";
}

TEST_F(ThreadLocal, FinalizeMayCreateAnObjectAgain) {
    int finalized = 0;
    new Local(slot, [&] {
        ++finalized;
        new Local(slot, [&] { ++finalized; });
    });
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(finalized, 1);
    EXPECT_NE(KELThreadLocal::instance(slot), nullptr);
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(finalized, 2);
}

TEST_F(ThreadLocal, FinalizeMayCleanUpAgainAndDeleteAnOuterSibling) {
    const unsigned long others[] = {draw_slot(), draw_slot()};
    int outer = 0, inner = 0;
    std::vector<Local*> siblings;
    const auto at_the_end = [&] {
        if (++outer > 1) return;
        new Local(slot, [&] {
            ++inner;
            for (Local* sibling : siblings) {
                if (sibling != nullptr) delete sibling;
            }
        });
        KELThreadLocal::_exit_thread(nullptr);
    };
    // The first to be finalised takes itself off the list and ends all the others.
    for (unsigned long other : others) {
        const std::size_t place = siblings.size();
        siblings.push_back(new Local(other, [&siblings, &at_the_end, place] {
            siblings[place] = nullptr;
            at_the_end();
        }));
    }
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(outer, 1);
    EXPECT_EQ(inner, 1);
}

TEST_F(ThreadLocal, AnyThreadThatEndsFinalizesItsObjects) {
    int finalized = 0;
    in_another_thread([&] {
        new Local(slot, [&] { ++finalized; });
        new Local(draw_slot(), [&] { ++finalized; });
    });
    EXPECT_EQ(finalized, 2);
}

TEST_F(ThreadLocal, ThreadThatEndsLeavesNoTable) {
    pthread_t thread{};
    in_another_thread([&] {
        thread = pthread_self();
        new Local(slot);
    });
    EXPECT_EQ(table_of(thread), nullptr);
}

// The system runs the destructors of keys four times; what is created after that stays.
TEST_F(ThreadLocal, ThreadThatEndsFinalizesWhatFinalizeCreatedFourTimes) {
#if defined(__SANITIZE_THREAD__)
    GTEST_SKIP() << "the thread sanitizer drops its own state of the thread in the fourth round";
#endif
    for (const int generations : {1, 4, 5}) {
        int finalized = 0;
        std::function<void()> again = [&] {
            if (++finalized < generations) new Local(slot, again);
        };
        pthread_t thread{};
        in_another_thread([&] {
            thread = pthread_self();
            new Local(slot, again);
        });
        EXPECT_EQ(finalized, generations < 4 ? generations : 4);
        KELThreadLocal* left = nullptr;
        if (KELThreadLocal::SlotTable* const table = table_of(thread)) table->atKey(KELUniqueId(slot), left);
        EXPECT_EQ(left != nullptr, generations > 4);
        delete left;
    }
}

}  // namespace
