// SPDX-License-Identifier: MIT
#include <kel/exceptions/internal/downcast.h>
#include <kel/exceptions/internal/status.h>
#include <kel/exceptions/system_exception.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <memory>

namespace {

const unsigned long largest_bare_minor = 0xfff;

// A number too wide for a status stays none of the three: cut to its low bits it could become one.
CORBA::CompletionStatus status_of(unsigned long number) {
    const unsigned long widest = 0xffffffff;
    return static_cast<CORBA::CompletionStatus>(number < widest ? number : widest);
}

}  // namespace

const char* kel::internal::status_text(CORBA::CompletionStatus status) {
    switch (status) {
        case CORBA::COMPLETED_YES:
            return "YES";
        case CORBA::COMPLETED_NO:
            return "NO";
        case CORBA::COMPLETED_MAYBE:
            return "MAYBE";
    }
    return "Invalid status";
}

// ---- CORBA_SystemException ----

CORBA_SystemException::CORBA_SystemException(unsigned long minor, CORBA::CompletionStatus completed) {
    init(minor, completed);
}

CORBA_SystemException::CORBA_SystemException(unsigned long minor, CORBA::CompletionStatus completed,
                                             const char* reason)
    : _reason(reason) {
    init(minor, completed);
}

void CORBA_SystemException::init(unsigned long minor, CORBA::CompletionStatus completed) {
    _minor = minor <= largest_bare_minor ? minor | CORBA::OMGVMCID : minor;
    _completed = completed;
}

const CORBA_Exception::Description* CORBA_SystemException::_desc() const { return &_description; }

void CORBA_SystemException::_write(KELostream& out) const {
    out << _minor;
    out << static_cast<unsigned long>(_completed);
}

// Deliberate: the minor-code rule is left out here. What the sender stored is what arrives.
// Pinned by SystemExceptionBody.ReadingKeepsAMinorCodeOutsideEverySet.
void CORBA_SystemException::_copy(KEListream& in) {
    in >> _minor;
    unsigned long status = _completed;
    in >> status;
    _completed = status_of(status);
}

void CORBA_SystemException::_pretty_print(KELostream& out) const {
    out << "Exception: " << _name();
    endl(out);
    const char* text = reason();
    if (text != nullptr && *text != '\0') {
        out << "\tExplanation: " << text;
        endl(out);
    }
    out << "\tMinor: " << _minor;
    endl(out);
    out << "\tCompletion Status: " << kel::internal::status_text(_completed);
    endl(out);
}

CORBA_SystemException* CORBA_SystemException::_downcast(CORBA_Exception* e) {
    return kel::internal::downcast<CORBA_SystemException>(e);
}

const CORBA_SystemException* CORBA_SystemException::_downcast(const CORBA_Exception* e) {
    return kel::internal::downcast<const CORBA_SystemException>(e);
}

// ---- KELStdException ----

KELStdException::KELStdException(unsigned long minor, CORBA::CompletionStatus completed,
                                 CORBA_Exception::Description& d, CORBA_Exception* (*factory)())
    : CORBA_SystemException(minor, completed), _class(&d), _create(factory) {}

KELStdException::KELStdException(unsigned long minor, CORBA::CompletionStatus completed, const char* reason,
                                 CORBA_Exception::Description& d, CORBA_Exception* (*factory)())
    : CORBA_SystemException(minor, completed, reason), _class(&d), _create(factory) {}

KELStdException::KELStdException(CORBA_Exception::Description& d, CORBA_Exception* (*factory)())
    : KELStdException(0, CORBA::COMPLETED_NO, d, factory) {}

const CORBA_Exception::Description* KELStdException::_desc() const { return _class; }

void KELStdException::_raise() const { throw *this; }

CORBA_Exception* KELStdException::_deep_copy() {
    std::unique_ptr<CORBA_SystemException> copy(static_cast<CORBA_SystemException*>(_create()));
    copy->minor(minor());
    copy->completed(completed());
    copy->reason(reason());
    return copy.release();
}
