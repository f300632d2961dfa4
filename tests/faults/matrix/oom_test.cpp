// The allocation sweep: every allocation that a scenario makes fails, once and from then on.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include "tests/faults/matrix/memory.h"
#include "tests/faults/matrix/report.h"
#include "tests/faults/matrix/run.h"
#include "tests/faults/matrix/stated.h"

using namespace kel::test;

namespace {

class MemorySweep {
public:
    MemorySweep(const Definition& definition, Report& report) : _definition(definition), _report(report) {}

    void run() {
        // The first runs make what stays: pools, caches of the C library.
        if (!_definition.fresh && !_may_end) run_here(_definition, {});
        _usual = run_as_needed(_definition, {}, _may_end);
        const long enough = 10000;
        for (_nth = 1; _nth < enough; ++_nth) {
            if (!fails(false)) return;
            fails(true);
        }
        _report.complain(_definition.name, "  there is always one more allocation");
    }

private:
    // False when there is no such allocation.
    bool fails(bool from_then_on) {
        const std::string name = _definition.name + ", allocation " + std::to_string(_nth) + " fails " +
                                 (from_then_on ? "for ever" : "once");
        _report.begin(name);
        const long nth = _nth;
        const Plan plan = {{}, [nth, from_then_on] { Memory::fail(nth, from_then_on); }, Memory::stop};
        const Seen seen = run_as_needed(_definition, plan, _may_end);
        if (seen.counted < _nth) return false;
        _report.count(from_then_on ? "for_ever" : "points");
        judge(name, seen);
        return true;
    }

    void judge(const std::string& name, const Seen& seen) {
        std::string complaints;
        for (const MemoryRow& row : memory_rows()) {
            if (row.of_the_c_library && !Memory::of_the_c_library) continue;
            if (!names(row.scenarios, _definition.name)) continue;
            for (const Stated& stated : row.stated) {
                complaints.clear();
                compare(stated, seen, complaints);
                if (complaints.empty()) return;
            }
            break;
        }
        _report.complain(name, complaints);
    }

    void compare(const Stated& stated, const Seen& seen, std::string& complaints) {
        const Expected expectation = expected(_definition, stated);
        kel::test::compare(expectation, seen, complaints);
        if (_definition.fresh && !expectation.other_afterwards && seen.blocks != _usual.blocks) {
            complaints += "  " + std::to_string(seen.blocks - _usual.blocks) + " blocks more than usual\n";
        }
    }

    const Definition& _definition;
    Report& _report;
    const bool _may_end = _definition.gives.compare(0, 5, "ends ") == 0;
    Seen _usual;
    long _nth = 0;
};

void sweep_memory(const Definition& definition, Report& report) {
    MemorySweep(definition, report).run();
    report.count("scenarios");
}

}  // namespace

// The list of scenarios is whole only when main() runs.
int main(int argc, char** argv) {
    ::testing::InitGoogleTest(&argc, argv);
    register_sweeps(Memory::suite, sweep_memory);
    return RUN_ALL_TESTS();
}
