// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/exceptions/exception.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <iostream>
#include <sstream>

// An exception of an interface: which account has how much too little.
class TooLittle : public CORBA_UserException {
public:
    TooLittle() : _missing(0) {}
    TooLittle(const char* account, int missing) : _account(account), _missing(missing) {}

    const char* account() const { return _account.in(); }
    int missing() const { return _missing; }

    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new TooLittle(*this); }

    // The body as it travels, and back.
    void _write(KELostream& out) const override { out << _account.in() << _missing; }
    void _copy(KEListream& in) override { in >> _account >> _missing; }

    static CORBA_Exception* _factory() { return new TooLittle; }
    static Description _description;

private:
    CORBA_String_var _account;
    int _missing;
};

// Registers the class while the program, or the library it is in, is loaded.
CORBA_Exception::Description TooLittle::_description("TooLittle", "IDL:example.org/TooLittle:1.0",
                                                     TooLittle::_factory, &CORBA_UserException::_description,
                                                     0);

int main() {
    std::stringstream wire;
    KELostream out(wire);
    out << TooLittle("vesta", 25);  // its repository id, then its body

    // The receiver does not know what comes. The registry does.
    KEListream in(wire);
    CORBA::Exception_var received;
    in >> received.out();
    try {
        received->_raise();
    } catch (const TooLittle& problem) {
        std::cout << problem.account() << " lacks " << problem.missing() << "\n";
    }
    std::cout << received->_desc()->can_cast(CORBA_UserException::_description) << "\n";

    // An exception of an unknown class becomes CORBA::UNKNOWN, and its body stays in the stream.
    std::stringstream other("26\"IDL:example.org/Lost:1.0\"\n");
    KEListream strange(other);
    strange >> received.out();
    std::cout << received->_name() << "\n";
}
