// Sizes, offsets and virtual slots: what programs built against the library have compiled in.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/core/condition.h>
#include <kel/core/mutex.h>
#include <kel/core/resource.h>
#include <kel/core/rwlock.h>
#include <kel/core/spin_mutex.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>

#include <type_traits>

#include "tests/core/probe.h"
#include "tests/support/fault.h"

namespace {

using namespace kel::test;

// The objects need not exist: only differences of addresses are taken.
template <class Class, class Member>
std::size_t offset_of(Member Class::*member) {
    alignas(Class) static unsigned char place[sizeof(Class)];
    Class* const object = reinterpret_cast<Class*>(place);
    return static_cast<std::size_t>(reinterpret_cast<unsigned char*>(&(object->*member)) - place);
}

constexpr std::size_t align_up(std::size_t n, std::size_t to) { return (n + to - 1) / to * to; }

const std::size_t flag_size = word;  // a flag byte is padded to the next pointer

TEST(Layout, PlainMutexIsTablePointerAndPosixMutex) {
    EXPECT_EQ(sizeof(KELIMutex), word);
    EXPECT_EQ(sizeof(KELMutex), word + sizeof(pthread_mutex_t));
}

TEST(Layout, RecursiveMutexHasItsAttributesBeforeThePosixMutex) {
    KELRMutex* made = nullptr;
    const void *attributes = nullptr, *mutex = nullptr;
    reset_faults();
    seams::pthread_mutex_init.script([&](pthread_mutex_t* m, const pthread_mutexattr_t* a) {
        attributes = a;
        mutex = m;
        return seams::pthread_mutex_init.real(m, a);
    });
    {
        Armed armed;
        made = new KELRMutex;
    }
    reset_faults();
    EXPECT_EQ(attributes, reinterpret_cast<unsigned char*>(made) + word);
    EXPECT_EQ(mutex, reinterpret_cast<unsigned char*>(made) +
                         align_up(word + sizeof(pthread_mutexattr_t), alignof(pthread_mutex_t)));
    delete made;
}

TEST(Layout, SpinMutexesAreTablePointerAndImplementation) {
    EXPECT_EQ(sizeof(KELSpinMutex), 2 * word);
    EXPECT_EQ(sizeof(KELRSpinMutex), 2 * word);
}

TEST(Layout, PoolsAreCountGuardAndThirtyTwoEntries) {
    EXPECT_EQ(sizeof(KELSpinMutexImplFactory), word + sizeof(KELMutex) + 32 * word);
    EXPECT_EQ(sizeof(KELRSpinMutexImplFactory), word + sizeof(KELSpinMutex) + 32 * word);
    EXPECT_FALSE(std::is_polymorphic<KELSpinMutexImplFactory>::value);
    EXPECT_FALSE(std::is_polymorphic<KELRSpinMutexImplFactory>::value);
}

template <class Guard>
void expect_guard(std::size_t flag_offset) {
    EXPECT_EQ(sizeof(Guard), word + flag_size);
    EXPECT_EQ(flag_offset, word);
    EXPECT_FALSE(std::is_polymorphic<Guard>::value);
}

TEST(Layout, GuardsArePointerAndFlag) {
    expect_guard<KELMutex_var>(offset_of(&KELMutex_var::_locked));
    expect_guard<KELRMutex_var>(offset_of(&KELRMutex_var::_locked));
    expect_guard<KELDMutex_var>(offset_of(&KELDMutex_var::_locked));
    expect_guard<KELRLock_var>(word);
    expect_guard<KELWLock_var>(word);
    EXPECT_EQ(offset_of(&KELDMutex_var::_mtx), 0u);
}

TEST(Layout, GuardsStoreTheMutexAsAPointer) {
    KELMutex m;
    KELMutex_var hold(m, 1);
    EXPECT_EQ(field_at<KELMutex*>(&hold, 0), &m);
    KELRMutex r;
    KELRMutex_var hold_recursive(r, 1);
    EXPECT_EQ(field_at<KELRMutex*>(&hold_recursive, 0), &r);
}

TEST(Layout, ConditionIsThePosixCondition) {
    EXPECT_EQ(sizeof(KELCondition), sizeof(pthread_cond_t));
    EXPECT_FALSE(std::is_polymorphic<KELCondition>::value);
}

TEST(Layout, ReaderWriterLockHasItsMembersInOrder) {
    EXPECT_EQ(offset_of(&KELRWLock::_mutex), 0u);
    EXPECT_EQ(offset_of(&KELRWLock::_state), sizeof(KELMutex));
    EXPECT_EQ(offset_of(&KELRWLock::_readers), align_up(sizeof(KELMutex) + 4, alignof(KELCondition)));
    EXPECT_EQ(offset_of(&KELRWLock::_waiting_writers),
              offset_of(&KELRWLock::_readers) + sizeof(KELCondition));
    EXPECT_EQ(offset_of(&KELRWLock::_writers),
              align_up(offset_of(&KELRWLock::_waiting_writers) + 4, alignof(KELCondition)));
    EXPECT_FALSE(std::is_polymorphic<KELRWLock>::value);
}

TEST(Layout, ThreadHasItsMembersInOrder) {
    EXPECT_EQ(offset_of(&KELThread::_tid), word);
    EXPECT_EQ(offset_of(&KELThread::_next), 2 * word);
    EXPECT_EQ(offset_of(&KELThread::_prev), 3 * word);
    EXPECT_EQ(offset_of(&KELThread::_stacksize), 4 * word);
    EXPECT_EQ(sizeof(KELThread), 5 * word);
}

TEST(Layout, ThreadLocalIsTablePointerOwnerAndSlot) {
    EXPECT_EQ(offset_of(&KELThreadLocal::_owner), word);
    EXPECT_EQ(offset_of(&KELThreadLocal::_slot), 2 * word);
    EXPECT_EQ(sizeof(KELThreadLocal), 3 * word);
}

TEST(Layout, ResourceIsTablePointerAndRecord) {
    EXPECT_EQ(offset_of(&KELResource::_impl), word);
    EXPECT_EQ(sizeof(KELResource), 2 * word);
}

TEST(Layout, ResourceRecordIsCountSharingAndMutex) {
    EXPECT_EQ(sizeof(KELResourceImpl), 8 + sizeof(KELSpinMutex));
    EXPECT_FALSE(std::is_polymorphic<KELResourceImpl>::value);
}

TEST(Layout, ResourcePoolIsGuardCountAndEntries) {
    EXPECT_EQ(sizeof(KELResourceImplFactory), sizeof(KELSpinMutex) + word + 1024 * word);
    EXPECT_FALSE(std::is_polymorphic<KELResourceImplFactory>::value);
}

// --- slots: a destructor takes two --------------------------------------------------------------------

template <class Mutex>
class AfterMutex : public Mutex {
public:
    virtual void next() {}
};

template <class Mutex>
void expect_mutex_slots() {
    EXPECT_EQ(slot_of(&Mutex::v_lock), 0);
    EXPECT_EQ(slot_of(&Mutex::v_unlock), 1);
    EXPECT_EQ(slot_of(&AfterMutex<Mutex>::next), 4) << "behind the destructor";
    EXPECT_TRUE(std::has_virtual_destructor<Mutex>::value);
    EXPECT_TRUE((std::is_base_of<KELIMutex, Mutex>::value));
}

TEST(Slots, MutexesHaveLockUnlockAndDestructor) {
    expect_mutex_slots<KELIMutex>();
    expect_mutex_slots<KELMutex>();
    expect_mutex_slots<KELRMutex>();
    expect_mutex_slots<KELSpinMutex>();
    expect_mutex_slots<KELRSpinMutex>();
    EXPECT_TRUE(std::is_abstract<KELIMutex>::value);
}

TEST(Slots, LockAndUnlockAreNotVirtual) {
    EXPECT_EQ(slot_of(&KELMutex::lock), -1);
    EXPECT_EQ(slot_of(&KELMutex::unlock), -1);
    EXPECT_EQ(slot_of(&KELRMutex::lock), -1);
    EXPECT_EQ(slot_of(&KELSpinMutex::lock), -1);
    EXPECT_EQ(slot_of(&KELRSpinMutex::unlock), -1);
}

class AfterThread : public KELThread {
public:
    virtual void next() {}
};

TEST(Slots, ThreadHasDestructorRunAndBody) {
    EXPECT_TRUE(std::has_virtual_destructor<KELThread>::value);
    EXPECT_EQ(slot_of(&KELThread::run), 2);
    EXPECT_EQ(slot_of(&KELThread::begin), 3);
    EXPECT_EQ(slot_of(&AfterThread::next), 4);
    EXPECT_EQ(slot_of(&KELThread::terminate), -1);
}

class AfterThreadLocal : public KELThreadLocal {
public:
    virtual void next() {}
};

TEST(Slots, ThreadLocalHasDestructorAndFinalize) {
    EXPECT_TRUE(std::has_virtual_destructor<KELThreadLocal>::value);
    EXPECT_EQ(slot_of(&KELThreadLocal::finalize), 2);
    EXPECT_EQ(slot_of(&AfterThreadLocal::next), 3);
}

class AfterResource : public KELResource {
public:
    virtual void next() {}
};

TEST(Slots, ResourceHasUnrefDerefAndDestructor) {
    EXPECT_EQ(slot_of(&KELResource::_unref), 0);
    EXPECT_EQ(slot_of(&KELResource::_deref), 1);
    EXPECT_EQ(slot_of(&AfterResource::next), 4) << "behind the destructor";
    EXPECT_TRUE(std::has_virtual_destructor<KELResource>::value);
    EXPECT_EQ(slot_of(&KELResource::_ref), -1);
    EXPECT_EQ(slot_of(&KELResource::_num_refs), -1);
}

}  // namespace
