// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>

#include <cerrno>
#include <iostream>

void open_account(const char* name) {
    if (*name == '\0') throw CORBA_BAD_PARAM(5, CORBA::COMPLETED_NO, "the name is empty");
    throw CORBA_NO_IMPLEMENT();
}

int main() {
    try {
        open_account("");
    } catch (const CORBA::BAD_PARAM& wrong) {
        std::cout << wrong;  // for a person, as the stream is std::cout
        std::cout << std::hex << wrong.minor() << std::dec << "\n";
    }

    try {
        open_account("vesta");
    } catch (const CORBA::SystemException& other) {
        std::cout << other._name() << ", " << other._repository_id() << "\n";
    }

    // An errno as minor code is stored in the OMG's set, as every number below 4096 is. One that
    // carries a set of its own stays as it is.
    const CORBA::TRANSIENT refused(ECONNREFUSED, CORBA::COMPLETED_NO);
    const CORBA::TIMEOUT late(0x4b450001, CORBA::COMPLETED_NO);
    std::cout << std::hex << refused.minor() << " " << late.minor() << std::dec << "\n";

    // The registry makes an exception of its repository id.
    const CORBA_Exception::Description* const known =
        CORBA_Exception::Description::desc("IDL:omg.org/CORBA/COMM_FAILURE:1.0");
    CORBA::Exception_var made(known->factory()());
    if (CORBA_SystemException* const system = CORBA_SystemException::_downcast(made.in())) {
        system->minor(0x4f4d0020);
    }
    try {
        made->_raise();  // throws a copy, typed as the object's own class
    } catch (const CORBA::COMM_FAILURE& lost) {
        std::cout << lost._name() << " " << (lost.minor() & 0xfff) << "\n";
    }
}
