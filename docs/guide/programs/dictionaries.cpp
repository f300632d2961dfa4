// SPDX-License-Identifier: MIT
#include <kel/containers/dictionary.h>
#include <kel/core/unique_id.h>
#include <kel/exceptions/standard.h>

#include <iostream>

// A key of one's own: two functions beside it, found by its namespace.
namespace stars {

struct Place {
    int row, column;
};

int compare(const Place& a, const Place& b) { return a.row == b.row && a.column == b.column ? 0 : 1; }
unsigned long _kel_hash(const Place& p) { return static_cast<unsigned long>(p.row * 64 + p.column); }

}  // namespace stars

void tell(KELStringWrapper name, int) { std::cout << "removed " << name.in() << "\n"; }

int main() {
    // The wrapper borrows: the texts must outlive the table.
    KELDictionary<KELStringWrapper, int> sizes(16, tell);
    sizes.add("vesta", 525);
    sizes.add("juno", 247);
    std::cout << sizes.count() << " of " << sizes.capacity() << " slots\n";

    int size = 0;
    if (sizes.atKey("juno", size)) std::cout << "juno " << size << "\n";
    if (!sizes.addIfNotExist("juno", 1)) std::cout << "juno is there already\n";
    try {
        sizes.atKey("pallas");
    } catch (const CORBA::OBJECT_NOT_EXIST&) {
        std::cout << "no pallas\n";
    }
    sizes.removeKey("juno");  // the callback hears of it, and of vesta at the end

    KELDictionary<stars::Place, char> map;
    map.add({1, 2}, '*');
    map.add({40, 3}, '+');
    KELDictionary<stars::Place, char>::Iterator i(map);
    while (++i)
        std::cout << i.entry()->_key.row << "," << i.entry()->_key.column << " " << i.entry()->_value << "\n";

    // One that carries the lock for its owner. It owns its texts, too.
    KELDictionary_r<KELUniqueId, CORBA_String_var> names;
    {
        KELWLock_var hold(names.rwlock());
        names.add(KELUniqueId(7), CORBA_String_var("seven"));
    }
    CORBA_String_var found;
    {
        KELRLock_var hold(names.rwlock());
        names.atKey(KELUniqueId(7), found);
    }
    std::cout << found << "\n";
}
