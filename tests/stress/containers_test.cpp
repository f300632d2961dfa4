// Tables that several threads use: look-ups without a lock, and changes under the lock inside.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/core/unique_id.h>

#include <string>
#include <vector>

#include "tests/stress/together.h"

namespace kel {
namespace test {
namespace {

// 60 keys keep the table crowded. Every look-up moves the slot remembered last.
TEST(SharedDictionary, LookUpsAtOnceAnswerForTheirOwnKey) {
    std::vector<std::string> names;
    for (int i = 0; i < 60; ++i) names.push_back("name " + std::to_string(i));
    KELDictionary<KELStringWrapper, int> table;
    for (int i = 0; i < 60; ++i) table.add(KELStringWrapper(names[i].c_str()), i);
    together(crowd, [&](int thread) {
        for (int n = 0; n < 5000; ++n) {
            const int i = (n * 7 + thread * 13) % 60;
            int found = -1;
            ASSERT_EQ(table.atKey(KELStringWrapper(names[i].c_str()), found), 1);
            ASSERT_EQ(found, i);
        }
        int found = -1;
        EXPECT_EQ(table.atKey(KELStringWrapper("no such name"), found), 0);
    });
}

typedef KELDictionary_r<CORBA_String_var, CORBA_String_var> Shared;

void put_and_take(Shared& table, const std::string& name) {
    {
        KELWLock_var hold(table.rwlock());
        table.add(name.c_str(), name.c_str());
    }
    KELWLock_var hold(table.rwlock());
    table.removeKey(name.c_str());
}

void read_all(Shared& table) {
    KELRLock_var hold(table.rwlock());
    CORBA_String_var fixed;
    ASSERT_EQ(table.atKey("fixed", fixed), 1);
    ASSERT_STREQ(fixed, "here to stay");
    Shared::Iterator entries(table);
    while (const Shared::Assoc* entry = ++entries) {
        if (std::string(entry->_key.in()) == "fixed") continue;
        ASSERT_STREQ(entry->_key.in(), entry->_value.in());
    }
}

TEST(SharedDictionary, ReadersUnderItsLockSeeWholeEntries) {
    Shared table;
    table.add("fixed", "here to stay");
    together(crowd, [&table](int thread) {
        for (int n = 0; n < 300; ++n) {
            if (thread < crowd / 2) {
                put_and_take(table, std::to_string(thread) + "/" + std::to_string(n));
            } else {
                read_all(table);
            }
        }
    });
    EXPECT_EQ(table.count(), 1u);
}

// The table grows under the hands of its readers.
TEST(SharedDictionary, GrowsWhileItIsRead) {
    KELDictionary_r<KELUniqueId, int> table;
    together(crowd, [&table](int thread) {
        for (int n = 0; n < 500; ++n) {
            const KELUniqueId key(static_cast<unsigned long>(n));
            if (thread == 0) {
                KELWLock_var hold(table.rwlock());
                table.add(key, n);
            } else {
                KELRLock_var hold(table.rwlock());
                int found = n;
                table.atKey(key, found);
                ASSERT_EQ(found, n);
            }
        }
    });
    EXPECT_EQ(table.count(), 500u);
}

}  // namespace
}  // namespace test
}  // namespace kel
