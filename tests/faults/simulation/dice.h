// Numbers that depend on a seed, a topic and a count, and on nothing else. An answer drawn this way is
// the same whoever asks and in whatever order, so one call too many does not change all that follow.
//
//   Dice    the throws for one answer
//
//     Dice dice(task.seed, Topic::socket, 3);             // the answer to the third call of socket
//     if (dice.one_in(10)) return dice.of(refusals);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_DICE_H
#define KEL_TESTS_FAULTS_SIMULATION_DICE_H

#include <cstddef>
#include <cstdint>

namespace kel {
namespace sim {

enum class Topic : std::uint32_t {
    task,
    list,
    family_look_up,
    host_entry,
    own_name,
    interface_index,
    socket,
    options,
    flags,
    bind,
    listen,
    accept,
    connect,
    wait,
    so_error,
    local_name,
    sleep,
    pause,
    close,
};

class Dice {
public:
    Dice(std::uint64_t seed, Topic topic, std::uint32_t n = 0)
        : _state(mixed(seed + mixed((static_cast<std::uint64_t>(topic) << 32) + n + 1))) {}

    std::uint64_t bits() {
        _state += 0x9e3779b97f4a7c15u;
        return mixed(_state);
    }

    // From 0 to n - 1.
    std::uint32_t below(std::uint32_t n) { return static_cast<std::uint32_t>(((bits() >> 32) * n) >> 32); }

    bool one_in(std::uint32_t n) { return below(n) == 0; }

    template <class T, std::size_t n>
    const T& of(const T (&list)[n]) {
        return list[below(static_cast<std::uint32_t>(n))];
    }

private:
    static std::uint64_t mixed(std::uint64_t x) {
        x = (x ^ (x >> 30)) * 0xbf58476d1ce4e5b9u;
        x = (x ^ (x >> 27)) * 0x94d049bb133111ebu;
        return x ^ (x >> 31);
    }

    std::uint64_t _state;
};

}  // namespace sim
}  // namespace kel

#endif
