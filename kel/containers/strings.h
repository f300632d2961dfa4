// Strings as they cross the interfaces of an object request broker, and the holder that owns one.
//
//   CORBA::string_alloc, string_dup, string_free    where every such string comes from and goes to
//   CORBA::hash                                     the 31-bit hash of a string
//   CORBA_String_var    CORBA::String_var           owns one string and reuses its buffer
//   CORBA_String_out    CORBA::String_out           a parameter through which a string is returned
//   KELStringWrapper                                a borrowed string as the key of a dictionary
//
//     CORBA::String_var name = CORBA::string_dup("vesta");   // a char* is adopted
//     name = "juno";                                         // a const char* is copied
//     resolve(name.in());                                    // released when name goes out of scope
//
// The functions may be called by any thread. A holder is used by one thread at a time.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CONTAINERS_STRINGS_H
#define KEL_CONTAINERS_STRINGS_H

#include <kel/config.h>
#include <kel/fwd.h>

#include <iosfwd>
#include <type_traits>

namespace CORBA {

// Room for `len` characters and a terminator; the contents are undefined. Never null: std::bad_alloc
// when there is no memory, also for the length whose terminator no longer fits an unsigned long.
// The caller frees it with string_free.
KEL_API char* string_alloc(unsigned long len);

// A copy of `s`, which the caller frees with string_free; null for null. Throws std::bad_alloc.
KEL_API char* string_dup(const char* s);

// Frees what string_alloc and string_dup gave. Null and the empty string of a default-constructed
// holder are left alone.
KEL_API void string_free(char* s);

// A number from 0 to 0x7fffffff, the same at every word size; 0 for null and for "".
KEL_API unsigned long hash(const char* s);

}  // namespace CORBA

namespace kel {
namespace internal {

// Exists when P is a pointer to Character and nothing that merely converts to one.
template <class P, class Character>
using IfPointer = typename std::enable_if<std::is_same<P, Character*>::value>::type;

}  // namespace internal
}  // namespace kel

// Owns a string made by string_alloc, or null.
//
// It takes over what is a `char*` itself. Everything else is copied: a `const char*`, a literal, an
// array, which is nobody's to free, and what a CORBA_String_out refers to, which has an owner.
//
// A buffer that the holder allocated itself is reused by later assignments that fit; one whose size
// it does not know never is. Every constructor and assignment that copies may throw std::bad_alloc
// and then leaves the holder as it was.
class KEL_API CORBA_String_var {
public:
    // Holds an empty string that costs no memory.
    CORBA_String_var() noexcept;

    // Takes `p`, a char*, over; it may be null.
    template <class P, class = kel::internal::IfPointer<P, char>>
    CORBA_String_var(const P& p) : _ptr(p), _capacity(0) {}

    // Copies `s`; null stays null.
    CORBA_String_var(const char* s);
    CORBA_String_var(const CORBA_String_var& other);

    // A null literal needs a cast. `flag ? holder : 0` would be a copy of the holder and the pointer
    // taken from it would dangle.
    CORBA_String_var(std::nullptr_t) = delete;

    ~CORBA_String_var() { CORBA::string_free(_ptr); }

    // Frees the held string and takes `p`, a char*, over.
    template <class P, class = kel::internal::IfPointer<P, char>>
    CORBA_String_var& operator=(const P& p) {
        return adopt(p);
    }

    // Copies `s`, which may lie within the held string. A buffer that is large enough is reused and
    // keeps its capacity. Null frees the held string.
    CORBA_String_var& operator=(const char* s);
    CORBA_String_var& operator=(const CORBA_String_var& other) { return *this = other.in(); }

    // The held string, still owned by the holder. The first returns by value: a reference would
    // compete with the holder's own extractor in `stream >> var`. In `flag ? var : "text"` both sides
    // become a temporary holder: use in() there.
    operator char*() { return _ptr; }
    operator const char*() const { return _ptr; }

    // A character of the held string, which must not be null. Any integer type will do: with one
    // fixed type other indices would be ambiguous with indexing the converted pointer.
    template <class Index>
    char& operator[](Index i) {
        return _ptr[i];
    }
    template <class Index>
    const char& operator[](Index i) const {
        return _ptr[i];
    }

