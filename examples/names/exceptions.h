// The exceptions that the name service raises besides the standard ones.
//
//   NotFound       no binding has the name
//   AlreadyBound   bind() of a name that has a binding
//
// Both carry the name. Their descriptions register them, so that a client that receives one rebuilds
// it from its repository id.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_EXCEPTIONS_H
#define NAMES_EXCEPTIONS_H

#include <kel/containers/strings.h>
#include <kel/exceptions/exception.h>

namespace names {

// An exception about one name, which is its body on the wire.
class NameException : public CORBA_UserException {
public:
    const char* name() const { return _bound_name.in(); }

    void _write(KELostream& out) const override;
    void _copy(KEListream& in) override;

protected:
    explicit NameException(const char* name) : _bound_name(name) {}

private:
    CORBA_String_var _bound_name;
};

class NotFound : public NameException {
public:
    explicit NotFound(const char* name = "") : NameException(name) {}

    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new NotFound(*this); }

    static CORBA_Exception* _factory() { return new NotFound; }
    static Description _description;
};

class AlreadyBound : public NameException {
public:
    explicit AlreadyBound(const char* name = "") : NameException(name) {}

    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new AlreadyBound(*this); }

    static CORBA_Exception* _factory() { return new AlreadyBound; }
    static Description _description;
};

}  // namespace names

#endif
