// The string functions and holders, also when a stream fills them.
//
// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/containers/wstrings.h>
#include <kel/streams/istream.h>

#include <cstring>
#include <sstream>
#include <string>

#include "tests/faults/matrix/scenario.h"

namespace {

using namespace kel::test;

const char* const text = "a text of some length";
const wchar_t* const wide_text = L"a wide text";

class StringIsCopied : public Scenario {
    void act() override {
        char* const copy = CORBA::string_dup(text);
        gives("%s", copy);
        CORBA::string_free(copy);
    }
};
KEL_SCENARIO(StringIsCopied).giving(text).and_retried();

class WideStringIsCopied : public Scenario {
    void act() override {
        wchar_t* const copy = CORBA::wstring_dup(wide_text);
        gives("%d", copy[2] == L'w');
        CORBA::wstring_free(copy);
    }
};
KEL_SCENARIO(WideStringIsCopied).giving("1").and_retried();

class HolderScenario : public Scenario {
    std::string state() override { return _holder.in() != nullptr ? _holder.in() : "(null)"; }

protected:
    CORBA_String_var _holder{static_cast<const char*>("old")};
};

class HolderIsAssigned : public HolderScenario {
    void act() override { _holder = text; }
};
KEL_SCENARIO(HolderIsAssigned).and_retried();

class HolderIsAssignedAHolder : public HolderScenario {
    void act() override { _holder = _other; }
    const CORBA_String_var _other{text};
};
KEL_SCENARIO(HolderIsAssignedAHolder).and_retried();

class HolderIsCopied : public HolderScenario {
    void act() override {
        const CORBA_String_var copy(_holder);
        gives("%s", copy.in());
    }
};
KEL_SCENARIO(HolderIsCopied).giving("old").and_retried();

class OutParameterIsAssigned : public Scenario {
    void act() override {
        char* result = nullptr;
        CORBA_String_out out(result);
        out = text;
        gives("%s", result);
        CORBA::string_free(result);
    }
};
KEL_SCENARIO(OutParameterIsAssigned).giving(text).and_retried();

class WideHolderIsAssigned : public Scenario {
    void act() override { _holder = wide_text; }
    std::string state() override { return _holder.in() == nullptr ? "null" : "something"; }
    CORBA_WString_var _holder;
};
KEL_SCENARIO(WideHolderIsAssigned).and_retried();

// A binary stream with one string.
class OneString : public KEListream {
public:
    using KEListream::operator>>;
    using KEListream::get;
    KEListream& operator>>(unsigned long& n) override {
        n = std::strlen(text) + 1;
        return *this;
    }
    KEListream& get(char* bytes, unsigned int n) override {
        std::memcpy(bytes, text, n);
        return *this;
    }
};

class HolderIsReadFromBinary : public HolderScenario {
    void act() override {
        _stream >> _holder;
        gives("%s", _holder.in());
    }
    OneString _stream;
};
KEL_SCENARIO(HolderIsReadFromBinary).giving(text).and_retried();

// In the form of a standard stream the holder is null before anything is read.
class HolderIsReadFromText : public Scenario {
    void act() override {
        _stream >> _holder;
        gives("%s", _holder.in());
    }
    std::istringstream _input{"6\"vesta\"\n"};
    KEListream _stream{_input};
    CORBA_String_var _holder;
};
KEL_SCENARIO(HolderIsReadFromText).giving("vesta");

class WideHolderIsRead : public Scenario {
    void act() override {
        _stream >> _holder;
        gives("%d %d", static_cast<int>(_holder[0]), static_cast<int>(_holder[1]));
    }
    std::istringstream _input{"2 65 66 "};
    KEListream _stream{_input};
    CORBA_WString_var _holder;
};
KEL_SCENARIO(WideHolderIsRead).giving("65 66");

}  // namespace