    // The held string for a callee that reads it; the holder keeps it.
    const char* in() const { return _ptr; }

    // The held pointer for a callee that may free and replace the string.
    char*& inout() {
        _capacity = 0;
        return _ptr;
    }

    // A null pointer for a callee that stores a string; what was held is freed first.
    char*& out() {
        *this = static_cast<char*>(0);
        return _ptr;
    }

    // The held string, which now belongs to the caller; the holder is left with null.
    char* _retn() {
        char* const p = _ptr;
        _ptr = 0;
        _capacity = 0;
        return p;
    }

    // Whether a zero length read from a binary stream means null (1, the initial choice) or is
    // refused with CORBA::MARSHAL (0). One choice for the process, made before strings are read.
    static void allowing_null_string(unsigned char on) { _allowing_null_string = on; }

    // What allowing_null_string() stored.
    static unsigned char _allowing_null_string;

private:
    friend KEL_API KEListream& operator>>(KEListream& in, CORBA_String_var& s);

    CORBA_String_var& adopt(char* p);

    char* _ptr;
    unsigned long _capacity;  // bytes of _ptr that may be written, terminator included; 0 = unknown
};

// A `char*` or a holder as an out parameter. Construction sets what it refers to to null (and frees
// what a holder held); assignment stores a string that the caller will free: a `char*` itself,
// anything else as a copy.
class KEL_API CORBA_String_out {
public:
    // Refers to `p`, or to what `holder` or `other` refers to; only the last keeps what is there.
    CORBA_String_out(char*& p) : _ptr(p) { _ptr = 0; }
    CORBA_String_out(CORBA_String_var& holder) : _ptr(holder.out()) {}
    CORBA_String_out(const CORBA_String_out& other) : _ptr(other._ptr) {}

    // Stores what `other` refers to, without a copy.
    CORBA_String_out& operator=(const CORBA_String_out& other) {
        _ptr = other._ptr;
        return *this;
    }
    template <class P, class = kel::internal::IfPointer<P, char>>
    CORBA_String_out& operator=(const P& p) {
        _ptr = p;
        return *this;
    }
    // Stores a copy of `s`; std::bad_alloc when there is no memory.
    CORBA_String_out& operator=(const char* s) {
        _ptr = CORBA::string_dup(s);
        return *this;
    }
    // The string would have two owners.
    CORBA_String_out& operator=(const CORBA_String_var&) = delete;

    // The pointer that it refers to.
    operator char*&() { return _ptr; }
    char*& ptr() { return _ptr; }

    // The text "(nil)".
    static char* _nil;

private:
    char*& _ptr;
};

// A string as the key of a dictionary. It is not copied and must outlive the wrapper; null is a key
// of its own.
class KEL_API KELStringWrapper {
public:
    // Borrows `s`, which may be null.
    KELStringWrapper(const char* s) : _ptr(s) {}

    // The borrowed string.
    const char* in() const { return _ptr; }

private:
    const char* _ptr;
};

namespace CORBA {
typedef CORBA_String_var String_var;
typedef CORBA_String_out String_out;
}  // namespace CORBA

// Null is equal to null and comes before every other string; two strings give what strcmp gives.
KEL_API int compare(const CORBA_String_var& a, const CORBA_String_var& b);
KEL_API int compare(const KELStringWrapper& a, const KELStringWrapper& b);

// CORBA::hash of the string.
inline unsigned long _kel_hash(const CORBA_String_var& s) { return CORBA::hash(s.in()); }
inline unsigned long _kel_hash(const KELStringWrapper& s) { return CORBA::hash(s.in()); }

// Reads a string. A text stream reads it its own way. A binary stream delivers a length, which
// counts the terminator, and that many bytes: a buffer of known size that can take them is reused.
// The result always ends with a zero, whatever the peer sent. Throws CORBA::MARSHAL for a zero
// length where null is not allowed and std::bad_alloc, both with the holder unchanged; when the
// stream's own read throws, the holder has null or "".
KEL_API KEListream& operator>>(KEListream& in, CORBA_String_var& s);

// Writes the text, or "(null)".
KEL_API std::ostream& operator<<(std::ostream& o, const CORBA_String_var& s);

#endif
