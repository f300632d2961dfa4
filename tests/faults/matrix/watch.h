// What is looked at around a run.
//
//   Ledger    open descriptors and blocks in use, to compare before and after
//   Capture   catches what is written to standard output and standard error
//   LockWatch every mutex that is locked while it lives, and whether all are free in the end
//
// None of them leaves a block or a descriptor behind.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_WATCH_H
#define KEL_TESTS_FAULTS_MATRIX_WATCH_H

#include <pthread.h>

#include <bitset>
#include <set>

#include "tests/faults/matrix/text.h"

namespace kel {
namespace test {

class Ledger {
public:
    Ledger();

    // Adds a line to `problems` for what is different now.
    void compare(const Ledger& later, bool blocks_too, Text& problems) const;

    long blocks() const { return _blocks; }
    long system_blocks() const { return _system_blocks; }

private:
    static const int descriptors = 256;

    std::bitset<descriptors> _open;
    long _blocks;
    long _system_blocks;  // of malloc, where that is counted
};

class Capture {
public:
    Capture();
    ~Capture() { stop(); }
    Capture(const Capture&) = delete;
    Capture& operator=(const Capture&) = delete;

    // Gives the streams back. What was written is then to be read.
    void stop();
    static void read(Text& shown, Text& printed);

private:
    int _saved[2];
    bool _capturing = true;
};

class LockWatch {
public:
    // Scripts the calls that lock, unlock and destroy.
    LockWatch();

    bool last_failed_was_recursive() const { return _recursive; }

    // Tries, from another thread, every mutex that was locked and still exists and the library's own.
    void check_free(Text& problems) const;

private:
    std::set<pthread_mutex_t*> _locked;
    bool _recursive = false;
};

}  // namespace test
}  // namespace kel

#endif
