// The argument list as a class: its virtual operations, its store and the lock in it.
//
// SPDX-License-Identifier: MIT
#include <kel/services/arg_list.h>

#include <cstring>
#include <set>
#include <type_traits>
#include <vector>

#include "tests/support/fault.h"

namespace {

using namespace kel::test;

typedef KELDictionary_r<CORBA_String_var, CORBA_String_var> Store;

// --- the class ---------------------------------------------------------------------------------------

struct Recorder : KELArgList {
    unsigned char getArg(const char*) override { return 7; }
    char* getArgValue(const char*) override { return nullptr; }
    unsigned long getArgCount() override { return 8; }
    void argInit(int& argc, char* const*, const char*) override { argc = 9; }
};

TEST(ArgListClass, ItsOperationsAreVirtual) {
    Recorder recorder;
    KELArgList& base = recorder;
    int argc = 0;
    base.argInit(argc, nullptr, nullptr);
    EXPECT_EQ(argc, 9);
    EXPECT_EQ(base.getArg(""), 7);
    EXPECT_EQ(base.getArgCount(), 8u);
    static_assert(std::has_virtual_destructor<KELArgList>::value, "");
}

// The slot of a virtual operation, counted from 0: in this ABI a pointer to a virtual member holds one
// plus the distance of its slot from the start of the table.
template <class Member>
unsigned long slot_of(Member member) {
    std::uintptr_t word;
    std::memcpy(&word, &member, sizeof word);
    EXPECT_EQ(word & 1, 1u) << "not virtual";
    return (word - 1) / sizeof(void*);
}

TEST(ArgListClass, ItsQuestionsFollowTheTwoDestructorsInTheVirtualTable) {
    EXPECT_EQ(slot_of(&KELArgList::getArg), 2u);
    EXPECT_EQ(slot_of(&KELArgList::getArgValue), 3u);
    EXPECT_EQ(slot_of(&KELArgList::getArgCount), 4u);
    EXPECT_EQ(slot_of(&KELArgList::argInit), 5u);
}

TEST(ArgListClass, StoringIsNotVirtual) {
    void (KELArgList::*const member)(const char*, const char*) = &KELArgList::putArgValue;
    std::uintptr_t word;
    std::memcpy(&word, &member, sizeof word);
    EXPECT_EQ(word & 1, 0u);
}

TEST(ArgListClass, HasNothingButItsStore) {
    struct Model {
        void* virtual_table;
        Store store;
    };
    EXPECT_EQ(sizeof(KELArgList), sizeof(Model));
}

// --- the lock ----------------------------------------------------------------------------------------

class ArgListLock : public FaultTest {
protected:
    typedef std::vector<int> States;

    // What the lock's state is at each release of the mutex inside it while `body` runs: 1 for a
    // reader, -1 for a writer, 0 for free.
    template <class Body>
    States states_during(Body body) {
        States states;
        mutexes.clear();
        seams::pthread_mutex_unlock.script([&](pthread_mutex_t* m) {
            states.push_back(state());
            mutexes.insert(m);
            return seams::pthread_mutex_unlock.real(m);
        });
        {
            Armed armed;
            body();
        }
        seams::pthread_mutex_unlock.reset();
        return states;
    }

    int state() KEL_NO_THREAD_SAFETY_ANALYSIS {
        return reinterpret_cast<Store*>(reinterpret_cast<char*>(&list) + sizeof(void*))->rwlock()._state;
    }

    KELArgList list;
    std::set<pthread_mutex_t*> mutexes;
};

TEST_F(ArgListLock, IsHeldForReadingByEveryQuestion) {
    list.putArgValue("name", "value");
    char* value = nullptr;
    EXPECT_EQ(states_during([&] { list.getArg("name"); }), (States{1, 0}));
    EXPECT_EQ(states_during([&] { value = list.getArgValue("name"); }), (States{1, 0}));
    EXPECT_EQ(states_during([&] { list.getArgCount(); }), (States{1, 0}));
    CORBA::string_free(value);
}

TEST_F(ArgListLock, IsHeldForReadingByAQuestionWithoutAnAnswerToo) {
    EXPECT_EQ(states_during([&] { list.getArg("name"); }), (States{1, 0}));
    EXPECT_EQ(states_during([&] { list.getArgValue("name"); }), (States{1, 0}));
}

TEST_F(ArgListLock, IsHeldForWritingToStore) {
    EXPECT_EQ(states_during([&] { list.putArgValue("name", "new"); }), (States{-1, 0}));
    EXPECT_EQ(states_during([&] { list.putArgValue("name", "again"); }), (States{-1, 0}));
}

TEST_F(ArgListLock, IsHeldForWritingForEachOptionTakenOut) {
    char program[] = "prog", option[] = "-Pxa", value[] = "1", other[] = "-Pxb";
    char* argv[] = {program, option, value, other};
    int argc = 4;
    EXPECT_EQ(states_during([&] { list.argInit(argc, argv, "-Px"); }), (States{-1, 0, -1, 0}));
}

TEST_F(ArgListLock, IsTheOnlyOne) {
    states_during([&] {
        list.putArgValue("name", "value");
        list.getArg("name");
        list.getArgCount();
    });
    EXPECT_EQ(mutexes.size(), 1u);
}

}  // namespace
