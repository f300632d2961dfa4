// A library that defines an exception of its own, and throws and catches those of the ORB.
//
//   plugin_throw    throws a CORBA::TRANSIENT
//   plugin_catch    calls a function and names the exception that a handler for MARSHAL caught
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>

namespace {

class PluginError : public CORBA_UserException {
public:
    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new PluginError(*this); }
    static CORBA_Exception* _factory() { return new PluginError; }

    static Description _description;
};

CORBA_Exception::Description PluginError::_description("PluginError", "IDL:test/PluginError:1.0",
                                                       PluginError::_factory,
                                                       &CORBA_UserException::_description, nullptr);

}  // namespace

extern "C" KEL_API void plugin_throw();
extern "C" KEL_API const char* plugin_catch(void (*thrower)());

void plugin_throw() { throw CORBA::TRANSIENT(5, CORBA::COMPLETED_MAYBE, "from the plug-in"); }

const char* plugin_catch(void (*thrower)()) {
    try {
        thrower();
    } catch (const CORBA::MARSHAL& caught) {
        return caught._name();
    }
    return "nothing";
}
