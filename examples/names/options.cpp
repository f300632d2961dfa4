// SPDX-License-Identifier: MIT
#include "options.h"

#include <kel/containers/strings.h>

#include <cerrno>
#include <cstdlib>

namespace names {

Options::Options(int& argc, char** argv) : _known(0) { _arguments.argInit(argc, argv, "-NS"); }

std::string Options::text(const char* name, const std::string& otherwise) {
    if (!_arguments.getArg(name)) return otherwise;
    ++_known;
    const CORBA_String_var value(_arguments.getArgValue(name));
    if (value.in() == nullptr) throw UsageError(std::string("-") + name + " needs a value");
    return value.in();
}

long Options::number(const char* name, long otherwise, long least, long greatest) {
    const std::string digits = text(name, std::to_string(otherwise));
    char* end = nullptr;
    errno = 0;
    const long value = std::strtol(digits.c_str(), &end, 10);
    if (digits.empty() || *end != '\0' || errno != 0 || value < least || value > greatest) {
        throw UsageError(std::string("-") + name + " needs a number from " + std::to_string(least) + " to " +
                         std::to_string(greatest));
    }
    return value;
}

void Options::refuse_others() {
    if (_arguments.getArgCount() != _known) throw UsageError("there is an option that is not known");
}

}  // namespace names
