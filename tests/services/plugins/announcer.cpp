// A plug-in that says on standard output when it is opened and when it is closed.
//
// SPDX-License-Identifier: MIT
#include <unistd.h>

#include <cstring>

namespace {

void say(const char* text) {
    if (write(1, text, std::strlen(text)) < 0) _exit(90);
}

struct Announcer {
    Announcer() { say(KEL_PLUGIN_NAME " opened\n"); }
    ~Announcer() { say(KEL_PLUGIN_NAME " closed\n"); }
} announcer;

}  // namespace

extern "C" __attribute__((visibility("default"))) const char* plugin_name() { return KEL_PLUGIN_NAME; }
