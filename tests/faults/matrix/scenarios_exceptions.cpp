// Exceptions: made, copied, thrown, sent as text and brought back from it.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/explain.h>
#include <kel/exceptions/standard.h>
#include <kel/services/environment.h>
#include <kel/services/load_library.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cstdio>
#include <iostream>
#include <memory>
#include <sstream>
#include <string>

#include "tests/faults/matrix/scenario.h"

namespace {

using namespace kel::test;

const char* const reason = "a reason that does not fit into a short string";

class ExceptionWithAReason : public Scenario {
    void act() override {
        const CORBA_MARSHAL e(7, CORBA::COMPLETED_MAYBE, reason);
        gives("%lx", e.minor());
    }
};
KEL_SCENARIO(ExceptionWithAReason).giving("4f4d0007").and_retried();

class ExceptionScenario : public Scenario {
protected:
    CORBA_MARSHAL _exception{7, CORBA::COMPLETED_MAYBE, reason};
};

class ExceptionIsThrown : public ExceptionScenario {
    void act() override { _exception._raise(); }
};
KEL_SCENARIO(ExceptionIsThrown)
    .giving(std::string("throws CORBA::MARSHAL 0x4f4d0007 MAYBE: ") + reason)
    .and_retried();

class ExceptionIsCopied : public ExceptionScenario {
    void act() override {
        const CORBA_Exception_var copy(_exception._deep_copy());
        gives("%s", copy.in()->_name());
    }
};
KEL_SCENARIO(ExceptionIsCopied).giving("CORBA::MARSHAL").and_retried();

class ExceptionIsExplained : public ExceptionScenario {
    void act() override {
        const CORBA_String_var line(kel_explain(_exception));
        gives("%s", line.in());
    }
};
KEL_SCENARIO(ExceptionIsExplained)
    .giving(std::string(
                "IDL:omg.org/CORBA/MARSHAL:1.0: minor 0x4f4d0007 (vendor set 0x4f4d0000 OMG, code 0x007): "
                "no words for this code; completion status MAYBE; ") +
            reason)
    .and_retried();

class UserExceptionIsCopied : public Scenario {
    void act() override {
        const CORBA_Exception_var copy(_exception._deep_copy());
        gives("%s", copy.in()->_name());
    }
    KELLoadLibrary::LoadError _exception{reason, 0};
};
KEL_SCENARIO(UserExceptionIsCopied).giving("KELLoadLibrary::LoadError").and_retried();

class UserExceptionIsThrown : public Scenario {
    void act() override { _exception._raise(); }
    KELLoadLibrary::LoadError _exception{reason, 0};
};
KEL_SCENARIO(UserExceptionIsThrown).giving("throws KELLoadLibrary::LoadError").and_retried();

class ExceptionBecomesText : public ExceptionScenario {
    void act() override {
        _out << _exception;
        gives("%s", _text.good() ? "good" : "bad");
    }
    std::ostringstream _text;
    KELostream _out{_text};
};
KEL_SCENARIO(ExceptionBecomesText).giving("good");

class ExceptionIsShown : public ExceptionScenario {
    void act() override { std::cout << _exception; }
};
KEL_SCENARIO(ExceptionIsShown)
    .showing(std::string("Exception: CORBA::MARSHAL\n\tExplanation: ") + reason +
             "\n\tMinor: 1330446343 \n\tCompletion Status: MAYBE\n");

// The caller owns what has been made when reading the rest fails.
class ExceptionFromText : public Scenario {
public:
    explicit ExceptionFromText(const char* id = "IDL:omg.org/CORBA/MARSHAL:1.0") {
        const std::string name = id;
        _text.str(std::to_string(name.size() + 1) + "\"" + name + "\"\n1330446343 2 ");
    }
    ~ExceptionFromText() override { CORBA::release(_exception); }

private:
    void act() override {
        _in >> _exception;
        gives("%s", _exception->_name());
    }
    std::istringstream _text;
    KEListream _in{_text};
    CORBA_Exception* _exception = nullptr;
};
KEL_SCENARIO(ExceptionFromText).giving("CORBA::MARSHAL");

class UnknownExceptionFromText : public ExceptionFromText {
public:
    UnknownExceptionFromText() : ExceptionFromText("IDL:somebody.else/Trouble:1.0") {}
};
KEL_SCENARIO(UnknownExceptionFromText).giving("CORBA::UNKNOWN");

// Registered at load by the libraries of clients, and taken out when they are unloaded.
class DescriptionIsRegistered : public Scenario {
    void act() override {
        const CORBA_Exception::Description description("Visitor", "IDL:visitor/Visitor:1.0", nullptr,
                                                       &CORBA_UserException::_description, nullptr);
        gives("%d", CORBA_Exception::Description::desc("IDL:visitor/Visitor:1.0") == &description);
    }
};
KEL_SCENARIO(DescriptionIsRegistered).giving("1").and_retried();

class EnvironmentHoldsACopy : public ExceptionScenario {
    void act() override {
        _environment->exception(_exception._deep_copy());
        gives("%s", _environment->exception()->_name());
    }
    std::string state() override { return _environment->exception() == nullptr ? "nothing" : "something"; }
    const std::unique_ptr<CORBA_Environment> _environment = std::make_unique<CORBA_Environment>();
};
KEL_SCENARIO(EnvironmentHoldsACopy).giving("CORBA::MARSHAL").and_retried();

}  // namespace
