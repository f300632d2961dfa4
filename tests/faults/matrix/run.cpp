// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/run.h"

#include <kel/exceptions/standard.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <new>
#include <optional>
#include <sstream>

#include "tests/faults/matrix/watch.h"
#include "tests/support/child.h"

namespace kel {
namespace test {

namespace {

// What one run notes down. In static storage, so that noting changes no count of blocks.
struct Notes {
    Text outcome, shown, printed, left, before, after, problems;
    bool recursive;
    long blocks, system_blocks, counted;

    void clear() {
        for (Text* text : {&outcome, &shown, &printed, &left, &before, &after, &problems}) text->clear();
        recursive = false;
        blocks = system_blocks = counted = 0;
    }
};

Notes notes;

bool in_its_own_process = false;

const char* completion_text(CORBA::CompletionStatus status) {
    if (status == CORBA::COMPLETED_YES) return "YES";
    return status == CORBA::COMPLETED_NO ? "NO" : "MAYBE";
}

void note_system_exception(const CORBA_SystemException& e, Text& outcome) {
    outcome.add("throws %s 0x%lx %s", e._name(), e.minor(), completion_text(e.completed()));
    const char* const reason = e.reason();
    if (reason != nullptr && *reason != '\0') outcome.add(": %s", reason);
}

void act(Scenario& scenario, Text& outcome) {
    try {
        const Armed armed;
        scenario.act();
        outcome.add("%s", scenario.result());
    } catch (const CORBA_SystemException& e) {
        note_system_exception(e, outcome);
    } catch (const CORBA_Exception& e) {
        outcome.add("throws %s", e._name());
    } catch (const std::bad_alloc&) {
        outcome.add("throws bad_alloc");
    } catch (const std::exception& e) {
        outcome.add("throws %s", e.what());
    }
}

bool begins_with(const std::string& text, const std::string& piece) {
    return text.compare(0, piece.size(), piece) == 0;
}

std::string packed(const Seen& seen) {
    std::ostringstream out;
    for (const std::string* text : {&seen.outcome, &seen.shown, &seen.printed, &seen.left, &seen.before,
                                    &seen.after, &seen.problems, &seen.again}) {
        out << text->size() << ' ' << *text;
    }
    out << seen.recursive;
    for (long number : {seen.blocks, seen.system_blocks, seen.counted}) out << ' ' << number;
    out << ' ' << seen.calls.size();
    for (const CallTrace::Call& call : seen.calls) {
        out << ' ' << reinterpret_cast<std::uintptr_t>(call.seam) << ' ' << call.nth;
    }
    return out.str();
}

void write_packed(const Seen& seen) {
    const std::string report = packed(seen);
    std::fwrite(report.data(), 1, report.size(), stdout);
    std::fflush(stdout);
}

// False when `text` is not whole: the process ended before it was written.
bool unpack(const std::string& text, Seen& seen) {
    std::istringstream in(text);
    for (std::string* piece : {&seen.outcome, &seen.shown, &seen.printed, &seen.left, &seen.before,
                               &seen.after, &seen.problems, &seen.again}) {
        std::size_t size = 0;
        if (!(in >> size) || size > text.size()) return false;
        piece->resize(size);
        in.get();
        in.read(&(*piece)[0], static_cast<std::streamsize>(size));
    }
    std::size_t calls = 0;
    if (!(in >> seen.recursive >> seen.blocks >> seen.system_blocks >> seen.counted >> calls)) return false;
    for (; calls > 0; --calls) {
        std::uintptr_t seam = 0;
        long nth = 0;
        in >> seam >> nth;
        seen.calls.push_back({reinterpret_cast<SeamBase*>(seam), nth});
    }
    return !in.fail();
}

Seen noted() {
    Seen seen;
    seen.outcome = notes.outcome.str();
    seen.shown = notes.shown.str();
    seen.printed = notes.printed.str();
    seen.left = notes.left.str();
    seen.before = notes.before.str();
    seen.after = notes.after.str();
    seen.problems = notes.problems.str();
    seen.recursive = notes.recursive;
    seen.blocks = notes.blocks;
    seen.system_blocks = notes.system_blocks;
    seen.counted = notes.counted;
    return seen;
}

// The streams of a run, caught while act() is under way.
typedef std::optional<Capture> Streams;

void release(Streams& streams) {
    if (!streams) return;
    streams.reset();
    Capture::read(notes.shown, notes.printed);
}

// A failed assertion ends the process; it reports first what it knows.
void script_assertion(Streams& streams, const LockWatch& locks, const CallTrace& trace) {
    seams::__assert_fail.script(
        [&](const char* expression, const char* file, unsigned line, const char* function) {
            notes.outcome.clear();
            notes.outcome.add("ends %s, %s, %s", expression, file, function);
            if (line == 0) notes.problems.add("the assertion has no line\n");
            notes.recursive = locks.last_failed_was_recursive();
            release(streams);
            if (!in_its_own_process) std::fprintf(stderr, "unexpected: %s\n", notes.outcome.str().c_str());
            Seen seen = noted();
            seen.calls = trace.calls();
            write_packed(seen);
            ::_exit(in_its_own_process ? 0 : 96);
        });
}

void act_and_note(Scenario& scenario, const Plan& plan, Streams& streams, CallTrace& trace) {
    streams.emplace();
    trace.restart();
    apply(plan.faults);
    if (plan.start) plan.start();
    act(scenario, notes.outcome);
    if (plan.count) notes.counted = plan.count();
    withdraw(plan.faults);
    trace.stop();
    release(streams);
}

// What has failed leaves an object that can do the same now.
void act_once_more(const Definition& definition, Scenario& scenario) {
    if (!definition.retried || !begins_with(notes.outcome.str(), "throws ")) return;
    Text outcome;
    act(scenario, outcome);
    if (outcome.str() == definition.gives) return;
    notes.problems.add("tried again, it gives %s\n", outcome.str().c_str());
}

// One run, by itself.
Seen run_once(const Definition& definition, const Plan& plan) {
    notes.clear();
    reset_faults();
    CallTrace trace;
    const Ledger before;
    {
        LockWatch locks;
        Streams streams;
        tell_resolver_failures();
        script_assertion(streams, locks, trace);
        const std::unique_ptr<Scenario> scenario = definition.make();
        scenario->prepare();
        notes.before.append(scenario->state());
        act_and_note(*scenario, plan, streams, trace);
        notes.after.append(scenario->state());
        notes.left.append(scenario->left_over());
        notes.recursive = locks.last_failed_was_recursive();
        locks.check_free(notes.problems);
        act_once_more(definition, *scenario);
    }
    reset_faults();
    const Ledger after;
    before.compare(after, !definition.fresh, notes.problems);
    notes.blocks = after.blocks() - before.blocks();
    notes.system_blocks = after.system_blocks() - before.system_blocks();
    Seen seen = noted();
    seen.calls = trace.calls();
    return seen;
}

// The run that follows every other: the same, and nothing fails.
void run_again(const Definition& definition, Seen& seen) {
    const Seen again = run_once(definition, {});
    seen.again = again.outcome;
    seen.blocks += again.blocks;
    // The C library keeps a text or a buffer from one call to the next, so that only both runs balance.
    seen.system_blocks += again.system_blocks;
    if (!definition.fresh && seen.system_blocks != 0) {
        seen.problems += std::to_string(seen.system_blocks) + " blocks of malloc are left\n";
    }
    if (again.shown != definition.shows) seen.problems += "the next run showed: " + again.shown + "\n";
    if (again.printed != definition.prints) seen.problems += "the next run printed: " + again.printed + "\n";
    if (again.left != "") seen.problems += "the next run left: " + again.left + "\n";
    if (again.problems != "") seen.problems += "the next run: " + again.problems;
}

class Nothing : public Scenario {
    void act() override {}
};

}  // namespace

Seen run_here(const Definition& definition, const Plan& plan) {
    Seen seen = run_once(definition, plan);
    run_again(definition, seen);
    return seen;
}

Seen run_in_child(const Definition& definition, const Plan& plan) {
    const Outcome outcome = in_child([&] {
        in_its_own_process = true;
        write_packed(run_here(definition, plan));
    });
    Seen seen;
    if (!unpack(outcome.out, seen)) {
        seen.outcome = "dies by signal " + std::to_string(outcome.signal) + ", exit code " +
                       std::to_string(outcome.exit_code) + ": " + outcome.err;
    } else if (outcome.err != "") {
        seen.problems += outcome.err;
    }
    return seen;
}

Seen run_as_needed(const Definition& definition, const Plan& plan, bool may_end) {
    return may_end || definition.fresh ? run_in_child(definition, plan) : run_here(definition, plan);
}

void warm_up() {
    find_real_calls();
    failing_calls();
    Definition nothing;
    nothing.make = [] { return std::unique_ptr<Scenario>(std::make_unique<Nothing>()); };
    run_here(nothing, {});
}

}  // namespace test
}  // namespace kel
