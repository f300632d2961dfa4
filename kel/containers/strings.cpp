// SPDX-License-Identifier: MIT
#include <kel/containers/internal/free_string.h>
#include <kel/containers/strings.h>
#include <kel/exceptions/raise.h>
#include <kel/streams/istream.h>

#include <climits>
#include <cstring>
#include <iostream>
#include <new>

namespace {

std::ios_base::Init iostream_init;

char* const kEmptyString = kel::internal::empty_string;

int compare_text(const char* a, const char* b) {
    if (a == 0) return b == 0 ? 0 : -1;
    if (b == 0) return 1;
    return std::strcmp(a, b);
}

// A byte of 0x80 and above fills the upper bits with ones.
std::uint32_t widened(char c) { return static_cast<std::uint32_t>(static_cast<signed char>(c)); }

// A length from a peer may be any number. What no string of a 32-bit process can hold is refused at
// 64 bits too, so that a false length ends alike at both widths.
const unsigned long largest_string = 0x7fffffff;

// Room for `len` characters and a terminator, an empty string for the time being.
char* alloc_empty(unsigned long len) {
    if (len >= largest_string) throw std::bad_alloc();
    char* const s = CORBA::string_alloc(len);
    s[0] = 0;
    return s;
}

// Not in line: for this variable, whose address is taken, the compiler would have text guard its stack as
// well.
__attribute__((noinline)) unsigned long read_length(KEListream& in) {
    unsigned long n = 0;
    in >> n;
    return n;
}

// Reads `n` bytes into `buffer`, which has room for `capacity`, and makes a string of them even when
// the peer sent no terminator or the stream throws.
void read_terminated(KEListream& in, char* buffer, unsigned long capacity, unsigned int n) {
    try {
        in.get(buffer, n);
    } catch (...) {
        buffer[0] = 0;
        throw;
    }
    if (std::memchr(buffer, 0, n) == 0) buffer[n < capacity ? n : n - 1] = 0;
}

}  // namespace

char kel::internal::empty_string[1] = "";

char* CORBA_String_out::_nil = const_cast<char*>("(nil)");
unsigned char CORBA_String_var::_allowing_null_string = 1;

char* CORBA::string_alloc(unsigned long len) {
    if (len == ULONG_MAX) throw std::bad_alloc();
    return new char[len + 1];
}

char* CORBA::string_dup(const char* s) {
    if (s == 0) return 0;
    const unsigned long len = std::strlen(s);
    return static_cast<char*>(std::memcpy(string_alloc(len), s, len + 1));
}

void CORBA::string_free(char* s) { kel::internal::free_string(s); }

unsigned long CORBA::hash(const char* s) {
    if (s == 0) return 0;
    // Two characters a step: each waits for the one before it, which takes half as long this way.
    std::uint32_t h = 0;
    for (; *s != 0; s += 2) {
        if (s[1] == 0) {
            h = (h << 1) ^ widened(s[0]);
            break;
        }
        h = (h << 2) ^ (widened(s[0]) << 1) ^ widened(s[1]);
    }
    return h & 0x7fffffff;
}

CORBA_String_var::CORBA_String_var() noexcept : _ptr(kEmptyString), _capacity(0) {}

CORBA_String_var::CORBA_String_var(const char* s)
    : _ptr(CORBA::string_dup(s)), _capacity(s != 0 ? std::strlen(s) + 1 : 0) {}

CORBA_String_var::CORBA_String_var(const CORBA_String_var& other) : CORBA_String_var(other.in()) {}

CORBA_String_var& CORBA_String_var::adopt(char* p) {
    if (p != _ptr) CORBA::string_free(_ptr);
    _ptr = p;
    _capacity = 0;
    return *this;
}

CORBA_String_var& CORBA_String_var::operator=(const char* s) {
    if (s == 0) return *this = static_cast<char*>(0);
    const unsigned long size = std::strlen(s) + 1;
    if (_capacity >= size) {
        std::memmove(_ptr, s, size);
        return *this;
    }
    *this = CORBA::string_dup(s);
    _capacity = size;
    return *this;
}

// Deliberate: strcmp's result is handed on as it is. Pinned by
// Strings.CompareHandsOnWhatStrcmpReturns.
int compare(const CORBA_String_var& a, const CORBA_String_var& b) { return compare_text(a.in(), b.in()); }
int compare(const KELStringWrapper& a, const KELStringWrapper& b) { return compare_text(a.in(), b.in()); }

KEListream& operator>>(KEListream& in, CORBA_String_var& s) {
    if (!in.istrm_is_null()) {
        in >> s.out();
        return in;
    }

    const unsigned long n = read_length(in);
    if (n == 0) {
        // Deliberate: a zero length is null and not "". Pinned by
        // BinaryStrings.ZeroLengthReadsAsNullByDefault.
        if (!CORBA_String_var::_allowing_null_string) kel::internal::raise_marshal();
        s = static_cast<char*>(0);
        return in;
    }
    if (n > s._capacity || s._ptr == 0) {
        s = alloc_empty(n);
        s._capacity = n + 1;
    }
    read_terminated(in, s._ptr, s._capacity, static_cast<unsigned int>(n));
    return in;
}

std::ostream& operator<<(std::ostream& o, const CORBA_String_var& s) {
    return o << (s.in() != 0 ? s.in() : "(null)");
}
