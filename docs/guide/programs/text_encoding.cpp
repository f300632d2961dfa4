// SPDX-License-Identifier: MIT
#include <kel/streams/ostream.h>

#include <iomanip>
#include <iostream>
#include <sstream>

// Shows what `write` puts on a stream, and what the offset counts for it.
template <class Write>
void show(const char* what, Write write) {
    std::ostringstream text;
    KELostream out(text);
    write(out);
    std::cout << std::left << std::setw(26) << what << "|";
    for (const char c : text.str()) {
        if (c == '\n') {
            std::cout << "<newline>";
        } else {
            std::cout << c;
        }
    }
    std::cout << "|  offset " << out.cur_out_offset() << "\n";
}

int main() {
    show("short(-2)", [](KELostream& out) { out << short(-2); });
    show("7", [](KELostream& out) { out << 7; });
    show("7ll", [](KELostream& out) { out << 7ll; });
    show("'x'", [](KELostream& out) { out << 'x'; });
    show("unsigned char(200)", [](KELostream& out) { out << static_cast<unsigned char>(200); });
    show("2.5", [](KELostream& out) { out << 2.5; });
    show("L'A'", [](KELostream& out) { out << L'A'; });
    show("\"abc\"", [](KELostream& out) { out << "abc"; });
    show("\"\"", [](KELostream& out) { out << ""; });
    show("a null string", [](KELostream& out) { out << static_cast<const char*>(0); });
    show("a \"quoted\" \\ line\\n", [](KELostream& out) { out << "a \"quoted\" \\ line\n"; });
    show("braces {}", [](KELostream& out) { out << "braces {}"; });
    show("the byte 0xe9", [](KELostream& out) { out << "\xe9"; });
    show("L\"AB\"", [](KELostream& out) { out << L"AB"; });
    show("ints 1, 2, 3", [](KELostream& out) {
        const int row[] = {1, 2, 3};
        out.put(row, 3);
    });
    show("raw bytes ab", [](KELostream& out) { out.put("ab", 2); });
}
