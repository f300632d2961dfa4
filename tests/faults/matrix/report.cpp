// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/report.h"

#include <gtest/gtest.h>
#include <sys/mman.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <sstream>

#include "tests/faults/matrix/run.h"
#include "tests/support/child.h"

namespace kel {
namespace test {

namespace {

const std::size_t page = 4096;

// Shared with the children, so that it tells what ran when one of them died.
char* current_run() {
    static void* const shared =
        ::mmap(nullptr, page, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    return static_cast<char*>(shared);
}

class SweepTest : public ::testing::Test {
public:
    SweepTest(const Definition& definition, Sweep body) : _definition(definition), _body(body) {}
    void TestBody() override { sweep(_definition, _body); }

private:
    const Definition& _definition;
    Sweep _body;
};

}  // namespace

void keep_figures(const std::string& figures) {
    const char* const folder = std::getenv("KEL_FIGURES");
    if (folder == nullptr) return;
    const ::testing::TestInfo* const test = ::testing::UnitTest::GetInstance()->current_test_info();
    const std::string path = std::string(folder) + "/" + test->test_suite_name() + "." + test->name();
    std::ofstream(path) << figures;
}

void Report::begin(const std::string& run) { std::snprintf(current_run(), page, "%s", run.c_str()); }

void Report::complain(const std::string& about, const std::string& what) {
    const int enough = 40;
    if (++_complaint_count > enough) return;
    _complaints += about + ":\n" + what + "\n";
}

std::string Report::text() const {
    std::ostringstream out;
    for (const auto& entry : _counts) out << "count " << entry.first << ' ' << entry.second << '\n';
    for (const std::string& note : _notes) out << note << '\n';
    out << "complaints " << _complaint_count << '\n' << _complaints;
    return out.str();
}

void sweep(const Definition& definition, Sweep body) {
    current_run()[0] = '\0';
    const Outcome outcome = in_child([&] {
        Report report;
        report.begin("the first run");
        warm_up();
        if (definition.first != nullptr) definition.first();
        body(definition, report);
        std::cout << report.text();
    });
    const std::size_t end = outcome.out.find("complaints ");
    if (outcome.exit_code != 0 || end == std::string::npos) {
        FAIL() << "died of signal " << outcome.signal << ", exit code " << outcome.exit_code << " in "
               << current_run() << "\n"
               << outcome.err << outcome.out;
    }
    keep_figures(outcome.out.substr(0, end));
    const std::string complaints = outcome.out.substr(end) + outcome.err;
    EXPECT_TRUE(complaints == "complaints 0\n") << complaints;
}

void register_sweeps(const char* suite, Sweep body) {
    for (const Definition* definition : scenarios()) {
        ::testing::RegisterTest(suite, definition->name.c_str(), nullptr, nullptr, __FILE__, __LINE__,
                                [definition, body] { return new SweepTest(*definition, body); });
    }
}

}  // namespace test
}  // namespace kel
