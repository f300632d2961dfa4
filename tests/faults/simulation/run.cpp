// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/run.h"

#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <iostream>
#include <new>

#include "tests/faults/simulation/stage.h"

namespace kel {
namespace sim {

namespace {

const double hour = 3600000;
const unsigned most_reports = 3;

// What the process of one machine shares with the one that started it.
struct Shared {
    Figures figures;
    std::uint64_t seed;  // the one that is acted, so that a process that dies can be blamed on it
    bool finished;
};

class SharedPages {
public:
    SharedPages() {
        void* const pages = mmap(nullptr, machines * sizeof(Shared), PROT_READ | PROT_WRITE,
                                 MAP_SHARED | MAP_ANONYMOUS, -1, 0);
        if (pages == MAP_FAILED) throw std::bad_alloc();
        _shared = static_cast<Shared*>(pages);
    }
    ~SharedPages() { munmap(_shared, machines * sizeof(Shared)); }
    SharedPages(const SharedPages&) = delete;
    SharedPages& operator=(const SharedPages&) = delete;

    Shared& operator[](unsigned machine) { return _shared[machine]; }

private:
    Shared* _shared;
};

void count(Figures& figures, const Story& story) {
    ++figures.seeds;
    ++figures.endings[static_cast<unsigned>(story.ending.thrown)];
    figures.calls += story.events.size();
    for (const Event& event : story.events) {
        if (event.call == Call::connect) ++figures.connects;
        if (event.call == Call::wait) ++figures.waits;
        if (event.call == Call::socket && event.result >= 0) ++figures.descriptors;
    }
    const double ms = static_cast<double>(story.ending.time);
    figures.hours += ms < hour ? ms / hour : 1;
}

void report(const Task& task, const Story& acted, const Story& foretold) {
    std::cout << "seed " << task.seed << " differs: ";
    print(std::cout, task);
    print_side_by_side(std::cout, task, acted, foretold);
    std::cout.flush();
}

// The seeds of one machine. Runs in a process of its own.
void run_machine(const Run& wanted, unsigned machine, Shared& shared) {
    Stage stage(machine_of(machine));
    World fate;
    Figures& figures = shared.figures;
    if (!stage.knows_itself()) {
        std::cout << "machine " << machine << " does not find its own address\n";
        ++figures.different;
    }
    const std::uint64_t skip = (machine + machines - wanted.first % machines) % machines;
    for (std::uint64_t i = skip; i < wanted.count; i += machines) {
        const Task task = task_of(wanted.first + i);
        shared.seed = task.seed;
        foretell(task, fate, figures.turns);
        stage.act(task);
        count(figures, fate.story());
        if (stage.story() == fate.story()) continue;
        if (++figures.different <= most_reports) report(task, stage.story(), fate.story());
    }
    shared.finished = true;
    std::cout.flush();
}

pid_t start(const Run& wanted, unsigned machine, Shared& shared) {
    std::cout.flush();
    const pid_t child = fork();
    if (child != 0) return child;
    run_machine(wanted, machine, shared);
    _exit(0);
}

}  // namespace

void Figures::add(const Figures& more) {
    seeds += more.seeds;
    different += more.different;
    calls += more.calls;
    connects += more.connects;
    waits += more.waits;
    descriptors += more.descriptors;
    hours += more.hours;
    for (unsigned i = 0; i < kinds_thrown; ++i) endings[i] += more.endings[i];
    for (unsigned i = 0; i < static_cast<unsigned>(Turn::count); ++i) turns.taken[i] += more.turns.taken[i];
}

unsigned Figures::turns_missed(std::ostream* out) const {
    unsigned missed = 0;
    for (unsigned i = 0; i < static_cast<unsigned>(Turn::count); ++i) {
        if (turns.taken[i] != 0) continue;
        ++missed;
        if (out != nullptr) *out << "no seed reaches " << name_of(static_cast<Turn>(i)) << '\n';
    }
    return missed;
}

bool run(const Run& wanted, Figures& figures) {
    figures = Figures();
    SharedPages shared;
    unsigned started = 0;
    unsigned running = 0;
    while (started < machines || running > 0) {
        if (started < machines && running < wanted.processes) {
            if (start(wanted, started, shared[started]) > 0) ++running;
            ++started;
        } else {
            int status;
            waitpid(-1, &status, 0);
            --running;
        }
    }
    bool finished = true;
    for (unsigned machine = 0; machine < machines; ++machine) {
        figures.add(shared[machine].figures);
        if (shared[machine].finished) continue;
        finished = false;
        std::cout << "seed " << shared[machine].seed << " ended its process\n";
    }
    return finished && figures.different == 0;
}

bool replay(std::uint64_t seed) {
    const Task task = task_of(seed);
    print(std::cout, task);
    Stage stage(*task.machine);
    World fate;
    Turns turns;
    foretell(task, fate, turns);
    stage.act(task);
    print_side_by_side(std::cout, task, stage.story(), fate.story());
    const bool equal = stage.story() == fate.story() && stage.knows_itself();
    std::cout << (equal ? "equal\n" : "different\n");
    return equal;
}

}  // namespace sim
}  // namespace kel
