// SPDX-License-Identifier: MIT
// The dictionary with integers and with strings as keys, small and large.
#include <bench/support/bench.h>
#include <bench/support/shuffled.h>
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/core/unique_id.h>

#include <cstring>
#include <map>
#include <memory>
#include <unordered_map>

#ifdef KEL_BENCH_ABSL
#include <absl/container/flat_hash_map.h>
#endif

using bench::growth;
using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

typedef std::uintptr_t Value;

// One look-up and one insertion as each table has them. `Given` is what the caller has in hand.
template <class Map, class Given>
struct Standard {
    bool find(Given key, Value& out) const {
        const auto found = map.find(key);
        if (found == map.end()) return false;
        out = found->second;
        return true;
    }
    void insert(Given key, Value value) { map.emplace(key, value); }
    Map map;
};

template <class Key, class Given>
struct Kel {
    bool find(Given key, Value& out) { return map.atKey(Key(key), out); }
    void insert(Given key, Value value) { map.addIfNotExist(Key(key), value); }
    KELDictionary<Key, Value> map;
};

// The least: the value stands where the integer says, the string is read once and compared once.
struct Array {
    bool find(std::uint32_t key, Value& out) const {
        out = values[key];
        return true;
    }
    void insert(std::uint32_t key, Value value) {
        if (key >= values.size()) values.resize(key + 1);
        values[key] = value;
    }
    std::vector<Value> values;
};

struct Compared {
    bool find(const char* key, Value& out) {
        if (next == texts.size()) next = 0;
        out = next;
        return std::strcmp(key, texts[next++].c_str()) == 0;
    }
    void insert(const char* key, Value) { texts.push_back(key); }
    std::vector<std::string> texts;
    std::size_t next = 0;
};

typedef Standard<std::unordered_map<std::uint32_t, Value>, std::uint32_t> StdByNumber;
typedef Standard<std::unordered_map<std::string, Value>, const char*> StdByName;
typedef Kel<KELUniqueId, std::uint32_t> KelByNumber;
typedef Kel<KELStringWrapper, const char*> KelByName;
#ifdef KEL_BENCH_ABSL
typedef Standard<absl::flat_hash_map<std::uint32_t, Value>, std::uint32_t> AbslByNumber;
typedef Standard<absl::flat_hash_map<std::string, Value>, const char*> AbslByName;
#endif

template <class Table, class Keys>
void fill(Table& table, const Keys& keys) {
    for (std::size_t i = 0; i < keys.size(); ++i) table.insert(keys[i], i);
}

// Asks for every key in turn.
template <class Table, class Keys>
void hit(benchmark::State& state, Table& table, const Keys& keys) {
    std::size_t i = 0;
    Value value = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(table.find(keys[i], value));
        benchmark::DoNotOptimize(value);
        if (++i == keys.size()) i = 0;
    }
}

template <class Table, class Keys>
void hit_anew(benchmark::State& state, const Keys& keys) {
    Table table;
    fill(table, keys);
    hit(state, table, keys);
}

template <class Table, class Keys>
void same_again(benchmark::State& state, const Keys& keys) {
    Table table;
    fill(table, keys);
    auto key = keys[keys.size() / 2];
    Value value = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(key);
        benchmark::DoNotOptimize(table.find(key, value));
        benchmark::DoNotOptimize(value);
    }
}

// A table from its first entry to its end; the time is that of one entry.
template <class Table, class Keys>
void insert(benchmark::State& state, const Keys& keys) {
    for (auto _ : state) {
        Table table;
        fill(table, keys);
        benchmark::DoNotOptimize(&table);
    }
}

typedef void (*ByNumber)(benchmark::State&, const std::vector<std::uint32_t>&);
typedef void (*ByName)(benchmark::State&, const std::vector<const char*>&);

void number_line(const std::string& work, const std::string& who, std::size_t n, ByNumber run) {
    line(work, who, [=](benchmark::State& state) { run(state, bench::shuffled_numbers(n)); });
}

void name_line(const std::string& work, const std::string& who, const std::vector<std::string>& names,
               ByName run) {
    line(work, who, [=](benchmark::State& state) { run(state, bench::pointers(names)); });
}

// A point of the curve. The table is filled once: the large ones take longer than what is measured.
template <class Table, class MakeKeys>
void grow(const std::string& work, const std::string& who, long n, MakeKeys make_keys) {
    struct Filled {
        decltype(make_keys()) keys;
        Table table;
    };
    const auto filled = std::make_shared<Filled>();
    growth(work, who, n, [=](benchmark::State& state) {
        if (filled->keys.empty()) fill(filled->table, filled->keys = make_keys());
        hit(state, filled->table, filled->keys);
    });
}

// All works of one contender.
template <class Table>
void numbers(const std::string& who) {
    typedef std::vector<std::uint32_t> Keys;
    number_line("int key, hit at 16", who, 16, hit_anew<Table, Keys>);
    number_line("int key, hit at 1,000", who, 1000, hit_anew<Table, Keys>);
    number_line("int key, the same again", who, 1000, same_again<Table, Keys>);
    number_line("int key, insert 1,000", who, 1000, insert<Table, Keys>);
    for (long n = 16; n <= 1 << 20; n *= 4) {
        grow<Table>("dictionary, hit by int", who, n, [=] { return bench::shuffled_numbers(n); });
    }
}

template <class Table>
void names(const std::string& who) {
    typedef std::vector<const char*> Keys;
    name_line("string key, the same again", who, bench::random_names(1000), same_again<Table, Keys>);
    name_line("string key, hit at 1,000", who, bench::random_names(1000), hit_anew<Table, Keys>);
    name_line("string key, hit at 1,000 numbered names", who, bench::numbered_names(1000),
              hit_anew<Table, Keys>);
    for (long n = 16; n <= 1 << 20; n *= 4) {
        grow<Table>("dictionary, hit by string", who, n, [=] {
            static std::map<long, std::vector<std::string>> texts;  // the keys point into them
            return bench::pointers(texts.emplace(n, bench::random_names(n)).first->second);
        });
    }
}

const bool registered = [] {
    numbers<Array>(kLimit);
    numbers<StdByNumber>("std::unordered_map");
    numbers<KelByNumber>(kKel);
    names<Compared>(kLimit);
    names<StdByName>("std::unordered_map");
    names<KelByName>(kKel);
#ifdef KEL_BENCH_ABSL
    numbers<AbslByNumber>("absl::flat_hash_map");
    names<AbslByName>("absl::flat_hash_map");
#endif
    return true;
}();

}  // namespace
