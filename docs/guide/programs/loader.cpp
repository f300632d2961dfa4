// SPDX-License-Identifier: MIT
#include <kel/exceptions/exception.h>
#include <kel/services/load_library.h>

#include <iostream>

void look_for(const char* id) {
    const CORBA_Exception::Description* const found = CORBA_Exception::Description::desc(id);
    std::cout << (found != 0 ? found->name() : "unknown") << "\n";
}

int main() {
    KELLoadLibrary& loader = *KELLoadLibrary::instance();
    look_for("IDL:example.org/Full:1.0");

    loader.Load("mailbox");  // libmailbox_r.so, found through LD_LIBRARY_PATH
    look_for("IDL:example.org/Full:1.0");

    loader.Unload("libmailbox_r.so");  // by the name that was opened
    look_for("IDL:example.org/Full:1.0");

    loader.Load("/nowhere/mailbox");  // that it failed goes to standard error, and nowhere else
    std::cout << "still here\n";
}
