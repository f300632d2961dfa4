// SPDX-License-Identifier: MIT
#include <kel/streams/internal/short_way.h>
#include <kel/streams/internal/table_list.h>
#include <kel/streams/internal/text.h>
#include <kel/streams/ostream.h>

using kel::internal::show_in_memory;
using kel::internal::TableList;
using kel::internal::text;
using kel::internal::write_value;

// ---- life and tables ----

KELostream::KELostream()
    : _tables(nullptr), _table_count(0), _table_capacity(0), _offset(0), _strm(nullptr) {}

KELostream::KELostream(std::ostream& out) : KELostream() { _strm = &out; }

KELostream::KELostream(const KELostream&) : KELostream() {}

KELostream& KELostream::operator=(const KELostream&) { return *this; }

KELostream::~KELostream() { TableList(*this).release(); }

void KELostream::reset() {
    TableList(*this).reset();
    _offset = 0;
}

KELOffsetTable* KELostream::get_out_table(int kind) { return TableList(*this).find(kind); }

void KELostream::set_out_table(int, KELOffsetTable* table) { TableList(*this).append(table); }

void KELostream::copy_out_tables(const KELostream& source) {
    TableList(*this).share(source._tables, source._table_count, source._table_capacity);
}

unsigned long KELostream::cur_out_offset() const { return _offset; }

int KELostream::_type_number() { return 0; }

KELostream& endl(KELostream& out) {
    if (out._strm == nullptr) {
        out << "\n";
    } else {
        *out._strm << std::endl;
    }
    return out;
}

// ---- scalars ----

namespace {

// The longer ways, kept out of the short one.
template <class T>
[[gnu::noinline]] KELostream& insert_elsewhere(KELostream& out, const T& value, std::uint32_t size) {
    write_value(*out._strm, value);
    out._offset += size + 1;
    return out;
}

// Writes one value and its separator. `size` is what the value itself counts.
template <class T>
KEL_FLATTEN KELostream& insert(KELostream& out, const T& value, std::uint32_t size) {
    if (!show_in_memory(text(out._strm), value)) return insert_elsewhere(out, value, size);
    out._offset += size + 1;
    return out;
}

}  // namespace

KELostream& KELostream::operator<<(char c) { return insert(*this, c, 1); }
KELostream& KELostream::operator<<(unsigned char value) { return insert(*this, value, 1); }
KELostream& KELostream::operator<<(short value) { return insert(*this, value, 2); }
KELostream& KELostream::operator<<(unsigned short value) { return insert(*this, value, 2); }
KELostream& KELostream::operator<<(int value) { return insert(*this, value, 4); }
KELostream& KELostream::operator<<(unsigned int value) { return insert(*this, value, 4); }
KELostream& KELostream::operator<<(long value) { return insert(*this, value, 4); }
KELostream& KELostream::operator<<(unsigned long value) { return insert(*this, value, 4); }
KELostream& KELostream::operator<<(float value) { return insert(*this, value, 4); }
KELostream& KELostream::operator<<(double value) { return insert(*this, value, 8); }
KELostream& KELostream::operator<<(long long value) { return insert(*this, value, 8); }
KELostream& KELostream::operator<<(unsigned long long value) { return insert(*this, value, 8); }
KELostream& KELostream::operator<<(wchar_t value) { return insert(*this, value, 4); }

// ---- raw characters ----

KELostream& KELostream::put(char c) {
    text(_strm).put(c);
    _offset += 1;
    return *this;
}

KELostream& KELostream::put(const char* bytes, unsigned int n) {
    text(_strm).write(bytes, n);
    _offset += n;
    return *this;
}

KELostream& KELostream::put(const unsigned char* bytes, unsigned int n) {
    return KELostream::put(reinterpret_cast<const char*>(bytes), n);
}
