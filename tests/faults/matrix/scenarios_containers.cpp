// Dictionaries: what they allocate must leave the table as it was, or do its work.
//
// SPDX-License-Identifier: MIT
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/core/unique_id.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "tests/faults/matrix/scenario.h"

namespace {

using namespace kel::test;

typedef KELDictionary<KELUniqueId, int> Numbers;
typedef KELDictionary<CORBA_String_var, CORBA_String_var> Texts;
typedef KELDictionary_r<CORBA_String_var, CORBA_String_var> LockedTexts;

const char* const long_key = "a key that does not fit into a short string";
const char* const long_value = "a value that does not fit into a short string";

// Every entry, found once by walking and once by its key.
template <class Table>
std::string numbers_in(Table& table) {
    std::vector<std::string> lines;
    typename Table::Iterator entry(table);
    while (auto* found = ++entry) {
        int value = -1;
        table.atKey(found->_key, value);
        lines.push_back(std::to_string(found->_key.value()) + "=" + std::to_string(value));
    }
    std::sort(lines.begin(), lines.end());
    std::string all = std::to_string(table.capacity()) + " slots:";
    for (const std::string& line : lines) all += " " + line;
    return all;
}

template <class Table>
std::string texts_in(Table& table) {
    std::string all;
    typename Table::Iterator entry(table);
    while (auto* found = ++entry) {
        CORBA_String_var value;
        table.atKey(found->_key, value);
        all += std::string(found->_key.in()) + "=" + (value.in() != nullptr ? value.in() : "(null)") + ";";
    }
    return all;
}

class NumberScenario : public Scenario {
    std::string state() override { return numbers_in(_table); }

protected:
    void fill(unsigned long n) {
        for (unsigned long key = 1; key <= n; ++key) _table.add(KELUniqueId(key), static_cast<int>(key));
    }
    Numbers _table;
};

class DictionaryAdds : public NumberScenario {
    void prepare() override { fill(3); }
    void act() override {
        _table.add(KELUniqueId(100), 100);
        gives("%lu", _table.count());
    }
};
KEL_SCENARIO(DictionaryAdds).giving("4").and_retried();

class DictionaryGrows : public NumberScenario {
    void prepare() override { fill(28); }
    void act() override {
        _table.add(KELUniqueId(100), 100);
        gives("%lu in %lu", _table.count(), _table.capacity());
    }
};
KEL_SCENARIO(DictionaryGrows).giving("29 in 128").and_retried();

class DictionaryGrowsAgain : public NumberScenario {
    void prepare() override { fill(124); }
    void act() override {
        const int added = _table.addIfNotExist(KELUniqueId(1000), 7);
        gives("%d, %lu", added, _table.capacity());
    }
};
KEL_SCENARIO(DictionaryGrowsAgain).giving("1, 512").and_retried();

class DictionaryIsResized : public NumberScenario {
    void prepare() override { fill(5); }
    void act() override {
        _table.reSize(100);
        gives("%lu in %lu", _table.count(), _table.capacity());
    }
};
KEL_SCENARIO(DictionaryIsResized).giving("5 in 256").and_retried();

class LargeDictionary : public Scenario {
    void act() override {
        const Numbers table(100);
        gives("%lu", table.capacity());
    }
};
KEL_SCENARIO(LargeDictionary).giving("256").and_retried();

class DictionaryRefuses : public NumberScenario {
    void prepare() override { fill(3); }
    void act() override { _table.add(KELUniqueId(2), 0); }
};
KEL_SCENARIO(DictionaryRefuses).giving("throws CORBA::BAD_PARAM 0x4f4d0000 NO");

class DictionaryMisses : public NumberScenario {
    void prepare() override { fill(3); }
    void act() override { _table.removeKey(KELUniqueId(9)); }
};
KEL_SCENARIO(DictionaryMisses).giving("throws CORBA::OBJECT_NOT_EXIST 0x4f4d0000 NO");

class TextScenario : public Scenario {
    void prepare() override {
        _table.add("first", long_value);
        set_up();
    }
    virtual void set_up() {}
    std::string state() override { return texts_in(_table); }

protected:
    Texts _table;
};

class DictionaryOfTextsAdds : public TextScenario {
    void act() override { _table.add(long_key, long_value); }
};
KEL_SCENARIO(DictionaryOfTextsAdds).and_retried();

// The parked record keeps short texts, whose room the new ones do not fit into.
class DictionaryRecyclesARecord : public TextScenario {
    void set_up() override {
        _table.add("k", "v");
        _table.removeKey("k");
    }
    void act() override { _table.add(long_key, long_value); }
};
KEL_SCENARIO(DictionaryRecyclesARecord).and_retried();

class DictionaryFindsAText : public TextScenario {
    void act() override {
        CORBA_String_var value;
        gives("%d", _table.atKey("first", value));
    }
};
KEL_SCENARIO(DictionaryFindsAText).giving("1").and_retried();

// From nothing to a table that has grown, its key and its value in every record. What has been added
// before a failure stays and is found.
class DictionaryIsFilled : public Scenario {
    void prepare() override {
        for (char c = '0'; c < '0' + 40; ++c) _keys.push_back(std::string(20, c));
    }
    void act() override {
        for (const std::string& key : _keys) _table.add(key.c_str(), long_value);
        gives("%lu in %lu", _table.count(), _table.capacity());
    }
    std::string state() override {
        unsigned long found = 0;
        for (const std::string& key : _keys) {
            CORBA_String_var value;
            found += _table.atKey(key.c_str(), value);
        }
        return found == _table.count() ? "all are found" : "some are lost";
    }

    Texts _table;
    std::vector<std::string> _keys;
};
KEL_SCENARIO(DictionaryIsFilled).giving("40 in 128");

// The callback gets copies; an entry whose copies cannot be made stays, and stays to be found.
class DictionaryTellsOfRemovals : public Scenario {
    void prepare() override {
        for (char c = 'a'; c <= 'j'; ++c) _table.add(std::string(20, c).c_str(), long_value);
    }
    void act() override {
        _table.removeAll();
        gives("%lu left", _table.count());
    }
    std::string state() override {
        Texts::Iterator entry(_table);
        unsigned long found = 0;
        while (auto* each = ++entry) {
            CORBA_String_var value;
            found += _table.atKey(each->_key, value);
        }
        return found == _table.count() ? "all are found" : "some are lost";
    }
    static void forget(CORBA_String_var, CORBA_String_var) {}

    Texts _table{16, &forget};
};
KEL_SCENARIO(DictionaryTellsOfRemovals).giving("0 left").and_retried();

class LockedDictionary : public Scenario {
    void act() override {
        LockedTexts table;
        {
            KELWLock_var hold(table.rwlock());
            table.add(long_key, long_value);
            table.add("short", "text");
            table.removeKey("short");
        }
        KELRLock_var hold(table.rwlock());
        gives("%lu", table.count());
    }
};
KEL_SCENARIO(LockedDictionary).giving("1").and_retried();

}  // namespace
