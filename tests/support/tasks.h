// Threads of this process, as the system counts them. A detached thread has ended, with all of its clean-up,
// when it is counted no more; nothing else tells.
//
//   tasks_without_ours  how many there are when a test has none running
//   task_count          how many there are now
//   others_end          waits until there is none but those, for a bounded time
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SUPPORT_TASKS_H
#define KEL_TESTS_SUPPORT_TASKS_H

#include <sys/stat.h>

#include <chrono>
#include <thread>

namespace kel {
namespace test {

// The thread sanitizer adds one of its own.
#if defined(__SANITIZE_THREAD__)
const int tasks_without_ours = 2;
#else
const int tasks_without_ours = 1;
#endif

// The folder of the threads is linked to by itself, by its parent and by the folder of each thread: asking
// for the links allocates nothing and opens nothing. Negative when the system does not tell.
inline int task_count() {
    struct stat folder;
    return ::stat("/proc/self/task", &folder) == 0 ? static_cast<int>(folder.st_nlink) - 2 : -1;
}

// False when there are others still after half a minute, or when the system does not tell.
inline bool others_end() {
    const auto limit = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    int count = task_count();
    while (count > tasks_without_ours && std::chrono::steady_clock::now() < limit) {
        std::this_thread::yield();
        count = task_count();
    }
    return count >= 1 && count <= tasks_without_ours;
}

}  // namespace test
}  // namespace kel

#endif
