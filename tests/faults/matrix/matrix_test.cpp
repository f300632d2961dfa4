// The fault matrix: every call that a scenario makes fails with every error of its row, once and from
// then on, and then together with every call that follows.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <algorithm>
#include <set>
#include <sstream>

#include "tests/faults/matrix/report.h"
#include "tests/faults/matrix/run.h"
#include "tests/faults/matrix/stated.h"

using namespace kel::test;

namespace {

typedef std::vector<CallTrace::Call> Calls;

bool same(const Calls& a, const Calls& b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [](const auto& x, const auto& y) { return x.seam == y.seam && x.nth == y.nth; });
}

// Sanitizers look through a pipe whether an address can be read, and ask for the stack of a thread that
// throws or ends the process. Such calls are not the library's, which makes pipes in one place only and
// attributes once for a thread.
bool is_of_a_sanitizer(const CallTrace::Call& call, const Definition& definition, bool is_second) {
#if defined(KEL_MATRIX_SANITIZED)
    if (call.seam == &seams::pthread_attr_init) return call.nth > 1;
    return call.seam == &seams::pipe && (is_second || definition.name != "PipeIsMade");
#else
    static_cast<void>(is_second);
    static_cast<void>(definition);
    static_cast<void>(call);
    return false;
#endif
}

class Matrix {
public:
    Matrix(const Definition& definition, Report& report) : _definition(definition), _report(report) {}

    void run() {
        if (!runs_unfaulted()) return;
        for (const CallTrace::Call& call : _usual.calls) {
            if (is_of_a_sanitizer(call, _definition, false)) continue;
            each_failure(call, [this](const Fault& fault) { one(fault); });
        }
    }

private:
    bool ends_unfaulted() const { return _definition.gives.compare(0, 5, "ends ") == 0; }

    bool runs_unfaulted() {
        Expected expectation = expected(_definition, Stated());
        if (ends_unfaulted()) expectation.way = Stated::Way::ended;
        // The first run makes what stays: pools, caches of the C library.
        if (!_definition.fresh && !ends_unfaulted()) run_here(_definition, {});
        _usual = run_as_needed(_definition, {}, ends_unfaulted());
        std::string complaints;
        compare(expectation, _usual, complaints);
        if (complaints.empty()) return true;
        _report.complain(_definition.name + ", nothing fails", complaints);
        return false;
    }

    template <class Body>
    void each_failure(const CallTrace::Call& call, Body body) {
        const FailingCall* const failing = failing_call(*call.seam);
        if (failing == nullptr) return;
        const std::vector<int> left =
            failing->left_in_errno.empty() ? std::vector<int>{-1} : failing->left_in_errno;
        for (int error : failing->errors) {
            for (int left_in_errno : left) {
                Fault fault{call.seam, call.nth, error, left_in_errno, false};
                body(fault);
                fault.from_then_on = true;
                // A process that has ended makes no call from then on.
                if (expected(_definition, {fault}).way != Stated::Way::ended) body(fault);
            }
        }
    }

    void one(const Fault& fault) {
        const Seen seen = judge({fault});
        _report.note("row", std::string(fault.seam->name()) + " " + std::to_string(fault.error));
        if (fault.from_then_on || !_definition.pairs) return;
        // A failure that changes nothing leaves every other one what it is by itself.
        if (expected(_definition, {fault}).ignored && same(seen.calls, _usual.calls)) return;
        bool later = false;
        for (const CallTrace::Call& call : seen.calls) {
            if (later && !is_of_a_sanitizer(call, _definition, true)) {
                each_failure(call, [&](const Fault& second) {
                    if (!second.from_then_on && is_worth_a_pair(second)) judge({fault, second});
                });
            }
            later = later || (call.seam == fault.seam && call.nth == fault.nth);
        }
    }

    // Whichever error ends the process, it ends it alike, and that takes a process.
    bool is_worth_a_pair(const Fault& second) const {
        const bool is_first = second.error == failing_call(*second.seam)->errors.front();
        return is_first || expected(_definition, {second}).way != Stated::Way::ended;
    }

    // One run, held against what is stated.
    Seen judge(const std::vector<Fault>& faults) {
        std::string name = _definition.name;
        for (const Fault& fault : faults) name += ", " + fault.text();
        Expected expectation = expected(_definition, faults);
        if (!expectation.known) {
            _report.complain(name, "  nothing is stated");
            return {};
        }
        for (std::size_t row : expectation.used) _report.note("used", std::to_string(row));
        if (expectation.way == Stated::Way::left_out) return {};

        _report.begin(name);
        const bool ends = expectation.way == Stated::Way::ended || ends_unfaulted();
        const Seen seen = run_as_needed(_definition, {faults}, ends);
        _report.count(faults.size() == 1 ? "runs" : "pairs");
        settle(expectation, seen.recursive);
        std::string complaints;
        compare(expectation, seen, complaints);
        const bool comparable = _definition.fresh && !ends && !expectation.other_afterwards;
        if (comparable && seen.blocks != _usual.blocks) {
            complaints += "  " + std::to_string(seen.blocks - _usual.blocks) + " blocks more than usual\n";
        }
        if (!complaints.empty()) _report.complain(name, complaints);
        return seen;
    }

    const Definition& _definition;
    Report& _report;
    Seen _usual;
};

// --- the tables ------------------------------------------------------------------------------------

// What is wrong with the names and numbers of a row; "" when nothing is.
std::string slip_in(const std::string& scenario_names, const std::string& calls,
                    const std::vector<int>& errors) {
    const std::vector<const Definition*> all = scenarios();
    std::istringstream words(scenario_names);
    for (std::string name; words >> name;) {
        const bool known = std::any_of(all.begin(), all.end(),
                                       [&](const Definition* each) { return names(name, each->name); });
        if (!known) return "no scenario is called " + name;
    }
    std::set<int> possible;
    words = std::istringstream(calls);
    for (std::string call; words >> call;) {
        const FailingCall* const failing = failing_call(call);
        if (failing == nullptr) return call + " is no call that fails";
        possible.insert(failing->errors.begin(), failing->errors.end());
    }
    for (int error : errors) {
        if (possible.count(error) == 0) return calls + " do not fail with " + std::to_string(error);
    }
    return "";
}

// A row that names nothing would never be asked.
TEST(OutcomeTables, NameScenariosCallsAndErrorsThatThereAre) {
    std::ostringstream stated;
    std::size_t number = 0;
    for (const Row& row : rows()) {
        EXPECT_EQ(slip_in(row.scenarios, row.calls, row.errors), "") << row.scenarios << ": " << row.calls;
        stated << "stated " << number++ << ' ' << row.scenarios << ": " << row.calls << '\n';
    }
    for (const PairRow& row : pair_rows()) {
        EXPECT_EQ(slip_in(row.scenarios, row.first, row.first_errors), "")
            << row.scenarios << ": " << row.first;
        EXPECT_EQ(slip_in(row.scenarios, row.second, row.second_errors), "")
            << row.scenarios << ": " << row.second;
        stated << "stated " << number++ << ' ' << row.scenarios << ": " << row.first << ", then "
               << row.second << '\n';
    }
    keep_figures(stated.str());
}

void run_matrix(const Definition& definition, Report& report) {
    Matrix(definition, report).run();
    report.count("scenarios");
}

}  // namespace

// The list of scenarios is whole only when main() runs.
int main(int argc, char** argv) {
    ::testing::InitGoogleTest(&argc, argv);
    register_sweeps("FaultMatrix", run_matrix);
    return RUN_ALL_TESTS();
}
