// The root of the exception tree, and the registry that creates an exception from its
// repository id.
//
//   CORBA_Exception                the root: what every exception can say, write, read and throw
//   CORBA_Exception::Description   one object per class: its names, factory, base and type code
//   CORBA_Exception_var            owns an exception on the heap
//   CORBA_UserException            the base of exceptions a caller is expected to handle
//   KELRemarshal                   marks a request that is to be marshalled again
//
// An exception is thrown by value. `_raise` throws a copy of the object it is called on, typed as
// the object's own class; `_deep_copy` makes a copy on the heap and CORBA::release deletes it.
//
//     CORBA_Exception* e = 0;
//     in >> e;                       // creates whatever class the repository id names
//     CORBA_Exception_var hold(e);
//     e->_raise();
//
// A library that defines exception classes defines one static Description for each, and so
// registers it when it is loaded:
//
//     CORBA_Exception::Description Full::_description(
//         "Full", "IDL:example.org/Full:1.0", Full::_factory, &CORBA_UserException::_description, 0);
//
// The registry has no lock. It changes only while a description is constructed or destroyed, that
// is while libraries are loaded and unloaded; between these any thread may look up. An exception
// object belongs to one thread at a time.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_EXCEPTION_H
#define KEL_EXCEPTIONS_EXCEPTION_H

#include <kel/config.h>
#include <kel/fwd.h>

#include <cstddef>
#include <iosfwd>
#include <type_traits>

class KEL_API CORBA_Exception {
public:
    // What the registry knows of one exception class. The object's address is the identity of the
    // class, so there is exactly one per class, with static storage.
    class KEL_API Description {
    public:
        // Makes a default instance on the heap, which the caller releases with CORBA::release.
        typedef CORBA_Exception* (*Factory)();

        // Registers the description under `repository_id`. The texts are not copied and must
        // outlive the description. `create` makes a default instance on the heap and is null for
        // abstract classes; `base` is null at the root. When DEBUG_STATIC was in the environment
        // at the first construction of the process, every construction is reported on std::cout.
        // Deliberate: the first description of an id wins, the newcomer silently stays
        // unregistered. Pinned by Registry.FirstDescriptionOfAnIdWins.
        Description(const char* name, const char* repository_id, Factory create, const Description* base,
                    const CORBA_TypeCode* type_code);

        // Deliberate: removes whatever is registered under this repository id, be it this
        // description or the one that came first.
        // Pinned by Registry.DestroyingASecondDescriptionRemovesTheFirstOnesEntry.
        virtual ~Description();

        Description(const Description&) = delete;
        Description& operator=(const Description&) = delete;

        const char* name() const { return _name; }                    // "CORBA::BAD_PARAM"
        const char* repository_id() const { return _repository_id; }  // "IDL:omg.org/CORBA/BAD_PARAM:1.0"
        // What was given to the constructor: the factory of an abstract class is null, and the base of
        // the root.
        Factory factory() const { return _factory; }
        const Description* base() const { return _base; }

        // The ORB's type code of the class; null until the ORB has stored one. Borrowed.
        const CORBA_TypeCode* type_code() const { return _type_code; }
        void type_code(const CORBA_TypeCode* tc) { _type_code = tc; }

        // The description registered under `repository_id`, or null. Any thread.
        static const Description* desc(const char* repository_id);

        // Whether the class is `target` or derives from it. Deliberate: compares the objects, not
        // their ids. Pinned by CanCast.ComparesTheObjectsAndNotTheirIds.
        bool can_cast(const Description& target) const;

    private:
        static const char* printable_name(const Description& description);
        void trace() const;
        void enter();

        const char* _name;
        const char* _repository_id;
        Factory _factory;
        const Description* _base;
        const CORBA_TypeCode* _type_code;
    };

    CORBA_Exception() = default;
    CORBA_Exception(const CORBA_Exception&) = default;
    CORBA_Exception& operator=(const CORBA_Exception&) = default;
    virtual ~CORBA_Exception();

    // The description of the object's own class.
    virtual const Description* _desc() const;

    // The body as it travels, without the repository id. Empty here.
    virtual void _write(KELostream& out) const;
    virtual void _copy(KEListream& in);

    // Writes the exception for a human reader, one fact a line.
    virtual void _pretty_print(KELostream& out) const;

    // Throws a copy of this exception, typed as the class that implements the operation.
    virtual void _raise() const = 0;

