// Opens and closes a library that defines an exception.
//
//   plugin_host PLUGIN visit N    N times: "registered", "caught NAME", "gone"
//   plugin_host PLUGIN wire       "read NAME" from the plug-in's repository id, while it is open and after
//   plugin_host PLUGIN borders    "HANDLER caught NAME" for exceptions that cross the border both ways
//   plugin_host PLUGIN keep       minor code, status and explanation of what a closed plug-in threw
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>

#include <cstdlib>
#include <iostream>
#include <sstream>
#include <string>

namespace {

const char* const id = "IDL:test/PluginError:1.0";

class Plugin {
public:
    explicit Plugin(const char* path) : _handle(dlopen(path, RTLD_NOW)) {
        if (_handle != nullptr) return;
        std::cerr << dlerror() << std::endl;
        std::exit(1);
    }
    ~Plugin() { dlclose(_handle); }
    Plugin(const Plugin&) = delete;
    Plugin& operator=(const Plugin&) = delete;

    template <class Function>
    Function* function(const char* name) const {
        return reinterpret_cast<Function*>(dlsym(_handle, name));
    }

private:
    void* _handle;
};

void raise_from(const CORBA_Exception::Description& d) {
    CORBA_Exception_var e(d.factory()());
    try {
        e->_raise();
    } catch (const CORBA_UserException& caught) {
        std::cout << "caught " << caught._name() << std::endl;
    }
}

void visit(const char* path) {
    {
        const Plugin plugin(path);
        const CORBA_Exception::Description* const d = CORBA_Exception::Description::desc(id);
        if (d != nullptr) {
            std::cout << "registered" << std::endl;
            raise_from(*d);
        }
    }
    if (CORBA_Exception::Description::desc(id) == nullptr) std::cout << "gone" << std::endl;
}

void read_from_the_wire() {
    const std::string text(id);
    std::istringstream wire(std::to_string(text.size() + 1) + "\"" + text + "\"\n");
    KEListream in(wire);
    CORBA_Exception* e = nullptr;
    in >> e;
    const CORBA_Exception_var hold(e);
    std::cout << "read " << e->_name() << std::endl;
}

template <class X>
void catch_as(const char* handler, void (*thrower)()) {
    try {
        thrower();
    } catch (const X& caught) {
        std::cout << handler << " caught " << caught._name() << std::endl;
    }
}

void throw_marshal() { throw CORBA::MARSHAL(); }

void cross_borders(const char* path) {
    const Plugin plugin(path);
    void (*const plugin_throw)() = plugin.function<void()>("plugin_throw");
    catch_as<CORBA::TRANSIENT>("TRANSIENT", plugin_throw);
    catch_as<KELStdException>("KELStdException", plugin_throw);
    catch_as<CORBA::SystemException>("SystemException", plugin_throw);
    catch_as<CORBA::Exception>("Exception", plugin_throw);
    const char* const caught = plugin.function<const char*(void (*)())>("plugin_catch")(throw_marshal);
    std::cout << "plug-in caught " << caught << std::endl;
}

CORBA_Exception* copy_of_what_is_thrown(const char* path) {
    const Plugin plugin(path);
    try {
        plugin.function<void()>("plugin_throw")();
    } catch (CORBA::Exception& caught) {
        return caught._deep_copy();
    }
    return nullptr;
}

void keep(const char* path) {
    const CORBA_Exception_var kept(copy_of_what_is_thrown(path));
    const CORBA::TRANSIENT* const e = CORBA::TRANSIENT::_downcast(kept.in());
    if (e != nullptr) std::cout << e->minor() << " " << e->completed() << " " << e->reason() << std::endl;
}

}  // namespace

int main(int argc, char** argv) {
    const char* const path = argv[1];
    const std::string what(argv[2]);
    if (what == "visit") {
        for (int i = argc > 3 ? std::atoi(argv[3]) : 1; i > 0; --i) visit(path);
    } else if (what == "wire") {
        {
            const Plugin plugin(path);
            read_from_the_wire();
        }
        read_from_the_wire();
    } else if (what == "borders") {
        cross_borders(path);
    } else {
        keep(path);
    }
    return 0;
}
