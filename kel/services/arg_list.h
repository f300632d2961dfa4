// Keeps the command-line options of one component, taken out of the program's arguments.
//
//   KELArgList   option names and their values; a value may be missing
//
//     KELArgList options;
//     options.argInit(argc, argv, "-ORB");                     // -ORBPort 2809 leaves argv
//     CORBA_String_var port(options.getArgValue("ORBPort"));   // the name without its "-"
//
// Any number of threads may ask at once; storing excludes them.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_SERVICES_ARG_LIST_H
#define KEL_SERVICES_ARG_LIST_H

#include <kel/config.h>
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>

class KEL_API KELArgList {
public:
    KELArgList();
    virtual ~KELArgList();

    KELArgList(const KELArgList&) = delete;
    KELArgList& operator=(const KELArgList&) = delete;

    // 1 when the option was given, with or without a value.
    virtual unsigned char getArg(const char* name);

    // A copy of the option's value, released with CORBA::string_free; null when the option was not
    // given or has no value.
    virtual char* getArgValue(const char* name);

    // How many different options were given.
    virtual unsigned long getArgCount();

    // Stores the arguments that begin with `prefix` and takes them out of `argv`; `argc` and the
    // front of `argv` then hold the others in their order. The argument after an option is its value
    // unless it begins with "-". `prefix` is a dash and a letter or digit at least, otherwise this
    // throws CORBA_BAD_PARAM. Whatever is thrown, `argc` and `argv` are as they were.
    virtual void argInit(int& argc, char* const* argv, const char* prefix);

    // Stores a copy of `value`, which may be null, under a copy of `name`. The last value wins.
    void putArgValue(const char* name, const char* value);

private:
    typedef KELDictionary_r<CORBA_String_var, CORBA_String_var> Store;

    Store _options;  // its own reader-writer lock guards this object
};

#endif
