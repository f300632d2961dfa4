// Exceptions built from a repository id: any text gives the class that its id names, or UNKNOWN, and
// whatever came out can be copied, raised, written and read again.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <iterator>
#include <typeinfo>

#include "fuzz/quoted_text.h"
#include "fuzz/standard_streams.h"
#include "fuzz/target.h"

namespace kel {
namespace fuzz {
namespace {

// An exception as a client defines one, whose body may turn out to be wrong.
class Refusal : public CORBA_UserException {
public:
    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new Refusal(*this); }
    void _write(KELostream& out) const override { out << _why.in() << _level; }
    void _copy(KEListream& in) override {
        in >> _why;
        in >> _level;
        if (_level < 0) throw CORBA_MARSHAL();
    }
    static CORBA_Exception* create() { return new Refusal; }

    CORBA_String_var _why;
    short _level = 0;

    static Description _description;
};
CORBA_Exception::Description Refusal::_description("Refusal", "IDL:example.org/Refusal:1.0", Refusal::create,
                                                   &CORBA_UserException::_description, nullptr);

struct Known {
    const char* id;
    const char* name;
    const CORBA_Exception::Description* description;
};

const Known known[] = {
#define KEL_STANDARD_EXCEPTION(X) {"IDL:omg.org/CORBA/" #X ":1.0", "CORBA::" #X, &CORBA_##X::_description},
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
    {"IDL:kel.internal/KELRemarshal:1.0", "KELRemarshal", &KELRemarshal::_description},
    {"IDL:example.org/Refusal:1.0", "Refusal", &Refusal::_description},
};

// Lengths beyond the input are false; few of them are worth the time to fill a large block.
constexpr std::size_t usual_limit = 2 * 1024;

const char long_reason[] =
    "a reason that is too long to be copied into the memory that is left when it has to be";
constexpr std::size_t little_memory = 64;  // enough for an exception and for a short reason
static_assert(sizeof(KELStdException) <= little_memory && sizeof long_reason > little_memory, "as it says");

Complaints complaints;

// The class that a peer may name by `id`; the first is UNKNOWN.
const Known& named(const char* id) {
    for (const Known& candidate : known) {
        if (std::strcmp(candidate.id, id) == 0) return candidate;
    }
    return known[0];
}

// The text of the repository id that was expected last, up to its first zero.
const char* expected_id(const Quoted& text) {
    static char id[sizeof expected_bytes + 1];
    std::copy_n(expected_bytes, text.stored, id);
    id[text.stored] = '\0';
    return text.filled != 0 && std::strlen(id) == text.stored ? "" : id;
}

bool same_text(const char* a, const char* b) {
    return a == nullptr || b == nullptr ? a == b : std::strcmp(a, b) == 0;
}

// ---- what came out ----

bool alike(const CORBA_Exception& a, const CORBA_Exception& b) {
    if (a._desc() != b._desc() || typeid(a) != typeid(b)) return false;
    const CORBA_SystemException* const system = CORBA_SystemException::_downcast(&a);
    if (system != nullptr) {
        const CORBA_SystemException* const other = CORBA_SystemException::_downcast(&b);
        return system->minor() == other->minor() && system->completed() == other->completed();
    }
    if (a._desc() != &Refusal::_description) return true;
    const Refusal& refusal = static_cast<const Refusal&>(a);
    const Refusal& other = static_cast<const Refusal&>(b);
    return same_text(refusal._why.in(), other._why.in()) && refusal._level == other._level;
}

void check_class(CORBA_Exception* e, const Known& expected) {
    KEL_REQUIRE(e->_desc() == expected.description);
    KEL_REQUIRE(same_text(e->_name(), expected.name) && same_text(e->_repository_id(), expected.id));
    const bool user = expected.description->base() == &CORBA_UserException::_description;
    KEL_REQUIRE((CORBA_UserException::_downcast(e) != nullptr) == user);
    KEL_REQUIRE((CORBA_SystemException::_downcast(e) != nullptr) != user);
    const bool bad_param = expected.description == &CORBA_BAD_PARAM::_description;
    KEL_REQUIRE((CORBA_BAD_PARAM::_downcast(e) != nullptr) == bad_param);
}

// A copy is alike, or there is no memory for its reason and nothing is left of it.
void check_copy(CORBA_Exception& e) {
    CORBA_SystemException* const system = CORBA_SystemException::_downcast(&e);
    const char* const reason = system == nullptr ? nullptr : system->reason();
    const bool too_long = reason != nullptr && std::strlen(reason) >= largest_block;
    try {
        const CORBA_Exception_var copy(e._deep_copy());
        KEL_REQUIRE(!too_long && alike(*copy.in(), e));
        if (system == nullptr) return;
        KEL_REQUIRE(same_text(CORBA_SystemException::_downcast(copy.in())->reason(), reason));
    } catch (const std::bad_alloc&) {
        KEL_REQUIRE(too_long || system == nullptr);
    }
}

void check_raise(const CORBA_Exception& e) {
    try {
        e._raise();
        KEL_REQUIRE(!"raised");
    } catch (const CORBA_SystemException& thrown) {
        KEL_REQUIRE(alike(thrown, e));
        KEL_REQUIRE(same_text(thrown.reason(), CORBA_SystemException::_downcast(&e)->reason()));
    } catch (const CORBA_UserException& thrown) {
        KEL_REQUIRE(alike(thrown, e));
    } catch (const std::bad_alloc&) {
        KEL_REQUIRE(largest_block == little_memory);
    }
}

void check_round_trip(const CORBA_Exception& e) {
    TextOutput written;
    KELostream out(written.stream);
    out << e;
    TextInput source(written.written(), Form());
    KEListream in(source.stream);
    CORBA_Exception_var found;
    in >> found.out();
    KEL_REQUIRE(alike(*found.in(), e) && source.taken() == written.written().size());
}

void check_print(const CORBA_Exception& e) {
    TextOutput printed;
    KELostream out(printed.stream);
    e._pretty_print(out);
    KEL_REQUIRE(printed.written().find(e._name()) != std::string_view::npos);
    const CORBA_SystemException* const system = CORBA_SystemException::_downcast(&e);
    if (system == nullptr) return;
    const char* const texts[] = {"\"YES\"", "\"NO\"", "\"MAYBE\"", "\"Invalid status\""};
    const std::string_view status = texts[std::min<std::uint32_t>(system->completed(), 3)];
    KEL_REQUIRE(printed.written().find(status) != std::string_view::npos);
}

void examine(CORBA_Exception& e, std::uint8_t choice) {
    if ((choice & 1) != 0) largest_block = little_memory;
    if ((choice & 2) != 0) check_copy(e);
    if ((choice & 4) != 0) check_raise(e);
    largest_block = most_memory;
    if ((choice & 8) != 0) check_round_trip(e);
    if ((choice & 16) != 0) check_print(e);
}

// ---- where they come from ----

// Reads the body as the class does. False when it turns out to be wrong.
bool expect_body(std::istream& in, const Known& expected, CORBA_Exception& e) {
    if (expected.description == &Refusal::_description) {
        const ExpectedString why = expect_string(in);
        Refusal& refusal = static_cast<Refusal&>(e);
        short level = 0;
        in >> level;
        in.get();
        KEL_REQUIRE(is(refusal._why.in(), why) && refusal._level == level);
        return level >= 0;
    }
    CORBA_SystemException* const system = CORBA_SystemException::_downcast(&e);
    if (system == nullptr) return true;
    unsigned long numbers[] = {CORBA::OMGVMCID, CORBA::COMPLETED_NO};
    for (unsigned long& number : numbers) {
        in >> number;
        in.get();
    }
    const unsigned long widest = 0xffffffff;
    KEL_REQUIRE(system->minor() == numbers[0] && system->completed() == std::min(numbers[1], widest));
    return true;
}

void read_any_text(Bytes& input) {
    const Form form(input.byte());
    const std::uint8_t choice = input.byte();
    TextInput real(input.rest(), form);
    TextInput twin(input.rest(), form.tame());
    KEListream in(real.stream);
    CORBA_Exception_var e;
    bool refused = false;
    bool wrong = false;
    largest_block = usual_limit;
    try {
        in >> e.out();
    } catch (const std::bad_alloc&) {
        refused = true;
    } catch (const CORBA_MARSHAL&) {
        wrong = true;
    } catch (const std::ios_base::failure&) {
        KEL_REQUIRE(form.throwing);
        return;
    }
    const ExpectedString id = expect_string(twin.stream);
    KEL_REQUIRE(id.refused == (e.in() == nullptr));
    if (id.refused) return KEL_REQUIRE(refused);
    const Known& expected = id.null ? known[0] : named(expected_id(id.text));
    check_class(e.in(), expected);
    if (refused) return;  // by the text of a body
    const bool has_body = !id.null && same_text(expected.id, expected_id(id.text));
    KEL_REQUIRE(wrong == !(has_body ? expect_body(twin.stream, expected, *e.in()) : true));
    KEL_REQUIRE(real.taken() == twin.taken());
    if (!wrong) examine(*e.in(), choice);
}

// An exception of any class and any contents, from the sender's side.
void send(Bytes& input) {
    static const char* const reasons[] = {nullptr, "", "short", long_reason};
    const std::uint8_t choice = input.byte();
    const Known& sent = known[input.byte() % std::size(known)];
    const CORBA_Exception_var e(sent.description->factory()());
    if (CORBA_SystemException* const system = CORBA_SystemException::_downcast(e.in())) {
        system->minor(input.number<std::uint32_t>());
        system->completed(static_cast<CORBA::CompletionStatus>(input.byte() % 5));
        system->reason(reasons[choice >> 5 & 3]);
    } else if (sent.description == &Refusal::_description) {
        static Guarded text(largest_input);
        Refusal* const refusal = static_cast<Refusal*>(e.in());
        refusal->_level = static_cast<short>(input.byte());
        refusal->_why = text.text(input.text());
    }
    check_class(e.in(), sent);
    examine(*e.in(), choice);
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    Bytes input(data, size);
    if (input.byte() % 4 == 0) {
        send(input);
    } else {
        read_any_text(input);
    }
    largest_block = most_memory;
    complaints.take();
    return 0;
}
