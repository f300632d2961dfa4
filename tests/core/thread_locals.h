// Per-thread objects for tests.
//
//   draw_slot            a slot that no other kind has
//   Local                runs a function when it is finalised, then deletes itself
//   Survivor             counts how often it is finalised and stays alive
//   ThreadLocalFixture   leaves the calling thread without a table
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CORE_THREAD_LOCALS_H
#define KEL_TESTS_CORE_THREAD_LOCALS_H

#include <kel/containers/dictionary.h>
#include <kel/core/thread_local.h>
#include <kel/core/unique_id.h>

#include <functional>
#include <thread>
#include <utility>
#include <vector>

#include "tests/support/fault.h"

namespace kel {
namespace test {

inline unsigned long draw_slot() {
    KELRMutex_var hold(KELThreadLocal::_mutex, 1);
    return KELThreadLocal::_cnt++;
}

// Runs `at_the_end` when it is finalised, then deletes itself as the base does.
class Local : public KELThreadLocal {
public:
    explicit Local(unsigned long slot) : Local(slot, [] {}) {}
    Local(unsigned long slot, std::function<void()> at_the_end)
        : KELThreadLocal(slot), _at_the_end(std::move(at_the_end)) {}

    void finalize() override {
        _at_the_end();
        KELThreadLocal::finalize();
    }

private:
    std::function<void()> _at_the_end;
};

// Stays alive when it is finalised.
class Survivor : public KELThreadLocal {
public:
    explicit Survivor(unsigned long slot) : KELThreadLocal(slot) {}
    void finalize() override { ++finalized; }
    int finalized = 0;
};

// Each test leaves this thread without a table.
class ThreadLocalFixture : public FaultTest {
protected:
    void TearDown() override {
        KELThreadLocal::_exit_thread(nullptr);
        FaultTest::TearDown();
    }

    static KELThreadLocal::SlotTable* table_of(pthread_t thread) {
        KELRMutex_var hold(KELThreadLocal::_mutex, 1);
        KELThreadLocal::SlotTable* table = nullptr;
        KELThreadLocal::_dict_instance()->atKey(KELThreadId(thread), table);
        return table;
    }
    static KELThreadLocal::SlotTable* my_table() { return table_of(pthread_self()); }

    // The values that are given to the key of the calling thread. Nothing is expected here: a failure
    // makes GoogleTest set a key of its own, under a lock that it does not take twice.
    void record_key_values() {
        seams::pthread_setspecific.script([this](pthread_key_t key, const void* value) {
            if (key == KELThreadLocal::_key) key_values.push_back(value);
            return seams::pthread_setspecific.real(key, value);
        });
    }

    // The slots in the order in which a slot table holds them.
    static std::vector<unsigned long> in_table_order(const std::vector<unsigned long>& slots) {
        KELDictionary<KELUniqueId, int> table;
        for (unsigned long slot : slots) table.add(KELUniqueId(slot), 0);
        std::vector<unsigned long> ordered;
        KELDictionary<KELUniqueId, int>::Iterator entries(table);
        while (const auto* entry = ++entries) ordered.push_back(entry->_key.value());
        return ordered;
    }

    static void in_another_thread(const std::function<void()>& body) { std::thread(body).join(); }

    const unsigned long slot = draw_slot();
    std::vector<const void*> key_values;
};

}  // namespace test
}  // namespace kel

#endif
