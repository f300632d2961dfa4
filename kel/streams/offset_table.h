// Indirection tables: what a marshalling stream has already written or read, and at which offset,
// so that a repeated type code, value, string or repository id becomes a reference back.
//
//   KELOffsetTable     the base of all tables, reference counted
//   KELOffsetWrapper   a stream offset as a dictionary key
//   KELObjWrap         the address of an object as a dictionary key
//
//     struct ValueTable : KELOffsetTable {
//         int kind() { return ValueIndirections; }
//     };
//     out.set_out_table(KELOffsetTable::ValueIndirections, new ValueTable);   // now the stream's
//
// The marshalling code fills a table and sets _in_use; a stream's reset() empties it. A table is
// used by one thread at a time, like the streams that hold it; only its reference count may be
// shared between threads.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_OFFSET_TABLE_H
#define KEL_STREAMS_OFFSET_TABLE_H

#include <kel/containers/dictionary.h>
#include <kel/core/resource.h>

// A stream offset as a dictionary key.
class KELOffsetWrapper {
public:
    // The key for `offset`.
    KELOffsetWrapper(long offset) : _offset(offset) {}

    // The offset.
    long offset() const { return _offset; }

private:
    long _offset;
};

// The offset's low 32 bits.
inline unsigned long _kel_hash(const KELOffsetWrapper& key) {
    return static_cast<std::uint32_t>(key.offset());
}

// 0 when the offsets are equal, else 1.
inline int compare(const KELOffsetWrapper& a, const KELOffsetWrapper& b) {
    return a.offset() == b.offset() ? 0 : 1;
}

// The address of an object as a dictionary key. The object is neither owned nor looked at.
class KELObjWrap {
public:
    // The key for `object`.
    KELObjWrap(void* object) : _object(object) {}

    // The address.
    void* object() const { return _object; }

private:
    void* _object;
};

// A number made of the address.
inline unsigned long _kel_hash(const KELObjWrap& key) {
    const std::uint64_t address = reinterpret_cast<std::uintptr_t>(key.object());
    return static_cast<std::uint32_t>(address ^ (address >> 32));
}

// 0 when the addresses are equal, else 1.
inline int compare(const KELObjWrap& a, const KELObjWrap& b) { return a.object() == b.object() ? 0 : 1; }

class KEL_API KELOffsetTable : public virtual KELResource {
public:
    enum {
        TypeCodeIndirections = 0,
        ValueIndirections = 1,
        StringIndirections = 2,
        RepIdsIndirections = 3,
        TopLevelTCIndirections = 4
    };

    KELOffsetTable();
    KELOffsetTable(const KELOffsetTable&) = delete;
    KELOffsetTable& operator=(const KELOffsetTable&) = delete;

    // The destructor takes the first two slots of the table's own virtual table and kind() the third,
    // where the streams call it. Keep the order, and add no virtual operation between them.
    virtual ~KELOffsetTable();

    // One of the constants above, the same one during the life of the table.
    virtual int kind() = 0;

    KELDictionary<KELOffsetWrapper, void*> _by_offset;  // what was written or read at an offset
    KELDictionary<KELObjWrap, long> _by_object;         // the offset at which an object was written

    // Called by a stream's reset() with each object of _by_offset, before the entries go; may be null.
    // It must not change the table.
    void (*_release)(void* object);

    // Free for the marshalling code, but that reset() clears _mark and _depth, and that it acts only on
    // a table whose _in_use is not 0, which it clears too.
    std::int32_t _mark;
    std::int32_t _spare;
    std::int32_t _in_use;
    std::int32_t _depth;
};

#endif
