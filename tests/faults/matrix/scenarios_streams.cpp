// The text streams with values of every kind, and their tables.
//
// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/streams/istream.h>
#include <kel/streams/offset_table.h>
#include <kel/streams/ostream.h>

#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "tests/faults/matrix/pools.h"
#include "tests/faults/matrix/scenario.h"

namespace {

using namespace kel::test;

// --- values ------------------------------------------------------------------------------------------

class OutputScenario : public Scenario {
protected:
    void gives_condition() { gives("%s", _text.bad() ? "bad" : _text.fail() ? "failed" : "good"); }

    std::ostringstream _text;
    KELostream _out{_text};
};

class OutputOfScalars : public OutputScenario {
    void act() override {
        _out << 'c' << static_cast<unsigned char>(200) << static_cast<short>(-2)
             << static_cast<unsigned short>(2);
        _out << -3 << 3u << -4l << 4ul << -5ll << 5ull << 0.25f << 0.125 << L'w';
        gives_condition();
    }
};
KEL_SCENARIO(OutputOfScalars).giving("good");

template <class T>
void put_array(KELostream& out) {
    const T values[3] = {1, 2, 3};
    out.put(values, 3);
}

class OutputOfArrays : public OutputScenario {
    void act() override {
        put_array<char>(_out);
        put_array<unsigned char>(_out);
        put_array<short>(_out);
        put_array<unsigned short>(_out);
        put_array<int>(_out);
        put_array<unsigned int>(_out);
        put_array<long>(_out);
        put_array<unsigned long>(_out);
        put_array<long long>(_out);
        put_array<unsigned long long>(_out);
        put_array<float>(_out);
        put_array<double>(_out);
        put_array<wchar_t>(_out);
        gives_condition();
    }
};
KEL_SCENARIO(OutputOfArrays).giving("good");

class OutputOfStrings : public OutputScenario {
    void act() override {
        _out << "a string with {braces}, \"quotes\" and a \x01 byte";
        _out << L"a wide string";
        _out << static_cast<const char*>(nullptr);
        endl(_out);
        gives_condition();
    }
};
KEL_SCENARIO(OutputOfStrings).giving("good");

class InputScenario : public Scenario {
public:
    explicit InputScenario(const char* text) : _text(text), _in(_text) {}

protected:
    void gives_condition(long sum) {
        gives("%ld, %s", sum, _text.bad() ? "bad" : _text.fail() ? "failed" : "good");
    }

