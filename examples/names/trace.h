// Tracing of the server, by module.
//
//     NAMES_TRACE(names::kTransport) << "client " << long(fd) << " has left" << endl;
//
// The line is made only when its module is enabled. The codes are of the logger's first group, whose
// members are told apart bit by bit; bit 0 means every module.
//
// Any thread.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_TRACE_H
#define NAMES_TRACE_H

#include <kel/services/debug_logger.h>

#include <string>

namespace names {

const unsigned int kEverything = 0x1;
const unsigned int kTransport = 0x2;
const unsigned int kDispatch = 0x4;
const unsigned int kMarshalling = 0x8;

// Enables the modules of a list such as "transport,dispatch"; "all" enables every one. False when
// a name is not known.
bool enable_trace(const std::string& modules);

inline bool traces(unsigned int module) {
    return KELDebugLogger::instance()->isTraceEnabledFor(module | kEverything);
}

}  // namespace names

#define NAMES_TRACE(module)       \
    if (!names::traces(module)) { \
    } else                        \
        KELDebugLogger::instance()->start(1, module, __FILE__, __LINE__)

#endif
