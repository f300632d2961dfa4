// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/arg_list.h>

#include <iostream>

int main() {
    // What main gets when it is called: server -ORBPort 2809 -v -ORBTrace names.txt
    char program[] = "server", port[] = "-ORBPort", number[] = "2809", own[] = "-v", trace[] = "-ORBTrace",
         file[] = "names.txt";
    char* argv[] = {program, port, number, own, trace, file, 0};
    int argc = 6;

    KELArgList options;
    options.argInit(argc, argv, "-ORB");  // takes the options of the ORB out of argv

    for (int i = 0; i < argc; ++i) std::cout << argv[i] << " ";
    std::cout << "\n" << options.getArgCount() << " options\n";

    const CORBA_String_var given(options.getArgValue("ORBPort"));  // the name without its dash
    std::cout << "port " << given << "\n";
    // Whatever follows an option and begins with no dash is its value.
    std::cout << "trace " << CORBA_String_var(options.getArgValue("ORBTrace")) << "\n";
    std::cout << (options.getArg("ORBQuiet") ? "quiet" : "not quiet") << "\n";

    try {
        options.argInit(argc, argv, "-");
    } catch (const CORBA::BAD_PARAM&) {
        std::cout << "a prefix has a letter or a digit\n";
    }
}
