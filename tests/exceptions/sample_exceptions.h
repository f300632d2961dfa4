// Exception classes as a client of the library would define them.
//
//   Sample     a user exception whose body is one number
//   Derived    derives from Sample
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_EXCEPTIONS_SAMPLE_EXCEPTIONS_H
#define KEL_TESTS_EXCEPTIONS_SAMPLE_EXCEPTIONS_H

#include <kel/exceptions/exception.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

namespace kel {
namespace test {

class Sample : public CORBA_UserException {
public:
    Sample() { ++alive; }
    explicit Sample(int n) : number(n) { ++alive; }
    Sample(const Sample& other) : CORBA_UserException(other), number(other.number) { ++alive; }
    ~Sample() override { --alive; }

    const Description* _desc() const override { return &_description; }
    void _write(KELostream& out) const override { out << number; }
    void _copy(KEListream& in) override {
        if (refuse_to_read) throw 1;
        in >> number;
    }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new Sample(*this); }
    static CORBA_Exception* _factory() { return new Sample; }

    static Description _description;
    static int alive;            // objects of the class
    static bool refuse_to_read;  // _copy throws

    int number = 0;
};

class Derived : public Sample {
public:
    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new Derived(*this); }
    static CORBA_Exception* _factory() { return new Derived; }

    static Description _description;
};

inline CORBA_Exception::Description Sample::_description("Sample", "IDL:test/Sample:1.0", Sample::_factory,
                                                         &CORBA_UserException::_description, nullptr);
inline int Sample::alive = 0;
inline bool Sample::refuse_to_read = false;

inline CORBA_Exception::Description Derived::_description("Derived", "IDL:test/Derived:1.0",
                                                          Derived::_factory, &Sample::_description, nullptr);

}  // namespace test
}  // namespace kel

#endif
