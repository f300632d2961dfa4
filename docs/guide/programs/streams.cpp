// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <iostream>
#include <sstream>

int main() {
    std::stringstream text;
    KELostream out(text);
    out << short(-2) << 7 << 'x' << 2.5;
    out << "vesta";
    const int row[] = {1, 2, 3};
    out.put(row, 3);
    std::cout << text.str() << "\n";
    std::cout << "offset " << out.cur_out_offset() << "\n";  // of the binary form, not of the text

    KEListream in(text);
    short small = 0;
    int whole = 0;
    char letter = 0;
    double real = 0;
    CORBA_String_var name;
    int back[3] = {};
    in >> small >> whole >> letter >> real >> name;
    in.get(back, 3);
    std::cout << small << " " << whole << " " << letter << " " << real << " " << name << " " << back[2]
              << "\n";

    // Nothing is thrown for a failed read: the standard stream says it.
    in >> whole;
    std::cout << (text.good() ? "good" : "failed") << "\n";
}
