// SPDX-License-Identifier: MIT
#include <kel/core/resource.h>

#include <iostream>

class Page : public KELResource {
public:
    explicit Page(int number) : _number(number) {}
    int number() const { return _number; }

private:
    ~Page() override { std::cout << "page " << _number << " is gone\n"; }  // only _unref deletes

    int _number;
};

// Shares a page for as long as it exists.
class Reader {
public:
    explicit Reader(Page* page) : _page(page) { _page->_ref(); }
    ~Reader() { _page->_unref(); }
    Reader(const Reader&) = delete;
    Reader& operator=(const Reader&) = delete;

private:
    Page* _page;
};

int main() {
    Page* const page = new Page(7);  // one reference, this one
    std::cout << page->_num_refs() << "\n";
    {
        Reader first(page);
        Reader second(page);
        std::cout << page->_num_refs() << "\n";
    }
    std::cout << page->_num_refs() << "\n";
    page->_unref();
}
