// What a failure is stated to come to: the tables that the sweeps hold the library against.
//
//   Stated     what is given, thrown or printed, or how the process ends
//   Row        a failing call in some scenarios and what is stated for it
//   PairRow    the same for two failing calls of one run
//   MemoryRow  the same for an allocation that fails
//   stated     the statement for a run; none when no row fits
//
//     {"PipeIs*", "pipe", {}, any, throws("NO_RESOURCES")},
//
// Texts may hold {error}, the error; {text}, the text of errno after the failure; {minor}, errno as a
// minor code; {code}, the error as a minor code; {class} and {unlock}, of the mutex that failed.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_STATED_H
#define KEL_TESTS_FAULTS_MATRIX_STATED_H

#include <optional>
#include <string>
#include <vector>

#include "tests/faults/matrix/run.h"

namespace kel {
namespace test {

struct Stated {
    enum class Way { as_unfaulted, given, thrown, ended, left_out };

    Way way = Way::as_unfaulted;
    std::string outcome;
    std::optional<std::string> shown_text;    // not said: as unfaulted where the outcome is, else nothing
    std::optional<std::string> printed_text;  // the same
    std::string left_text;                    // what act() leaves open
    std::optional<std::string> again;         // not said: the next run gives what is given unfaulted
    std::string printed_first;                // what comes out before the process ends
    bool may_stop = false;                    // what is printed may end early

    Stated shows(std::string text) const { return with(&Stated::shown_text, std::move(text)); }
    Stated prints(std::string text) const { return with(&Stated::printed_text, std::move(text)); }
    Stated afterwards(std::string text) const { return with(&Stated::again, std::move(text)); }
    Stated after_printing(std::string text) const {
        Stated other = *this;
        other.printed_first = std::move(text);
        return other;
    }
    Stated cut_short() const {
        Stated other = *this;
        other.may_stop = true;
        return other;
    }
    Stated leaves(std::string text) const {
        Stated other = *this;
        other.left_text = std::move(text);
        return other;
    }

private:
    Stated with(std::optional<std::string> Stated::*field, std::string text) const {
        Stated other = *this;
        other.*field = std::move(text);
        return other;
    }
};

Stated ignored();
Stated gives(std::string text);
// `standard` is the name behind "CORBA::".
Stated throws(const std::string& standard, const std::string& minor = "{minor}",
              const std::string& status = "NO", const std::string& reason = "");
Stated out_of_memory();
// The four pieces of the assertion, the line apart, and the call that perror names.
Stated ends(const std::string& call, const std::string& expression, const std::string& function);
// Not run; `why` names the test that pins the case.
Stated left_out(const std::string& why);

// Which of its calls fails, and whether once or from then on.
struct Which {
    enum class Times { either, once, for_ever };

    long first = 1;
    long last = 1000000;
    Times times = Times::either;
    bool fits(const Fault& fault) const;
};

extern const Which any, once, for_ever;
Which nth(long n);
Which from(long n);
Which nth_once(long n);
Which nth_for_ever(long n);
Which up_to_for_ever(long n);

// `scenarios` are names or, with a star behind them, beginnings of names. No errors: all of the call.
struct Row {
    std::string scenarios;
    std::string calls;
    std::vector<int> errors;
    Which which;
    Stated stated;
};

enum class Taken { own, as_the_first, as_the_second };

struct PairRow {
    std::string scenarios;
    std::string first;
    std::vector<int> first_errors;
    std::string second;
    std::vector<int> second_errors;
    Taken taken;
    Stated stated = {};   // with `own`
    long second_nth = 0;  // 0: any call of the second
};

struct MemoryRow {
    std::string scenarios;
    std::vector<Stated> stated;     // any of them
    bool of_the_c_library = false;  // only where the C library's own allocations fail
};

std::vector<MemoryRow> memory_rows();

// The tables, each beside the others of its kind.
std::vector<Row> thread_rows();
std::vector<Row> process_rows();
std::vector<Row> address_rows();
std::vector<Row> socket_rows();
std::vector<Row> service_rows();
std::vector<Row> general_rows();  // of calls that nobody looks at; the last table
std::vector<PairRow> process_pair_rows();
std::vector<PairRow> address_pair_rows();
std::vector<PairRow> socket_pair_rows();
std::vector<PairRow> service_pair_rows();

// All rows; the first that fits counts.
const std::vector<Row>& rows();
const std::vector<PairRow>& pair_rows();

// Whether `names`, as a row has them, name this scenario.
bool names(const std::string& names, const std::string& scenario);

// What a run must come to, in full.
struct Expected {
    bool known = false;    // a row says so
    bool ignored = false;  // nothing is different, but that the output may be cut short
    bool may_stop = false;
    bool other_afterwards = false;  // the next run gives something else than usual
    Stated::Way way = Stated::Way::as_unfaulted;
    std::string outcome, shown, printed_first, printed, left, again;
    std::vector<std::size_t> used;  // the rows that said so: of rows(), and behind them of pair_rows()
};

// For one fault or two. A text about the mutex that failed is settled afterwards.
Expected expected(const Definition& definition, const std::vector<Fault>& faults);
Expected expected(const Definition& definition, const Stated& stated);
void settle(Expected& expectation, bool recursive);

// Adds a line to `complaints` for everything that is not as it must be.
void compare(const Expected& expectation, const Seen& seen, std::string& complaints);

}  // namespace test
}  // namespace kel

#endif
