// How connections go, how waits for them end, and how long sleeps last.
//
// SPDX-License-Identifier: MIT
#include <cerrno>

#include "tests/faults/simulation/nature.h"

namespace kel {
namespace sim {

namespace {

const int errors[] = {ECONNREFUSED, ECONNREFUSED, EADDRINUSE, EADDRINUSE,  EINTR,  ETIMEDOUT,
                      EHOSTUNREACH, ENETUNREACH,  ENOMEM,     EMFILE,      EACCES, EADDRNOTAVAIL,
                      EAFNOSUPPORT, EALREADY,     EISCONN,    EINPROGRESS, EAGAIN, ECONNRESET};
const std::uint32_t delays[] = {0, 1, 5, 50, 200, 999, 1000, 1001, 2000, 3000, 21000, silence - 1};

// More attempts than this succeed, or a patient caller would fill the seed with refusals.
const unsigned patience = 150;

std::uint32_t draw_delay(Dice& dice) { return dice.one_in(2) ? dice.below(10000) : dice.of(delays); }

// A started connection, or, now and then, an error that says so when nothing was asked to be started.
ConnectAnswer started(Dice& dice, std::uint32_t delay, int end) {
    return {dice.one_in(6) ? EAGAIN : EINPROGRESS, true, dice.one_in(10), delay, end};
}

ConnectAnswer ended_with(Dice& dice, int error) {
    if (dice.one_in(2)) return {error, false, false, 0, 0};
    return started(dice, draw_delay(dice), error);
}

ConnectAnswer anything(Dice& dice) {
    const int error = dice.of(errors);
    switch (dice.below(4)) {
        case 0:
            return ended_with(dice, 0);
        case 1:
            return {error, false, false, 0, 0};
        case 2:
            return started(dice, draw_delay(dice), error);
        default:
            return started(dice, silence, ETIMEDOUT);
    }
}

// A connect that fails with one of the two errors that are waited for is a started one.
ConnectAnswer judged(ConnectAnswer answer) {
    if (!answer.started && (answer.error == EINPROGRESS || answer.error == EAGAIN)) {
        return {answer.error, true, true, 500, 0};
    }
    return answer;
}

// What was not given of the peer's address is something that nobody would guess.
Address completed(const Address& peer) {
    Address full = peer;
    full.size = peer.family() == v6_family ? 28 : 16;
    for (unsigned i = peer.size; i < full.size; ++i) full.bytes[i] = 0x5b;
    return full;
}

}  // namespace

ConnectAnswer connect_of(const Task& task, unsigned n) {
    if (n >= patience) return {0, false, false, 0, 0};
    Dice dice(task.seed, Topic::connect, n);
    if (task.mood == Mood::refusing_at_once && !dice.one_in(50)) return {ECONNREFUSED, false, false, 0, 0};
    const bool typical = dice.below(10) < 8;
    if (typical) {
        switch (task.mood) {
            case Mood::friendly:
                return ended_with(dice, 0);
            case Mood::refusing:
                return ended_with(dice, ECONNREFUSED);
            case Mood::in_use:
                return ended_with(dice, EADDRINUSE);
            case Mood::silent:
                return started(dice, silence, ETIMEDOUT);
            case Mood::refusing_at_once:
            case Mood::mixed:
                break;
        }
    }
    // Long rows need fewer surprises than one in five.
    if (task.mood != Mood::mixed && !dice.one_in(4))
        return ended_with(dice, task.mood == Mood::in_use ? EADDRINUSE : ECONNREFUSED);
    return judged(anything(dice));
}

WaitAnswer wait_of(const Task& task, unsigned n) {
    Dice dice(task.seed, Topic::wait, n);
    if (n >= patience) return {true, 0, 0, 0};
    if (task.many_signals && !dice.one_in(6)) return {false, dice.below(1000), -1, EINTR};
    switch (dice.below(40)) {
        case 0:
        case 1:
        case 2:
        case 3:
        case 4:
        case 5:
            return {false, dice.one_in(2) ? dice.below(2000) : dice.below(60000), -1, EINTR};
        case 6:
            return {false, 0, -1, dice.one_in(2) ? ENOMEM : EBADF};
        case 7:
            return {false, 0, -2, dice.one_in(2) ? EINTR : ENOMEM};
        case 8:
            return {false, 0, 2, 0};
        case 9:
            return {false, 0, -1, dice.one_in(2) ? EADDRINUSE : ECONNREFUSED};
        default:
            return {true, 0, 0, 0};
    }
}

int so_error_of(const Task& task, unsigned n) {
    Dice dice(task.seed, Topic::so_error, n);
    return dice.one_in(16) ? ENOBUFS : 0;
}

LocalName local_name_of(const Task& task, unsigned n, const Address& peer) {
    Dice dice(task.seed, Topic::local_name, n);
    const bool six = peer.family() == v6_family;
    LocalName answer{};
    answer.address = completed(peer);
    Address& local = answer.address;
    switch (dice.below(16)) {
        case 0:
            answer.error = ENOBUFS;
            break;
        case 1:
            break;  // the peer itself
        case 2:
            local.bytes[six ? 27 : 15] ^= 1;
            break;  // what follows the address differs, the rest is equal
        case 3:
            local.bytes[six ? 23 : 7] ^= 1;
            break;
        case 4:
            local.bytes[six ? 8 : 4] ^= 1;
            break;
        case 5:
            local.port(local.port() ^ 1);
            break;
        case 6:
            local.port(local.port() ^ 256);
            break;
        case 7: {  // the same bytes in another family
            const Ip same = six ? ip4(peer.bytes[4], peer.bytes[5], peer.bytes[6], peer.bytes[7]) : Ip{};
            local = Address::of(six ? v4_family : v6_family, same, local.port());
            break;
        }
        case 8:
            local.bytes[0] = 1;
            break;
        default:
            local.port(40001);
            break;
    }
    return answer;
}

SleepAnswer sleep_of(const Task& task, unsigned n) {
    Dice dice(task.seed, Topic::sleep, n);
    return dice.one_in(10) ? SleepAnswer{dice.below(4), EINTR} : SleepAnswer{4, 0};
}

SleepAnswer pause_of(const Task& task, unsigned n) {
    Dice dice(task.seed, Topic::pause, n);
    switch (dice.below(10)) {
        case 0:
            return {dice.below(4), EINTR};
        case 1:
            return {0, EBADF};
        default:
            return {4, 0};
    }
}

}  // namespace sim
}  // namespace kel
