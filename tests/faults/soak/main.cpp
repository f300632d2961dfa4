// Works the library for a while with one call in a hundred failing, and looks what is left.
//
//     kel_soak --seconds 45 [--connections 100000] [--threads 100000] [--resident 256]
//
// What is held after the first tenth is what may be held at the end: descriptors, blocks and lists
// exactly, resident memory within the given KiB. The last line is the figures. Exit status 1 when something
// is left, when a goal is missed or when a connection or an environment was not what it should be.
//
// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/kel.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <thread>

#include "tests/faults/soak/balance.h"
#include "tests/faults/soak/connections.h"
#include "tests/faults/soak/faults.h"
#include "tests/faults/soak/threads.h"
#include "tests/support/fault.h"

namespace {

using kel::soak::Balance;
using kel::soak::Connections;
using kel::soak::Threads;

struct Options {
    unsigned long seconds = 2;
    unsigned long connections = 1;
    unsigned long threads = 1;
    unsigned long resident = 0;  // KiB; 0 for any
};

bool read(int argc, char** argv, Options& options) {
    for (int i = 1; i + 1 < argc; i += 2) {
        const unsigned long value = std::strtoul(argv[i + 1], nullptr, 10);
        const char* const name = argv[i];
        if (std::strcmp(name, "--seconds") == 0) {
            options.seconds = value;
        } else if (std::strcmp(name, "--connections") == 0) {
            options.connections = value;
        } else if (std::strcmp(name, "--threads") == 0) {
            options.threads = value;
        } else if (std::strcmp(name, "--resident") == 0) {
            options.resident = value;
        } else {
            return false;
        }
    }
    return argc % 2 == 1 && options.seconds > 0;
}

// Both kinds of work at the same time, and what is held when all is over. False when threads stay.
bool work(int idle, unsigned long ms, Connections& connections, Threads& threads, Balance& held) {
    const auto end = std::chrono::steady_clock::now() + std::chrono::milliseconds(ms);
    std::thread starter([&] { threads.start_until(end); });
    std::thread connector([&] { connections.make_until(end); });
    starter.join();
    connector.join();
    const bool settled = kel::soak::settle(idle);
    held = kel::soak::balance();
    return settled;
}

// Standard output takes the reports of threads that end by an exception; the figures go elsewhere.
FILE* set_output_aside() {
    FILE* const out = fdopen(dup(1), "w");
    const int nowhere = open("/dev/null", O_WRONLY);
    dup2(nowhere, 1);
    close(nowhere);
    return out;
}

bool judge(const Options& options, const Connections& connections, const Threads& threads,
           const Balance& first, const Balance& last, FILE* out) {
    const Connections::Figures& made = connections.figures();
    const unsigned long ended = threads.shared().with_environment;
    const long grown = last.resident - first.resident;
    const bool equal =
        last.descriptors == first.descriptors && last.blocks == first.blocks && last.lists == first.lists;
    const bool small = options.resident == 0 || grown <= static_cast<long>(options.resident);
    const bool right = made.wrong == 0 && threads.shared().wrong == 0;
    const bool enough = made.made >= options.connections && ended >= options.threads;
    // Nothing is proved when most of the work fails.
    const bool alive =
        made.made > 3 * made.failed && made.accepted >= made.made && ended * 4 > threads.started() * 3;
    std::fprintf(
        out,
        "soak: %lu connections (%lu failed, %lu listeners), %lu threads with their environment (%lu refused, "
        "%lu without resources, %lu ended by an exception), %lu faults in %lu s; since the first tenth "
        "descriptors %+d, blocks %+ld, lists %+ld, resident %+ld KiB%s%s\n",
        made.made, made.failed, made.listened, ended, threads.refused(),
        threads.shared().without_resources.load(), threads.shared().escaped.load(), kel::soak::faults_made(),
        options.seconds, last.descriptors - first.descriptors, last.blocks - first.blocks,
        last.lists - first.lists, grown, right ? "" : "; wrong results", alive ? "" : "; too much failed");
    return equal && small && right && enough && alive;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!read(argc, argv, options)) {
        std::fputs("kel_soak: see the top of main.cpp for the options\n", stderr);
        return 2;
    }
    FILE* const out = set_output_aside();
    const int idle = kel::soak::idle_threads();
    kel::soak::set_up_faults();
    Balance first;
    Balance last;
    Connections connections;
    Threads threads;
    threads.start_a_crowd();
    const bool settled = work(idle, options.seconds * 100, connections, threads, first) &&
                         work(idle, options.seconds * 900, connections, threads, last);
    if (!settled) std::fputs("threads are still running\n", out);
    const bool good = judge(options, connections, threads, first, last, out) && settled;
    std::fclose(out);
    return good ? 0 : 1;
}
