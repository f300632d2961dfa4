// Wide strings as they cross the interfaces of an object request broker, and the holder that owns one.
//
//   CORBA::wstring_alloc, wstring_dup, wstring_free    where every such string comes from and goes to
//   CORBA_WString_var    CORBA::WString_var            owns one wide string
//   CORBA_WString_out    CORBA::WString_out            a parameter through which one is returned
//
//     CORBA::WString_var title = CORBA::wstring_dup(L"vesta");   // a wchar_t* is adopted
//     title = L"juno";                                           // a const wchar_t* is copied
//
// The functions may be called by any thread. A holder is used by one thread at a time.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CONTAINERS_WSTRINGS_H
#define KEL_CONTAINERS_WSTRINGS_H

#include <kel/config.h>
#include <kel/containers/strings.h>
#include <kel/fwd.h>

#include <iosfwd>

namespace CORBA {

// Room for `len` wide characters and a terminator; the contents are undefined. Never null:
// std::bad_alloc when there is no memory or the size does not fit an unsigned long. The caller frees
// it with wstring_free.
KEL_API wchar_t* wstring_alloc(unsigned long len);

// A copy of `s`, which the caller frees with wstring_free; null for null. Throws std::bad_alloc.
KEL_API wchar_t* wstring_dup(const wchar_t* s);

// Frees what wstring_alloc and wstring_dup gave; null is left alone.
KEL_API void wstring_free(wchar_t* s);

}  // namespace CORBA

// Owns a wide string made by wstring_alloc, or null. What copies may throw std::bad_alloc and then
// leaves the holder as it was. It takes over what is a `wchar_t*` itself and copies everything else.
class KEL_API CORBA_WString_var {
public:
    // Holds null.
    CORBA_WString_var() : _ptr(0) {}

    // Takes `p`, a wchar_t*, over; it may be null.
    template <class P, class = kel::internal::IfPointer<P, wchar_t>>
    CORBA_WString_var(const P& p) : _ptr(p) {}

    // Copies `s`; null stays null.
    CORBA_WString_var(const wchar_t* s) : _ptr(CORBA::wstring_dup(s)) {}
    CORBA_WString_var(const CORBA_WString_var& other) : _ptr(CORBA::wstring_dup(other._ptr)) {}

    // A null literal needs a cast, as for the narrow holder.
    CORBA_WString_var(std::nullptr_t) = delete;

    ~CORBA_WString_var() { CORBA::wstring_free(_ptr); }

    // Frees the held string and takes `p`, a wchar_t*, over.
    template <class P, class = kel::internal::IfPointer<P, wchar_t>>
    CORBA_WString_var& operator=(const P& p) {
        if (p != _ptr) CORBA::wstring_free(_ptr);
        _ptr = p;
        return *this;
    }

    // Copies `s`, which may lie within the held string, then frees the held string.
    CORBA_WString_var& operator=(const wchar_t* s) { return *this = CORBA::wstring_dup(s); }
    CORBA_WString_var& operator=(const CORBA_WString_var& other) { return *this = other.in(); }

    // The held string, still owned by the holder.
    operator wchar_t*() { return _ptr; }
    operator const wchar_t*() const { return _ptr; }

    // A character of the held string, which must not be null; the index is of any integer type.
    template <class Index>
    wchar_t& operator[](Index i) {
        return _ptr[i];
    }
    template <class Index>
    const wchar_t& operator[](Index i) const {
        return _ptr[i];
    }

    // The held string for a callee that reads it; the holder keeps it.
    const wchar_t* in() const { return _ptr; }

    // The held pointer for a callee that may free and replace the string.
    wchar_t*& inout() { return _ptr; }

    // A null pointer for a callee that stores a string; what was held is freed first.
    wchar_t*& out() {
        *this = static_cast<wchar_t*>(0);
        return _ptr;
    }

    // The held string, which now belongs to the caller; the holder is left with null.
    wchar_t* _retn() {
        wchar_t* const p = _ptr;
        _ptr = 0;
        return p;
    }

private:
    wchar_t* _ptr;
};

// A `wchar_t*` or a holder as an out parameter. Construction sets what it refers to to null (and
// frees what a holder held); assignment stores a string that the caller will free: a `wchar_t*`
// itself, anything else as a copy.
class KEL_API CORBA_WString_out {
public:
    // Refers to `p`, or to what `holder` or `other` refers to; only the last keeps what is there.
    CORBA_WString_out(wchar_t*& p) : _ptr(p) { _ptr = 0; }
    CORBA_WString_out(CORBA_WString_var& holder) : _ptr(holder.out()) {}
    CORBA_WString_out(const CORBA_WString_out& other) : _ptr(other._ptr) {}

    // Stores what `other` refers to, without a copy.
    CORBA_WString_out& operator=(const CORBA_WString_out& other) {
        _ptr = other._ptr;
        return *this;
    }
    template <class P, class = kel::internal::IfPointer<P, wchar_t>>
    CORBA_WString_out& operator=(const P& p) {
        _ptr = p;
        return *this;
    }
    // Stores a copy of `s`; std::bad_alloc when there is no memory.
    CORBA_WString_out& operator=(const wchar_t* s) {
        _ptr = CORBA::wstring_dup(s);
        return *this;
    }
    // The string would have two owners.
    CORBA_WString_out& operator=(const CORBA_WString_var&) = delete;

    // The pointer that it refers to.
    operator wchar_t*&() { return _ptr; }
    wchar_t*& ptr() { return _ptr; }

    // The text L"(nil)".
    static wchar_t* _nil;

private:
    wchar_t*& _ptr;
};

namespace CORBA {
typedef CORBA_WString_var WString_var;
typedef CORBA_WString_out WString_out;
}  // namespace CORBA

// Null is equal to null and comes before every other string; two strings give what wcscmp gives.
KEL_API int compare(const CORBA_WString_var& a, const CORBA_WString_var& b);

// A number from 0 to 0x7fffffff made of the length and of the first character's low byte alone.
KEL_API unsigned long _kel_hash(const CORBA_WString_var& w);

// Frees the held string and lets the stream read the next one straight into the holder.
KEL_API KEListream& operator>>(KEListream& in, CORBA_WString_var& w);

// Writes the address of the string, not its characters.
KEL_API std::ostream& operator<<(std::ostream& o, const CORBA_WString_var& w);

#endif
