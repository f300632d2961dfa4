// Integers that are unique in the process.
//
//   KELUniqueId   0, 1, 2, ... in the order of construction; a key for KELDictionary
//
//     KELUniqueId id;               // the next integer
//     KELUniqueId same(id.value()); // the same integer again; draws none
//
// Any thread. The count wraps after 2^32 ids.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_UNIQUE_ID_H
#define KEL_CORE_UNIQUE_ID_H

#include <kel/config.h>

#ifndef KEL_INLINE_UNIQUE_ID
// What the definitions in line begin with; empty in the unit that owns them.
#define KEL_INLINE_UNIQUE_ID KEL_INLINE
#endif

class KEL_API KELUniqueId {
public:
    // Draws the next integer. Throws CORBA::NO_RESOURCES when the lock of the counter, made by the
    // first draw, cannot be created.
    KELUniqueId();

    // Wraps `value`, so that a table can be asked for it, and draws none.
    KELUniqueId(unsigned long value) : _value(static_cast<std::uint32_t>(value)) {}

    // The integer.
    unsigned long value() const { return _value; }

    static std::uint32_t _globalId;  // the next integer to be drawn

private:
    std::uint32_t _value;
};

// Whether the integers are equal.
inline bool operator==(const KELUniqueId& a, const KELUniqueId& b) { return a.value() == b.value(); }
inline bool operator!=(const KELUniqueId& a, const KELUniqueId& b) { return a.value() != b.value(); }

// 0 when the integers are equal, otherwise their order.
KEL_API int compare(const KELUniqueId& a, const KELUniqueId& b);

// The integer itself.
KEL_API unsigned long _kel_hash(const KELUniqueId& id);

KEL_INLINE_BEGIN

KEL_INLINE_UNIQUE_ID int compare(const KELUniqueId& a, const KELUniqueId& b) {
    return a.value() < b.value() ? -1 : a.value() > b.value();
}

KEL_INLINE_UNIQUE_ID unsigned long _kel_hash(const KELUniqueId& id) { return id.value(); }

KEL_INLINE_END

#endif
