// SPDX-License-Identifier: MIT
#include <errno.h>
#include <kel/containers/strings.h>
#include <kel/exceptions/explain.h>
#include <kel/exceptions/internal/status.h>
#include <kel/exceptions/standard.h>

#include <cstdio>
#include <string>

namespace {

// A minor code of 32 bits: the upper 20 say who assigned it, the rest is the code.
const unsigned long code_bits = 0xfff;
const unsigned long own_set = 0x4b450000;

struct MinorWords {
    const CORBA_Exception::Description* exception;
    unsigned long minor;
    const char* source;
    const char* words;
};

#define KEL_OMG_MINOR(X, code, words) {&CORBA_##X::_description, CORBA::OMGVMCID | (code), "OMG", words},
#define KEL_OWN_MINOR(X, minor, words) {&CORBA_##X::_description, minor, "kel", words},
const MinorWords minors[] = {
#include <kel/exceptions/internal/minors.inc>
};
#undef KEL_OMG_MINOR
#undef KEL_OWN_MINOR

struct NumberWords {
    long number;
    const char* name;
    const char* words;
};

#define KEL_ERRNO(name, words) {name, #name, words},
const NumberWords errnos[] = {
#include <kel/exceptions/internal/errno.inc>
};
#undef KEL_ERRNO

#define KEL_RESOLVER(name, number, words) {number, #name, words},
const NumberWords resolver_codes[] = {
#include <kel/exceptions/internal/resolver.inc>
};
#undef KEL_RESOLVER

// The exceptions that socket calls and name look-ups end in.
bool is_of_the_network(const CORBA_Exception::Description& d) {
    return d.can_cast(CORBA_TRANSIENT::_description) || d.can_cast(CORBA_COMM_FAILURE::_description);
}

void add_meaning(std::string& meanings, const std::string& meaning) {
    if (!meanings.empty()) meanings += "; or ";
    meanings += meaning;
}

// Adds the words for `number`, if it is in the table.
template <std::size_t N>
void add_number(std::string& meanings, const char* source, long number, const NumberWords (&table)[N]) {
    for (const NumberWords& row : table) {
        if (row.number != number) continue;
        char decimal[24];
        std::snprintf(decimal, sizeof decimal, " %ld ", number);
        add_meaning(meanings, std::string(source) + decimal + row.name + ", " + row.words);
    }
}

// Everything that the minor code can mean in this exception.
std::string meanings_of(const CORBA_Exception::Description& d, unsigned long minor) {
    std::string meanings;
    for (const MinorWords& row : minors) {
        if (row.minor != minor || !d.can_cast(*row.exception)) continue;
        add_meaning(meanings, std::string(row.source) + ", " + row.words);
    }
    const bool network = is_of_the_network(d);
    if ((minor & ~code_bits) == CORBA::OMGVMCID &&
        (network || d.can_cast(CORBA_NO_RESOURCES::_description))) {
        add_number(meanings, "errno", static_cast<long>(minor & code_bits), errnos);
    }
    // The resolver's codes are negative; a minor code holds their 32 bits.
    if (network && minor <= 0xffffffff) {
        const auto code = static_cast<std::int32_t>(static_cast<std::uint32_t>(minor));
        add_number(meanings, "resolver", code, resolver_codes);
    }
    return meanings.empty() ? "no words for this code" : meanings;
}

const char* owner_of(unsigned long set) {
    if (set == CORBA::OMGVMCID) return " OMG";
    return set == own_set ? " kel" : "";
}

std::string numbers_of(unsigned long minor) {
    const unsigned long set = minor & ~code_bits;
    char text[96];  // at most three numbers of 16 digits
    std::snprintf(text, sizeof text, "minor 0x%08lx (vendor set 0x%08lx%s, code 0x%03lx)", minor, set,
                  owner_of(set), minor & code_bits);
    return text;
}

// `text` without what would break the line or the terminal.
std::string in_one_line(const char* text) {
    std::string line(text);
    for (char& c : line) {
        if (static_cast<unsigned char>(c) < ' ' || c == 0x7f) c = ' ';
    }
    return line;
}

}  // namespace

char* kel_explain(const CORBA_Exception& e) {
    const char* const id = e._repository_id();
    std::string line(id != nullptr ? id : "(null)");
    const CORBA_SystemException* const system = CORBA_SystemException::_downcast(&e);
    if (system != nullptr) {
        line += ": " + numbers_of(system->minor()) + ": " + meanings_of(*e._desc(), system->minor());
        line += std::string("; completion status ") + kel::internal::status_text(system->completed());
        const char* const reason = system->reason();
        if (reason != nullptr && *reason != '\0') line += "; " + in_one_line(reason);
    }
    return CORBA::string_dup(line.c_str());
}
