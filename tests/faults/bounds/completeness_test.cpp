// Holds the list of numbers against the public headers and the tests against the list.
// SPDX-License-Identifier: MIT
#include <cctype>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "tests/faults/bounds/bounds.h"

namespace {

typedef std::pair<std::string, std::string> Number;  // header and name
typedef std::map<Number, int> Counts;

struct Listed {
    const char* header;
    const char* name;
    int declarations;
    int tests;
};

const Listed numbers[] = {
#define KEL_BOUNDED(header, name, declarations, tests) {header, name, declarations, tests},
#define KEL_UNBOUNDED(header, name, declarations, reason) {header, name, declarations, 0},
#include "tests/faults/bounds/numbers.inc"
#undef KEL_UNBOUNDED
#undef KEL_BOUNDED
};

typedef std::vector<std::string> Words;

// The words and the other characters of a header, without blanks and comments.
Words words_of(const std::filesystem::path& header) {
    std::ifstream file(header);
    Words words;
    std::string line;
    while (std::getline(file, line)) {
        bool in_word = false;
        for (const char c : line.substr(0, line.find("//"))) {
            const bool continues = std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_';
            if (continues && in_word) {
                words.back() += c;
            } else if (c != ' ') {
                words.emplace_back(1, c);
            }
            in_word = continues;
        }
    }
    return words;
}

// Counts the parameters of built-in integer types. The interfaces take no others; fixed widths are for
// private functions.
void count_parameters(const std::string& header, const Words& words, Counts& counts) {
    const std::set<std::string> types = {"unsigned", "long", "int", "short"};
    for (std::size_t i = 0; i + 4 < words.size(); ++i) {
        if (words[i] != "(" && words[i] != ",") continue;
        std::size_t at = i + 1;
        while (types.count(words[at]) != 0) ++at;
        if (at == i + 1) continue;
        if (words[at] == "&") ++at;
        const std::string& name = words[at++];
        if (words[at] == "=") at += 2;
        if (words[at] == "," || words[at] == ")") ++counts[{header, name}];
    }
}

Counts declared_parameters() {
    Counts counts;
    for (const auto& folder : std::filesystem::directory_iterator(KEL_HEADERS)) {
        if (!folder.is_directory()) continue;
        for (const auto& entry : std::filesystem::directory_iterator(folder)) {
            if (entry.path().extension() != ".h") continue;
            const std::string name = entry.path().filename().string();
            const std::string header = "kel/" + folder.path().filename().string() + "/" + name;
            count_parameters(header, words_of(entry.path()), counts);
        }
    }
    return counts;
}

// What is in one of the two and not in the other, one line each.
std::string difference(const Counts& found, const Counts& listed) {
    std::string lines;
    for (const Counts* counts : {&found, &listed}) {
        const Counts& other = counts == &found ? listed : found;
        for (const auto& entry : *counts) {
            const auto same = other.find(entry.first);
            if (same != other.end() && same->second == entry.second) continue;
            lines += (counts == &found ? "found " : "listed ") + entry.first.first + " " +
                     entry.first.second + " " + std::to_string(entry.second) + "\n";
        }
    }
    return lines;
}

TEST(Completeness, EveryNumberInThePublicHeadersIsListed) {
    Counts listed;
    for (const Listed& number : numbers) {
        if (number.declarations != 0) listed[{number.header, number.name}] = number.declarations;
    }
    EXPECT_EQ(difference(declared_parameters(), listed), "");
}

TEST(Completeness, EveryListedNumberHasItsTests) {
    Counts listed, tested;
    for (const Listed& number : numbers) {
        if (number.tests != 0) listed[{number.header, number.name}] = number.tests;
    }
    for (const kel::test::Bounded& parameter : kel::test::bounded()) {
        ++tested[{parameter.header, parameter.name}];
    }
    EXPECT_EQ(difference(tested, listed), "");
}

// Each test is one parameter of one function, and runs at all bounds.
TEST(Completeness, FortyParametersAreTestedAtSixBounds) {
    const std::size_t parameters = kel::test::bounded().size();
    const std::size_t cases = parameters * std::size(kel::test::bounds);
    std::printf("bounds: %zu parameters, %zu cases\n", parameters, cases);
    EXPECT_GE(parameters, 40u);
    EXPECT_GE(cases, 40u * 6);
}

}  // namespace
