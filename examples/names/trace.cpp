// SPDX-License-Identifier: MIT
#include "trace.h"

#include <sstream>

namespace names {

namespace {

struct Module {
    const char* name;
    unsigned int code;
};

const Module modules_by_name[] = {
    {"all", kEverything},
    {"transport", kTransport},
    {"dispatch", kDispatch},
    {"marshalling", kMarshalling},
};

unsigned int code_of(const std::string& name) {
    for (const Module& module : modules_by_name) {
        if (name == module.name) return module.code;
    }
    return 0;
}

}  // namespace

bool enable_trace(const std::string& modules) {
    std::istringstream list(modules);
    std::string name;
    while (std::getline(list, name, ',')) {
        const unsigned int code = code_of(name);
        if (code == 0) return false;
        KELDebugLogger::instance()->traceModule(code);
    }
    return true;
}

}  // namespace names
