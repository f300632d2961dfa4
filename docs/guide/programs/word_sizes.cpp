// SPDX-License-Identifier: MIT
#include <kel/kel.h>

#include <ctime>
#include <iostream>

int main() {
    std::cout << "long and pointers   " << sizeof(long) << " bytes\n";
    std::cout << "time_t              " << sizeof(std::time_t) << "\n";
    std::cout << "timeval             " << sizeof(timeval) << "\n";
    std::cout << "KELMutex            " << sizeof(KELMutex) << "\n";
    std::cout << "KELRWLock           " << sizeof(KELRWLock) << "\n";
    std::cout << "CORBA_String_var    " << sizeof(CORBA_String_var) << "\n";
    std::cout << "CORBA_TRANSIENT     " << sizeof(CORBA_TRANSIENT) << "\n";
    std::cout << "KEListream          " << sizeof(KEListream) << "\n";

    // These are the same everywhere: they are stored, sent or compared with what others computed.
    std::cout << "hash of \"vesta\"     " << CORBA::hash("vesta") << "\n";
    std::cout << "OMG minor code 5    " << CORBA_BAD_PARAM(5, CORBA::COMPLETED_NO).minor() << "\n";
}
