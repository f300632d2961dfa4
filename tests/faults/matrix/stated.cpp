// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/stated.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <sstream>

namespace kel {
namespace test {

namespace {

using Way = Stated::Way;

Stated stated(Way way, std::string outcome) {
    Stated made;
    made.way = way;
    made.outcome = std::move(outcome);
    return made;
}

// Minor codes up to 4095 are placed in the OMG's set.
std::string minor_code(int number) {
    const auto bits = static_cast<unsigned>(number);
    char text[16];
    std::snprintf(text, sizeof text, "0x%x", bits <= 0xfff ? bits | 0x4f4d0000u : bits);
    return text;
}

void replace_all(std::string& text, const std::string& piece, const std::string& by) {
    for (std::size_t at = text.find(piece); at != std::string::npos; at = text.find(piece, at + by.size())) {
        text.replace(at, piece.size(), by);
    }
}

std::string filled_in(std::string text, const Fault& fault) {
    replace_all(text, "{error}", std::to_string(fault.error));
    replace_all(text, "{code}", minor_code(fault.error));
    replace_all(text, "{minor}", minor_code(fault.errno_after()));
    replace_all(text, "{text}", std::strerror(fault.errno_after()));
    return text;
}

bool has(const std::vector<int>& errors, int error) {
    return errors.empty() || std::find(errors.begin(), errors.end(), error) != errors.end();
}

bool is_one_of(const std::string& words, const std::string& word) {
    std::istringstream in(words);
    for (std::string candidate; in >> candidate;) {
        if (candidate == word) return true;
    }
    return false;
}

bool fits(const Row& row, const Definition& definition, const Fault& fault) {
    return is_one_of(row.calls, fault.seam->name()) && has(row.errors, fault.error) &&
           row.which.fits(fault) && names(row.scenarios, definition.name);
}

bool fits(const PairRow& row, const Definition& definition, const Fault& first, const Fault& second) {
    return is_one_of(row.first, first.seam->name()) && has(row.first_errors, first.error) &&
           is_one_of(row.second, second.seam->name()) && has(row.second_errors, second.error) &&
           (row.second_nth == 0 || row.second_nth == second.nth) && names(row.scenarios, definition.name);
}

Expected of_one(const Definition& definition, const Fault& fault) {
    for (std::size_t i = 0; i < rows().size(); ++i) {
        if (!fits(rows()[i], definition, fault)) continue;
        Expected found = expected(definition, rows()[i].stated);
        for (std::string* text : {&found.outcome, &found.shown, &found.printed, &found.again}) {
            *text = filled_in(*text, fault);
        }
        found.used = {i};
        return found;
    }
    return {};
}

// Without a row of its own a pair follows from its two: what is ignored leaves the other, and a process
// that ends has ended, after what the first made it print.
Expected combined(const Expected& first, const Expected& second) {
    if (!first.known || !second.known) return {};
    if (second.way == Way::left_out || (first.ignored && !first.may_stop)) return second;
    if (!first.ignored && !second.ignored && second.way != Way::ended) return {};
    Expected both = second.ignored ? first : second;
    if (!second.ignored && !first.ignored) both.printed_first = first.printed + second.printed_first;
    both.may_stop = first.may_stop || second.may_stop;
    return both;
}

Expected of_two(const Definition& definition, const Fault& first, const Fault& second) {
    const Expected by_first = of_one(definition, first);
    const Expected by_second = of_one(definition, second);
    for (std::size_t i = 0; i < pair_rows().size(); ++i) {
        const PairRow& row = pair_rows()[i];
        if (!fits(row, definition, first, second)) continue;
        Expected found = row.taken == Taken::as_the_first ? by_first : by_second;
        if (row.taken == Taken::own) {
            found = expected(definition, row.stated);
            for (std::string* text : {&found.outcome, &found.printed}) *text = filled_in(*text, second);
        }
        found.used.push_back(rows().size() + i);
        return found;
    }
    return combined(by_first, by_second);
}

void compare(const char* what, const std::string& must, const std::string& is, std::string& complaints) {
    if (must != is) complaints += std::string("  ") + what + ": \"" + is + "\" and not \"" + must + "\"\n";
}

}  // namespace

const Which any = {};
const Which once = {1, 1000000, Which::Times::once};
const Which for_ever = {1, 1000000, Which::Times::for_ever};
Which nth(long n) { return {n, n, Which::Times::either}; }
Which from(long n) { return {n, 1000000, Which::Times::either}; }
Which nth_once(long n) { return {n, n, Which::Times::once}; }
Which nth_for_ever(long n) { return {n, n, Which::Times::for_ever}; }
Which up_to_for_ever(long n) { return {1, n, Which::Times::for_ever}; }

bool Which::fits(const Fault& fault) const {
    if (fault.nth < first || fault.nth > last) return false;
    return times == Times::either || (times == Times::for_ever) == fault.from_then_on;
}

Stated ignored() { return {}; }
Stated gives(std::string text) { return stated(Way::given, std::move(text)); }
Stated out_of_memory() { return stated(Way::thrown, "throws bad_alloc"); }
Stated left_out(const std::string& why) { return stated(Way::left_out, why); }

Stated throws(const std::string& standard, const std::string& minor, const std::string& status,
              const std::string& reason) {
    return stated(Way::thrown, "throws CORBA::" + standard + " " + minor + " " + status +
                                   (reason.empty() ? "" : ": " + reason));
}

Stated ends(const std::string& call, const std::string& expression, const std::string& function) {
    return stated(Way::ended, "ends " + expression + ", vthread, " + function).prints(call + ": {text}\n");
}

bool names(const std::string& names, const std::string& scenario) {
    std::istringstream in(names);
    for (std::string name; in >> name;) {
        if (name.back() == '*' ? scenario.compare(0, name.size() - 1, name, 0, name.size() - 1) == 0
                               : scenario == name) {
            return true;
        }
    }
    return false;
}

const std::vector<Row>& rows() {
    static const std::vector<Row> all = [] {
        std::vector<Row> joined;
        for (const auto& part :
             {process_rows(), address_rows(), socket_rows(), service_rows(), thread_rows(), general_rows()}) {
            joined.insert(joined.end(), part.begin(), part.end());
        }
        return joined;
    }();
    return all;
}

const std::vector<PairRow>& pair_rows() {
    static const std::vector<PairRow> all = [] {
        std::vector<PairRow> joined;
        for (const auto& part :
             {process_pair_rows(), address_pair_rows(), socket_pair_rows(), service_pair_rows()}) {
            joined.insert(joined.end(), part.begin(), part.end());
        }
        return joined;
    }();
    return all;
}

Expected expected(const Definition& definition, const Stated& stated) {
    Expected full;
    full.known = true;
    full.way = stated.way;
    const bool same = stated.way == Way::as_unfaulted;
    full.outcome = same ? definition.gives : stated.outcome;
    full.shown = stated.shown_text.value_or(same ? definition.shows : "");
    full.printed = stated.printed_text.value_or(same ? definition.prints : "");
    full.printed_first = stated.printed_first;
    full.left = stated.left_text;
    full.ignored = same && !stated.shown_text && !stated.printed_text && full.left.empty() && !stated.again;
    full.again = stated.again.value_or(definition.gives);
    full.other_afterwards = stated.again.has_value();
    full.may_stop = stated.may_stop;
    return full;
}

Expected expected(const Definition& definition, const std::vector<Fault>& faults) {
    if (faults.size() == 1) return of_one(definition, faults[0]);
    return of_two(definition, faults[0], faults[1]);
}

void settle(Expected& expectation, bool recursive) {
    for (std::string* text : {&expectation.outcome, &expectation.printed}) {
        replace_all(*text, "{class}", recursive ? "KELRMutex" : "KELMutex");
        replace_all(*text, "{unlock}", recursive ? "pthread_mutex_unlock" : "pthread_mutex_lock");
    }
}

void compare(const Expected& expectation, const Seen& seen, std::string& complaints) {
    compare("outcome", expectation.outcome, seen.outcome, complaints);
    std::string shown = expectation.shown;
    std::string printed = expectation.printed_first + expectation.printed;
    if (expectation.may_stop) {
        shown = shown.substr(0, seen.shown.size());
        printed = printed.substr(0, seen.printed.size());
    }
    compare("standard output", shown, seen.shown, complaints);
    compare("standard error", printed, seen.printed, complaints);
    if (expectation.way == Way::ended) return;
    compare("left", expectation.left, seen.left, complaints);
    compare("the next run", expectation.again, seen.again, complaints);
    if (expectation.way == Way::thrown) compare("state", seen.before, seen.after, complaints);
    if (!seen.problems.empty()) complaints += "  " + seen.problems;
}

}  // namespace test
}  // namespace kel
