// The indirection tables a stream holds. Both directions keep the same three fields, and this view
// of them does the work for both.
//
//     TableList(*this).append(table);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_TABLE_LIST_H
#define KEL_STREAMS_INTERNAL_TABLE_LIST_H

#include <kel/config.h>
#include <kel/fwd.h>

namespace kel {
namespace internal {

class TableList {
public:
    template <class Stream>
    explicit TableList(Stream& stream)
        : _tables(stream._tables), _count(stream._table_count), _capacity(stream._table_capacity) {}

    // The first table of that kind, or null.
    KELOffsetTable* find(int kind) const;

    // Takes the caller's reference over, unless there is no memory for the entry.
    void append(KELOffsetTable* table);

    // Takes a reference of each of the `count` tables in an array of length `capacity`. Throws
    // BAD_INV_ORDER when the list is not empty.
    void share(KELOffsetTable* const* tables, std::int32_t count, std::int32_t capacity);

    // Empties the tables that are in use.
    void reset() const;

    // Gives the references back and frees the array. The list must not be used again.
    void release() const;

private:
    void grow();

    KELOffsetTable**& _tables;
    std::int32_t& _count;
    std::int32_t& _capacity;
};

}  // namespace internal
}  // namespace kel

#endif
