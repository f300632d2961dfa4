// Runs a sweep of one scenario in a process of its own and brings its figures back.
//
//   Report           what a sweep counts and complains about
//   sweep            one sweep in a child; its complaints fail the test, its figures are kept
//   register_sweeps  makes a test of every scenario
//
// The process of its own keeps what the library remembers about its machine from the next scenario,
// and names the run in which a sweep died. The figures go to a file in the folder that the environment
// variable KEL_FIGURES names, one file a test, for figures.sh to add up.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_REPORT_H
#define KEL_TESTS_FAULTS_MATRIX_REPORT_H

#include <map>
#include <set>
#include <string>

#include "tests/faults/matrix/scenario.h"

namespace kel {
namespace test {

class Report {
public:
    // Says what runs now, in case it ends the process.
    void begin(const std::string& run);

    void count(const std::string& what) { ++_counts[what]; }
    void note(const std::string& kind, const std::string& what) { _notes.insert(kind + " " + what); }
    void complain(const std::string& about, const std::string& what);

    std::string text() const;

private:
    std::map<std::string, long> _counts;
    std::set<std::string> _notes;
    std::string _complaints;
    int _complaint_count = 0;
};

typedef void (*Sweep)(const Definition& definition, Report& report);

void sweep(const Definition& definition, Sweep body);

// Keeps the figures of the test that runs.
void keep_figures(const std::string& figures);

// Tests named `suite`.<scenario>.
void register_sweeps(const char* suite, Sweep body);

}  // namespace test
}  // namespace kel

#endif
