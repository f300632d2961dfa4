// The plug-in of loader.cpp, libmailbox_r.so: an exception class that registers itself when it is loaded.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/exception.h>

namespace {

class Full : public CORBA_UserException {
public:
    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new Full(*this); }
    static CORBA_Exception* _factory() { return new Full; }
    static Description _description;
};

CORBA_Exception::Description Full::_description("Full", "IDL:example.org/Full:1.0", Full::_factory,
                                                &CORBA_UserException::_description, 0);

}  // namespace
