// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/environment.h>

#include <iostream>

// How a stub without C++ exceptions reports: the caller looks into its thread's environment.
int balance_of(const char* account) {
    CORBA_Environment* const env = CORBA::current_environment();
    env->clear();
    if (*account == '\0') {
        env->exception(CORBA_BAD_PARAM::_factory());  // now the environment's
        return 0;
    }
    return 42;
}

int main() {
    CORBA_Environment* const env = CORBA::current_environment();  // never null, never released
    std::cout << balance_of("vesta") << "\n";
    if (env->exception() == 0) std::cout << "no exception\n";

    balance_of("");
    if (const CORBA_Exception* const problem = env->exception()) std::cout << problem->_name() << "\n";
    env->clear();
}
