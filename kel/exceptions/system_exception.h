// System exceptions: what the ORB and this library throw by themselves.
//
//   CORBA::CompletionStatus   whether the operation had completed when the exception was raised
//   CORBA::OMGVMCID           the minor-code set that minor codes 0 to 4095 belong to
//   CORBA_SystemException     minor code, completion status and an explanation
//   KELStdException           implements the standard system exceptions of standard.h
//
// A minor code that fits into twelve bits is stored in the OMG's set; any other carries the id of
// its own set in the upper bits and is kept as it is. The rule works on what constructors get,
// never on what is read from a stream or copied from another exception.
//
//     CORBA_BAD_PARAM e(5, CORBA::COMPLETED_NO, "the name is empty");
//     e.minor();    // 0x4f4d0005
//
// Minor code and completion status travel; the explanation stays in the process. An exception
// belongs to one thread at a time.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_SYSTEM_EXCEPTION_H
#define KEL_EXCEPTIONS_SYSTEM_EXCEPTION_H

#include <kel/config.h>
#include <kel/containers/strings.h>
#include <kel/exceptions/exception.h>

// <sys/sysmacros.h> makes this mapped name a macro; gnu_dev_minor() does what the macro did.
#undef minor

namespace CORBA {

// The width is fixed because the number comes from a peer: a status that is none of the three
// stays what it is.
enum CompletionStatus : std::uint32_t { COMPLETED_YES = 0, COMPLETED_NO = 1, COMPLETED_MAYBE = 2 };

// The set of minor codes that the OMG gives out: the upper twenty bits.
const unsigned long OMGVMCID = 0x4f4d0000;

}  // namespace CORBA

class KEL_API CORBA_SystemException : public CORBA_Exception {
public:
    // Without `reason` the explanation is empty; a null `reason` stays null. The text is copied.
    CORBA_SystemException(unsigned long minor, CORBA::CompletionStatus completed);
    CORBA_SystemException(unsigned long minor, CORBA::CompletionStatus completed, const char* reason);

    // Stores both, the minor code after the rule above. Deliberate: the rule does not ask what the
    // number means, so that an errno of 11 becomes 0x4f4d000b.
    // Pinned by SystemException/MinorCodeRule.DecidesWhatInitStores.
    void init(unsigned long minor, CORBA::CompletionStatus completed);

    // The minor code and the completion status, read and set as they are: the minor-code rule is left to
    // the constructors and `init`.
    unsigned long minor() const { return _minor; }
    void minor(unsigned long code) { _minor = code; }
    CORBA::CompletionStatus completed() const { return _completed; }
    void completed(CORBA::CompletionStatus status) { _completed = status; }

    // The explanation, owned by the exception; empty or null when there is none.
    const char* reason() const { return _reason.in(); }
    void reason(const char* text) { _reason = text; }

    // The description of the object's own class.
    const Description* _desc() const override;

    // The minor code and the completion status.
    void _write(KELostream& out) const override;

    // Reads what _write wrote; the minor-code rule is not applied.
    void _copy(KEListream& in) override;

    // The name, the explanation unless it is empty, the minor code and the completion status.
    void _pretty_print(KELostream& out) const override;

    // `e` as this class, or null when it is of another class or null.
    static CORBA_SystemException* _downcast(CORBA_Exception* e);
    static const CORBA_SystemException* _downcast(const CORBA_Exception* e);
    static CORBA_SystemException* _downcast(std::nullptr_t) { return nullptr; }

    // The description of this class.
    static Description _description;

private:
    unsigned long _minor;
    CORBA::CompletionStatus _completed;
    CORBA_String_var _reason;
};

// Implements a standard exception by what its class hands in: the description that names it and
// the factory that copies it.
class KEL_API KELStdException : public CORBA_SystemException {
public:
    // Minor code and status as for CORBA_SystemException. `d` and `factory` are those of the concrete class;
    // the description is not copied and must outlive the exception.
    KELStdException(unsigned long minor, CORBA::CompletionStatus completed, CORBA_Exception::Description& d,
                    CORBA_Exception* (*factory)());
    KELStdException(unsigned long minor, CORBA::CompletionStatus completed, const char* reason,
                    CORBA_Exception::Description& d, CORBA_Exception* (*factory)());

    // Minor code 0, COMPLETED_NO.
    KELStdException(CORBA_Exception::Description& d, CORBA_Exception* (*factory)());

    // The description that was handed in.
    const Description* _desc() const override;

    // Deliberate: throws a KELStdException, though it describes itself as the concrete class. The
    // concrete classes throw themselves.
    // Pinned by StdException.RaiseThrowsTheImplementationClassThatDescribesTheConcreteOne.
    void _raise() const override;

    // An object of the concrete class, made by the factory. Deliberate: the minor code is taken as
    // it is, without the rule. Pinned by StdException.DeepCopyDoesNotApplyTheMinorCodeRuleAgain.
    CORBA_Exception* _deep_copy() override;

private:
    CORBA_Exception::Description* _class;
    CORBA_Exception* (*_create)();
};

namespace CORBA {
typedef ::CORBA_SystemException SystemException;
}  // namespace CORBA

#endif
