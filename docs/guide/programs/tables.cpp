// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/streams/offset_table.h>
#include <kel/streams/ostream.h>

#include <iostream>
#include <sstream>

// Remembers where each string was written.
class StringTable : public KELOffsetTable {
public:
    int kind() override { return StringIndirections; }
};

// Writes a string once, and then the distance back to it.
void write(KELostream& out, const char* s) {
    KELOffsetTable* const table = out.get_out_table(KELOffsetTable::StringIndirections);
    const KELObjWrap key(const_cast<char*>(s));
    const long here = static_cast<long>(out.cur_out_offset());
    long before = 0;
    if (table->_by_object.atKey(key, before)) {
        out << static_cast<int>(before - here);
        return;
    }
    table->_in_use = 1;  // reset() empties what is in use
    table->_by_object.add(key, here);
    table->_by_offset.add(KELOffsetWrapper(here), const_cast<char*>(s));
    out << s;
}

int main() {
    std::ostringstream text;
    KELostream out(text);
    out.set_out_table(KELOffsetTable::StringIndirections, new StringTable);  // now the stream's

    const char id[] = "IDL:example.org/TooLittle:1.0";
    write(out, id);
    write(out, id);
    std::cout << text.str() << "\n";

    out.reset();  // a new message: the table forgets, the offset is 0
    std::cout << out.get_out_table(KELOffsetTable::StringIndirections)->_by_object.count() << " remembered\n";
}