    std::istringstream _text;
    KEListream _in;
};

class InputOfScalars : public InputScenario {
public:
    InputOfScalars() : InputScenario("c 200 -2 2 -3 3 -4 4 -5 5 0.25 0.125 119 ") {}

private:
    void act() override {
        char c = 0;
        unsigned char byte = 0;
        short s = 0;
        unsigned short us = 0;
        int i = 0;
        unsigned int ui = 0;
        long l = 0;
        unsigned long ul = 0;
        long long ll = 0;
        unsigned long long ull = 0;
        float f = 0;
        double d = 0;
        wchar_t w = 0;
        _in >> c >> byte >> s >> us >> i >> ui >> l >> ul >> ll >> ull >> f >> d >> w;
        gives_condition(static_cast<long>(w));
    }
};
KEL_SCENARIO(InputOfScalars).giving("119, good");

class InputOfArrays : public InputScenario {
public:
    InputOfArrays() : InputScenario("abc 1 2 3 1 2 3 0.5 0.25 0.125 65 66 67 ") {}

private:
    void act() override {
        char bytes[4];
        short shorts[3] = {};
        long long wide[3] = {};
        double doubles[3] = {};
        wchar_t letters[3] = {};
        _in.get(bytes, 4);
        _in.get(shorts, 3).get(wide, 3).get(doubles, 3).get(letters, 3);
        gives_condition(static_cast<long>(letters[2]));
    }
};
KEL_SCENARIO(InputOfArrays).giving("67, good");

class InputOfAString : public InputScenario {
public:
    InputOfAString() : InputScenario("6\"vesta\"\n") {}
    ~InputOfAString() override { CORBA::string_free(_string); }

private:
    void act() override {
        _in >> _string;
        gives("%s", _string);
    }
    char* _string = nullptr;
};
KEL_SCENARIO(InputOfAString).giving("vesta");

class InputOfAWideString : public InputScenario {
public:
    InputOfAWideString() : InputScenario("2 65 66 ") {}
    ~InputOfAWideString() override { delete[] _string; }

private:
    void act() override {
        _in >> _string;
        gives("%d %d", static_cast<int>(_string[0]), static_cast<int>(_string[1]));
    }
    wchar_t* _string = nullptr;
};
KEL_SCENARIO(InputOfAWideString).giving("65 66");

// What is wrong with a string is told on standard error.
class InputOfNoString : public InputScenario {
public:
    InputOfNoString() : InputScenario("6 vesta\n") {}
    ~InputOfNoString() override { CORBA::string_free(_string); }

private:
    void act() override { _in >> _string; }
    char* _string = nullptr;
};
KEL_SCENARIO(InputOfNoString)
    .printing(
        "KEListream::getCString: Error reading Object from  stream. Make sure your 'write' function and "
        "constructor from stream are correct\n")
    .without_pairs();

// --- tables ------------------------------------------------------------------------------------------

class Table : public KELOffsetTable {
public:
    int kind() override { return ValueIndirections; }
};

struct Output : KELostream {
    void append(KELOffsetTable* table) { set_out_table(0, table); }
    void share(const KELostream& source) { copy_out_tables(source); }
};

struct Input : KEListream {
    void append(KELOffsetTable* table) { set_in_table(0, table); }
    void share(const KEListream& source) { copy_in_tables(source); }
};

// The records of counted tables come from pools that are empty.
class Pools {
public:
    Pools() { KELResource::garbage_collect(); }
    ~Pools() { KELResource::garbage_collect(); }
};

// A third table does not fit into the two places there are.
template <class Stream>
class TableIsAppended : public Scenario {
    void prepare() override {
        _stream.append(new Table);
        _stream.append(new Table);
    }
    void act() override {
        _stream.append(_table.get());
        _table.release();
        gives("%d", _stream._table_count);
    }
    std::string state() override {
        return std::to_string(_stream._table_count) + " of " + std::to_string(_stream._table_capacity);
    }

    const Pools _pools;
    std::unique_ptr<Table> _table = std::make_unique<Table>();
    Stream _stream;
};
using TableIsAppendedToOutput = TableIsAppended<Output>;
using TableIsAppendedToInput = TableIsAppended<Input>;
KEL_SCENARIO(TableIsAppendedToOutput).giving("3").and_retried();
KEL_SCENARIO(TableIsAppendedToInput).giving("3").and_retried();

// Tables are shared one after another. When one cannot be counted those before it are shared.
template <class Stream>
class TablesAreShared : public Scenario {
    void prepare() override {
        for (int i = 0; i < 3; ++i) _source.append(new Table);
    }
    void act() override {
        _target.share(_source);
        gives("%d", _target._table_count);
    }
    std::string state() override {
        for (int i = 0; i < _source._table_count; ++i) {
            const unsigned long holders = i < _target._table_count ? 2 : 1;
            if (_source._tables[i]->_num_refs() != holders) return "counted wrongly";
        }
        return (_target._tables == nullptr) == (_target._table_capacity == 0) ? "counted" : "no room";
    }

    const EmptyPlainPool _mutexes;
    const Pools _pools;
    Stream _source, _target;
};
using OutputTablesAreShared = TablesAreShared<Output>;
using InputTablesAreShared = TablesAreShared<Input>;
KEL_SCENARIO(OutputTablesAreShared).giving("3");
KEL_SCENARIO(InputTablesAreShared).giving("3");

class TablesAreReset : public Scenario {
    void prepare() override {
        _table = new Table;
        _table->_by_offset.add(KELOffsetWrapper(8), this);
        _table->_by_object.add(KELObjWrap(this), 8);
        _table->_in_use = 1;
        _stream.append(_table);
    }
    void act() override {
        _stream.reset();
        gives("%lu", _table->_by_offset.count());
    }

    Table* _table = nullptr;
    Input _stream;
};
KEL_SCENARIO(TablesAreReset).giving("0");

class StreamGivesItsTablesBack : public Scenario {
    void prepare() override {
        _stream->append(new Table);
        _stream->append(new Table);
    }
    void act() override { _stream.reset(); }
    std::unique_ptr<Output> _stream = std::make_unique<Output>();
};
KEL_SCENARIO(StreamGivesItsTablesBack);

}  // namespace