    // A copy on the heap. The caller releases it with CORBA::release.
    virtual CORBA_Exception* _deep_copy() = 0;

    // The texts of `_desc()`; borrowed.
    virtual const char* _name() const;
    virtual const char* _repository_id() const;

    // The description of this class.
    static Description _description;
};

// Owns an exception that was created on the heap; null is nothing to own. What deletes it is not in line: of
// plug-ins opened with RTLD_GLOBAL the later ones would use the copy of the first, and keep that loaded.
class KEL_API CORBA_Exception_var {
public:
    // Takes `e`, which may be null, over.
    CORBA_Exception_var(CORBA_Exception* e = nullptr) : _exception(e) {}
    ~CORBA_Exception_var();

    CORBA_Exception_var(const CORBA_Exception_var&) = delete;
    CORBA_Exception_var& operator=(const CORBA_Exception_var&) = delete;

    // Deletes the held exception and adopts `e`. Adopting what is held already changes nothing.
    CORBA_Exception_var& operator=(CORBA_Exception* e);

    // The held exception, which must not be null.
    CORBA_Exception* operator->() const { return _exception; }

    // The held exception or null, for a callee that reads it.
    CORBA_Exception* in() const { return _exception; }
    // The held pointer, for a callee that may release and replace the exception.
    CORBA_Exception*& inout() { return _exception; }
    CORBA_Exception*& out();   // deletes the held exception first
    CORBA_Exception* _retn();  // hands the exception over to the caller

private:
    CORBA_Exception* _exception;
};

// The base of every exception that an interface declares. `_raise` and `_deep_copy` stay pure.
class KEL_API CORBA_UserException : public CORBA_Exception {
public:
    // The description of the object's own class.
    const Description* _desc() const override;

    // `e` as this class, or null when it is of another class or null.
    static CORBA_UserException* _downcast(CORBA_Exception* e);
    static const CORBA_UserException* _downcast(const CORBA_Exception* e);
    static CORBA_UserException* _downcast(std::nullptr_t) { return nullptr; }

    // The description of this class.
    static Description _description;
};

// Tells the code that sends requests to marshal one again. The library defines and registers it
// and never throws it itself.
class KEL_API KELRemarshal : public CORBA_UserException {
public:
    // The description of the object's own class.
    const Description* _desc() const override;
    void _raise() const override;
    CORBA_Exception* _deep_copy() override;

    // A KELRemarshal on the heap, released with CORBA::release.
    static CORBA_Exception* _factory();

    // `e` as this class, or null when it is of another class or null.
    static KELRemarshal* _downcast(CORBA_Exception* e);
    static const KELRemarshal* _downcast(const CORBA_Exception* e);
    static KELRemarshal* _downcast(std::nullptr_t) { return nullptr; }

    // The description of this class.
    static Description _description;
};

// Writes the repository id and then the body.
KEL_API KELostream& operator<<(KELostream& out, const CORBA_Exception& e);

// Reads a repository id, creates the exception it names and reads the body. The caller owns `e`.
// Deliberate: an id that is unknown, or that belongs to an abstract class, gives CORBA::UNKNOWN and
// leaves the body unread in the stream, which is then out of step. Pinned by
// ExceptionStreams.UnknownIdLeavesTheBodyUnread.
// Deliberate: `e` is set before the body is read, so the caller owns it also when that throws.
// Pinned by ExceptionStreams.CallerOwnsTheExceptionWhenTheBodyCannotBeRead.
KEL_API KEListream& operator>>(KEListream& in, CORBA_Exception*& e);

// Deliberate: the stream's identity decides the form. std::cout, std::cerr and std::clog get
// `_pretty_print`, every other stream the marshalled body without the repository id.
// Pinned by ExceptionStreams.OtherStreamsGetTheBodyWithoutTheRepositoryId.
KEL_API std::ostream& operator<<(std::ostream& os, const CORBA_Exception& e);

namespace CORBA {

typedef ::CORBA_TypeCode TypeCode;
typedef ::CORBA_Exception Exception;
typedef ::CORBA_Exception_var Exception_var;
typedef ::CORBA_UserException UserException;

// Deletes an exception that was created on the heap. Null is allowed.
KEL_API void release(CORBA_Exception* e);
template <class Null, class = typename std::enable_if<std::is_same<Null, std::nullptr_t>::value>::type>
inline void release(Null) {}  // a null without a type, whatever else may be released

}  // namespace CORBA

#endif
