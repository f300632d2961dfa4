// The process-wide settings of the library.
//
//   KELPortLibManager   static members only; there is no object of it
//
//     std::strcpy(KELPortLibManager::ifname, "eth1");   // before the first link-local connection
//     KELPortLibManager::initialize();
//
// The members hold their values before any initialiser of the library runs. No lock protects
// them: set them before other threads use the library.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_PORTLIB_H
#define KEL_CORE_PORTLIB_H

#include <kel/config.h>

class KEL_API KELPortLibManager {
public:
    KELPortLibManager() = delete;

    // Marks the library initialised. May be called any number of times.
    static void initialize();

    // A verbosity level for client code; nothing inside the library reads it. Initially 0.
    static std::int32_t debug_level;

    // 0 until initialize() was called, 1 from then on.
    static std::int32_t inited;

    // The network interface whose index scopes IPv6 link-local addresses: up to 79 characters
    // and a NUL. Initially "eth0".
    static char ifname[80];
};

#endif
