// SPDX-License-Identifier: MIT
#include <kel/containers/wstrings.h>
#include <kel/streams/istream.h>

#include <climits>
#include <cwchar>
#include <new>
#include <ostream>

wchar_t* CORBA_WString_out::_nil = const_cast<wchar_t*>(L"(nil)");

wchar_t* CORBA::wstring_alloc(unsigned long len) {
    if (len == ULONG_MAX) throw std::bad_alloc();
    return new wchar_t[len + 1];
}

wchar_t* CORBA::wstring_dup(const wchar_t* s) {
    if (s == 0) return 0;
    return std::wcscpy(wstring_alloc(std::wcslen(s)), s);
}

void CORBA::wstring_free(wchar_t* s) { delete[] s; }

int compare(const CORBA_WString_var& a, const CORBA_WString_var& b) {
    if (a.in() == 0) return b.in() == 0 ? 0 : -1;
    if (b.in() == 0) return 1;
    return std::wcscmp(a, b);
}

// Deliberate: the first character alone is mixed in, once for each character there is, and of it only
// the low byte. Stored tables agree on these values. Pinned by
// WideStrings.HashSeesTheLengthAndTheFirstCharacterOnly.
unsigned long _kel_hash(const CORBA_WString_var& w) {
    if (w.in() == 0) return 0;
    const std::uint32_t first = static_cast<std::uint32_t>(static_cast<signed char>(w[0]));
    std::uint32_t h = 0;
    for (std::size_t n = std::wcslen(w); n != 0; --n) h = (h << 1) ^ first;
    return h & 0x7fffffff;
}

KEListream& operator>>(KEListream& in, CORBA_WString_var& w) {
    in >> w.out();
    return in;
}

// Deliberate: the address of the characters, since a narrow stream cannot take them. Pinned by
// WideStrings.PrintsTheAddressOfTheCharacters.
std::ostream& operator<<(std::ostream& o, const CORBA_WString_var& w) {
    return o << static_cast<const void*>(w.in() != 0 ? w.in() : L"(null)");
}
