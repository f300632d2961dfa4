// The options of the two programs.
//
//   Options   the arguments that begin with -NS, taken out of argv
//
//     Options options(argc, argv);
//     const long port = options.number("NSport", 0, 0, 65535);
//     options.refuse_others();
//
// Every function throws UsageError with a text for the user when the command line is wrong.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_OPTIONS_H
#define NAMES_OPTIONS_H

#include <kel/services/arg_list.h>

#include <stdexcept>
#include <string>

namespace names {

class UsageError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

class Options {
public:
    Options(int& argc, char** argv);

    // The value of an option, or `otherwise` when it is not given.
    std::string text(const char* name, const std::string& otherwise);
    long number(const char* name, long otherwise, long least, long greatest);

    // Call it when every option has been asked for: one that nobody asked for is a mistake.
    void refuse_others();

private:
    KELArgList _arguments;
    unsigned long _known;  // options that were given and asked for
};

}  // namespace names

#endif
