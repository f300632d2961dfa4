// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/streams/internal/table_list.h>
#include <kel/streams/offset_table.h>

#include <algorithm>
#include <ios>

// ---- objects built when the library is loaded ----

static std::ios_base::Init iostreams;

KELOffsetTable::KELOffsetTable() : _release(nullptr), _mark(0), _spare(0), _in_use(0), _depth(0) {}

KELOffsetTable::~KELOffsetTable() {}

namespace {

void release_objects(KELOffsetTable& table) {
    KELDictionary<KELOffsetWrapper, void*>::Iterator objects(table._by_offset);
    while (KELDictionary<KELOffsetWrapper, void*>::Assoc* entry = ++objects) table._release(entry->_value);
}

void empty(KELOffsetTable& table) {
    if (table._release != nullptr) release_objects(table);
    table._by_offset.removeAll();
    table._by_object.removeAll();
    table._mark = 0;
    table._depth = 0;
    table._in_use = 0;
}

}  // namespace

namespace kel {
namespace internal {

KELOffsetTable* TableList::find(int kind) const {
    for (std::int32_t i = 0; i < _count; ++i) {
        if (_tables[i] != nullptr && _tables[i]->kind() == kind) return _tables[i];
    }
    return nullptr;
}

void TableList::append(KELOffsetTable* table) {
    if (_count == _capacity) grow();
    _tables[_count++] = table;
}

void TableList::grow() {
    const std::int32_t capacity = _capacity == 0 ? 1 : _capacity * 2;
    KELOffsetTable** const tables = new KELOffsetTable*[capacity];
    std::copy(_tables, _tables + _count, tables);
    delete[] _tables;
    _tables = tables;
    _capacity = capacity;
}

void TableList::share(KELOffsetTable* const* tables, std::int32_t count, std::int32_t capacity) {
    if (_count != 0) throw CORBA_BAD_INV_ORDER(4, CORBA::COMPLETED_MAYBE);
    if (count == 0) return;
    KELOffsetTable** const array = new KELOffsetTable*[capacity];
    delete[] _tables;  // there is one after an earlier call got no reference at all
    _tables = array;
    _capacity = capacity;
    // The count follows the references: when one cannot be had, the list holds those before it.
    for (std::int32_t i = 0; i < count; ++i) {
        if (tables[i] != nullptr) tables[i]->_ref();
        _tables[_count++] = tables[i];
    }
}

void TableList::reset() const {
    for (std::int32_t i = 0; i < _count; ++i) {
        if (_tables[i] != nullptr && _tables[i]->_in_use != 0) empty(*_tables[i]);
    }
}

void TableList::release() const {
    for (std::int32_t i = 0; i < _count; ++i) {
        if (_tables[i] != nullptr) _tables[i]->_unref();
    }
    delete[] _tables;
}

}  // namespace internal
}  // namespace kel
