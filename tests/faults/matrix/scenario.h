// Scenarios: short uses of the library that the sweeps run again and again while something fails.
//
//   Scenario       prepares, acts while armed, tells its state and what it left open
//   Definition     a scenario's name and what it gives when nothing fails
//   KEL_SCENARIO   puts a scenario on the list that all sweeps share
//   scenarios      that list
//
//     class PipeIsMade : public Scenario {
//         void act() override { KELPipe pipe; }
//     };
//     KEL_SCENARIO(PipeIsMade);
//
// act() runs armed, so what it allocates itself would be failed too: it hands its result over with
// gives(), which does not allocate.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_SCENARIO_H
#define KEL_TESTS_FAULTS_MATRIX_SCENARIO_H

#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace kel {
namespace test {

class Scenario {
public:
    Scenario() = default;
    Scenario(const Scenario&) = delete;
    Scenario& operator=(const Scenario&) = delete;
    virtual ~Scenario() = default;

    // Not armed: scripts, files, objects that exist before the call under test.
    virtual void prepare() {}

    virtual void act() = 0;

    // What a failure that is thrown must leave as it was.
    virtual std::string state() { return ""; }

    // What act() left open, "" when nothing. The destructor cleans it up.
    virtual std::string left_over() { return ""; }

    const char* result() const { return _result; }

protected:
    // Keeps the result of act(); as printf.
    void gives(const char* format, ...) __attribute__((format(printf, 2, 3)));

private:
    char _result[512] = "done";
};

struct Definition {
    std::string name;
    std::string gives = "done";
    std::string shows;          // on standard output
    std::string prints;         // on standard error
    bool fresh = false;         // each run needs a process in which the library has not been used
    bool retried = false;       // act() succeeds on the same object after it has thrown
    bool pairs = true;          // two failures in one run as well, where more than a message is at stake
    void (*first)() = nullptr;  // called once in a process that runs the scenario
    std::unique_ptr<Scenario> (*make)() = nullptr;

    Definition& giving(std::string text) { return gives = std::move(text), *this; }
    Definition& showing(std::string text) { return shows = std::move(text), *this; }
    Definition& printing(std::string text) { return prints = std::move(text), *this; }
    Definition& and_retried() { return retried = true, *this; }
    Definition& without_pairs() { return pairs = false, *this; }
    Definition& after(void (*hook)()) { return first = hook, *this; }
    Definition& in_a_fresh_process() { return fresh = true, *this; }
};

// All scenarios, by name.
std::vector<const Definition*> scenarios();

// Adds to the list; the reference stays good.
Definition& list(std::string name, std::unique_ptr<Scenario> (*make)());

// KEL_SCENARIO(PipeIsMade).giving("made"); at namespace scope, behind the class.
#define KEL_SCENARIO(Class)                                                             \
    [[maybe_unused]] const ::kel::test::Definition& listed_##Class = ::kel::test::list( \
        #Class, [] { return std::unique_ptr<::kel::test::Scenario>(std::make_unique<Class>()); })

}  // namespace test
}  // namespace kel

#endif
