// SPDX-License-Identifier: MIT
#include <kel/services/debug_logger.h>

const unsigned int transport = 0x10000001;  // group 1, its first module
const unsigned int naming = 0x20000001;     // group 2

int main() {
    KELDebugLogger& log = *KELDebugLogger::instance();  // starts on standard output, everything disabled
    log.start(3, transport, "server.cpp", 40) << "nobody sees this" << endl;

    log.traceModule(transport);
    log.start(3, transport, "server.cpp", 42) << "retries left: " << 2L << endl;
    log.start(3, naming, "server.cpp", 43) << "another group" << endl;

    log.traceModule(1);  // bit 0 of group 0 enables everything
    log.start(1, naming, "server.cpp", 46) << "bound " << static_cast<const char*>(0) << endl;
}
