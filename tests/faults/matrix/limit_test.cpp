// Memory that runs out for real: a process with 64 MiB of address space, all of it taken.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/exceptions/exception.h>
#include <sys/resource.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <new>
#include <string>

#include "tests/faults/matrix/report.h"
#include "tests/faults/matrix/scenario.h"
#include "tests/faults/matrix/stated.h"
#include "tests/faults/matrix/text.h"
#include "tests/support/child.h"

using namespace kel::test;

namespace {

// Scenarios that neither script a call nor talk to the system: nothing but memory can fail here.
const char* const of_memory_only =
    "Dictionary* LargeDictionary LockedDictionary String* WideString* Holder* WideHolder* OutParameter* "
    "Exception* "
    "UserException* UnknownException* Description* EnvironmentHoldsACopy OutputOf* InputOf* TableIs* "
    "OutputTables* InputTables* TablesAreReset Option* LogIsNamed FullPoller* GrowingPoller* FirstReference "
    "CountIsReset ObjectDeletesItself ObjectOfThisThread SecondObjectOfThisThread ManyObjectsOfThisThread "
    "Environment";

// Takes all the memory there is, down to the smallest block. The blocks hold the list of themselves.
class AllMemory {
public:
    void take() {
        for (std::size_t size = 1 << 20; size >= sizeof(Block); size /= 2) {
            while (void* const memory = std::malloc(size)) _last = new (memory) Block{_last};
        }
    }
    void give_back() {
        while (_last != nullptr) {
            Block* const block = _last;
            _last = block->next;
            std::free(block);
        }
    }

private:
    struct Block {
        Block* next;
    };
    Block* _last = nullptr;
};

void note_outcome(Scenario& scenario, Text& outcome) {
    try {
        scenario.act();
        outcome.add("%s", scenario.result());
    } catch (const std::bad_alloc&) {
        outcome.add("throws bad_alloc");
    } catch (const CORBA_Exception& e) {
        outcome.add("throws %s", e._name());
    }
}

bool begins_with(const std::string& text, const std::string& piece) {
    return text.compare(0, piece.size(), piece) == 0;
}

// As usual, or as is stated for an allocation that fails.
bool is_stated(const Definition& definition, const std::string& outcome) {
    if (begins_with(definition.gives, outcome)) return true;
    for (const MemoryRow& row : memory_rows()) {
        if (!names(row.scenarios, definition.name)) continue;
        for (const Stated& stated : row.stated) {
            if (outcome == stated.outcome) return true;
        }
        if (!row.of_the_c_library) return false;
    }
    return false;
}

// "" when all is well.
std::string starve(const Definition& definition, long& starved) {
    Text outcome, usual;
    std::string before, after;
    {
        const std::unique_ptr<Scenario> scenario = definition.make();
        scenario->prepare();
        before = scenario->state();
        AllMemory all;
        all.take();
        note_outcome(*scenario, outcome);
        all.give_back();
        after = scenario->state();
    }
    const bool failed = outcome.str() == "throws bad_alloc";
    starved += failed;
    if (!is_stated(definition, outcome.str())) return "gave " + outcome.str();
    if (failed && before != after) return "was " + before + " and is " + after;
    const std::unique_ptr<Scenario> again = definition.make();
    again->prepare();
    note_outcome(*again, usual);
    return begins_with(definition.gives, usual.str()) ? "" : "gave " + usual.str() + " with memory again";
}

const rlim_t limit = 64 << 20;

void run_out_of_memory() {
    const rlimit both = {limit, limit};
    if (::setrlimit(RLIMIT_AS, &both) != 0) std::abort();
    long runs = 0;
    long starved = 0;
    for (const Definition* definition : scenarios()) {
        const bool writes = !definition->shows.empty() || !definition->prints.empty();
        if (writes || !names(of_memory_only, definition->name)) continue;
        ++runs;
        const std::string complaint = starve(*definition, starved);
        if (!complaint.empty()) std::cout << definition->name << " " << complaint << "\n";
    }
    // Some need no memory, or find a block that they have freed themselves.
    if (starved < runs / 2) std::cout << "memory did not run out\n";
    std::cout << "count starved " << starved << "\n";
}

bool fits_below_the_limit() {
    long pages = 0;
    std::ifstream("/proc/self/statm") >> pages;
    return static_cast<rlim_t>(pages) * 4096 < limit * 3 / 4;
}

TEST(MemoryLimit, HoldsForAllScenariosOfMemory) {
    if (!fits_below_the_limit())
        GTEST_SKIP() << "the tool that runs this test needs the address space itself";
    const Outcome outcome = in_child(run_out_of_memory);
    EXPECT_TRUE(begins_with(outcome.out, "count starved ")) << outcome.out << outcome.err;
    EXPECT_EQ(outcome.exit_code, 0);
    keep_figures(outcome.out);
}

}  // namespace
