// SPDX-License-Identifier: MIT
#include <kel/core/internal/failure.h>
#include <kel/streams/internal/console.h>
#include <kel/streams/internal/short_way.h>
#include <kel/streams/internal/table_list.h>
#include <kel/streams/internal/text.h>
#include <kel/streams/istream.h>

#include <iostream>

using kel::internal::extract_value;
using kel::internal::scan_in_memory;
using kel::internal::TableList;
using kel::internal::text;

// ---- objects built when the library is loaded ----

static std::ios_base::Init iostreams;

namespace kel {
namespace internal {

const void* classic_locale_holds;

namespace {

// A client's static objects and their threads may use streams meanwhile.
struct ClassicLocale {
    ClassicLocale() {
        __atomic_store_n(&classic_locale_holds, held_by(std::locale::classic()), __ATOMIC_RELAXED);
    }
};
const ClassicLocale classic_locale;

}  // namespace

}  // namespace internal
}  // namespace kel

// ---- the process's own standard streams ----

namespace kel {
namespace internal {

constexpr Consoles consoles{&std::cin, &std::cout, &std::cerr, &std::clog};
std::ostream& error_stream() { return std::cerr; }

void no_standard_stream(const char* operations) {
    assertion_failed("_strm != 0", "streams", __LINE__, operations);
}

}  // namespace internal
}  // namespace kel

// ---- life and tables ----

KEListream::KEListream()
    : _tables(nullptr), _table_count(0), _table_capacity(0), _offset(0), _strm(nullptr) {}

KEListream::KEListream(std::istream& in) : KEListream() { _strm = &in; }

KEListream::KEListream(const KEListream&) : KEListream() {}

KEListream& KEListream::operator=(const KEListream&) { return *this; }

KEListream::~KEListream() { TableList(*this).release(); }

void KEListream::reset() {
    TableList(*this).reset();
    _offset = 0;
}

KELOffsetTable* KEListream::get_in_table(int kind) { return TableList(*this).find(kind); }

void KEListream::set_in_table(int, KELOffsetTable* table) { TableList(*this).append(table); }

void KEListream::copy_in_tables(const KEListream& source) {
    TableList(*this).share(source._tables, source._table_count, source._table_capacity);
}

unsigned long KEListream::cur_in_offset() const { return _offset; }

unsigned char KEListream::is_available(unsigned long) { return 1; }

int KEListream::_type_number() { return 0; }

// ---- scalars ----

namespace {

// The ordinary way of a value and the character behind it, kept out of the short one. What was read before
// the stream throws is counted.
template <class T>
[[gnu::noinline]] KEListream& extract_with_facets(KEListream& in, T& value, std::uint32_t size) {
    extract_value(*in._strm, value);
    in._offset += size;
    in._strm->get();
    in._offset += 1;
    return in;
}

// Reads one value and the separator behind it. `size` is what the value itself counts.
template <class T>
KEL_FLATTEN KEListream& extract(KEListream& in, T& value, std::uint32_t size) {
    if (!scan_in_memory<1>(text(in._strm), value)) return extract_with_facets(in, value, size);
    in._offset += size + 1;
    return in;
}

}  // namespace

KEListream& KEListream::operator>>(char& c) { return extract(*this, c, 1); }

// Deliberate: 4 and not 1, because an int is what is read. Pinned by
// InputScalars.UnsignedCharCountsFourAndOne.
KEListream& KEListream::operator>>(unsigned char& value) { return extract(*this, value, 4); }

KEListream& KEListream::operator>>(short& value) { return extract(*this, value, 2); }
KEListream& KEListream::operator>>(unsigned short& value) { return extract(*this, value, 2); }
KEListream& KEListream::operator>>(int& value) { return extract(*this, value, 4); }
KEListream& KEListream::operator>>(unsigned int& value) { return extract(*this, value, 4); }
KEListream& KEListream::operator>>(long& value) { return extract(*this, value, 4); }
KEListream& KEListream::operator>>(unsigned long& value) { return extract(*this, value, 4); }
KEListream& KEListream::operator>>(float& value) { return extract(*this, value, 4); }
KEListream& KEListream::operator>>(double& value) { return extract(*this, value, 8); }
KEListream& KEListream::operator>>(long long& value) { return extract(*this, value, 8); }
KEListream& KEListream::operator>>(unsigned long long& value) { return extract(*this, value, 8); }
KEListream& KEListream::operator>>(wchar_t& value) { return extract(*this, value, 4); }

// ---- raw characters ----

int KEListream::get() {
    _offset += 4;
    return text(_strm).get();
}

KEListream& KEListream::get(char& c) {
    text(_strm).get(c);
    _offset += 1;
    return *this;
}

KEListream& KEListream::get(unsigned char& c) { return KEListream::get(reinterpret_cast<char&>(c)); }

KEListream& KEListream::get(char* bytes, unsigned int n) {
    text(_strm).read(bytes, n);
    _offset += n;
    return *this;
}

KEListream& KEListream::get(unsigned char* bytes, unsigned int n) {
    return KEListream::get(reinterpret_cast<char*>(bytes), n);
}
