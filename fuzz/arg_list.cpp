// The argument store: any prefix and any arguments leave the arguments and the options that the rules
// say, and a failure leaves the arguments as they were.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/arg_list.h>

#include <cctype>
#include <new>

#include "fuzz/target.h"

namespace kel {
namespace fuzz {
namespace {

constexpr int most_arguments = 48;

Guarded texts(largest_input);
Guarded vectors(most_arguments * sizeof(char*));

// The arguments, behind which nothing may be read or written.
struct Arguments {
    int count;
    char** vector;
    char* before[most_arguments];
};

// The rest of the input as texts, each with its zero; the last one ends at a guarded page.
Arguments arguments_of(Bytes& input) {
    Arguments arguments;
    arguments.count = 0;
    const char* p = texts.text(input.rest());
    const char* const end = p + input.rest().size();
    for (; p < end && arguments.count < most_arguments; p += std::strlen(p) + 1) {
        arguments.before[arguments.count++] = const_cast<char*>(p);
    }
    const std::size_t size = static_cast<std::size_t>(arguments.count) * sizeof(char*);
    arguments.vector = reinterpret_cast<char**>(vectors.block(size));
    if (size != 0) std::memcpy(arguments.vector, arguments.before, size);
    return arguments;
}

// The options and the arguments that must remain.
struct Expected {
    struct Option {
        const char* name;
        const char* value;  // may be null
    };

    void put(const char* name, const char* value) {
        Option* const end = options + option_count;
        Option* const found =
            std::find_if(options, end, [name](const Option& o) { return std::strcmp(o.name, name) == 0; });
        *found = {name, value};
        if (found == end) ++option_count;
    }

    Option options[most_arguments + 1];
    int option_count = 0;
    char* kept[most_arguments];
    int kept_count = 0;
};

bool is_prefix(std::string_view prefix) {
    return prefix.size() >= 2 && prefix[0] == '-' && std::isalnum(static_cast<unsigned char>(prefix[1]));
}

void expect_arguments(Expected& expected, const Arguments& arguments, std::string_view prefix) {
    char* const* next = arguments.before;
    char* const* const end = next + arguments.count;
    while (next != end) {
        char* const argument = *next++;
        if (std::string_view(argument).substr(0, prefix.size()) != prefix) {
            expected.kept[expected.kept_count++] = argument;
        } else if (next == end || **next == '-') {
            expected.put(argument + 1, nullptr);
        } else {
            expected.put(argument + 1, *next++);
        }
    }
}

void check_option(KELArgList& list, const Expected::Option& option) {
    KEL_REQUIRE(list.getArg(option.name));
    const CORBA_String_var value(list.getArgValue(option.name));
    KEL_REQUIRE((value.in() == nullptr) == (option.value == nullptr));
    KEL_REQUIRE(option.value == nullptr || std::strcmp(value.in(), option.value) == 0);
}

void check_options(KELArgList& list, const Expected& expected) {
    KEL_REQUIRE(list.getArgCount() == static_cast<unsigned long>(expected.option_count));
    for (int i = 0; i < expected.option_count; ++i) check_option(list, expected.options[i]);
    const char* const unknown = "no option begins with a blank";
    KEL_REQUIRE(!list.getArg(unknown) && list.getArgValue(unknown) == nullptr);
}

bool unchanged(const Arguments& arguments, int count) {
    return count == arguments.count &&
           std::equal(arguments.before, arguments.before + count, arguments.vector);
}

// Takes the options out. False when it was refused, and then nothing has changed.
bool take_options(KELArgList& list, const Arguments& arguments, std::string_view prefix, Expected& expected) {
    static Guarded prefixes(largest_input);
    int count = arguments.count;
    try {
        list.argInit(count, arguments.vector, prefixes.text(prefix));
    } catch (const CORBA_BAD_PARAM&) {
        KEL_REQUIRE(!is_prefix(prefix) && unchanged(arguments, count) && list.getArgCount() == 0);
        return false;
    } catch (const std::bad_alloc&) {
        KEL_REQUIRE(largest_block < most_memory && unchanged(arguments, count));
        return false;
    }
    KEL_REQUIRE(is_prefix(prefix));
    expect_arguments(expected, arguments, prefix);
    KEL_REQUIRE(count == expected.kept_count);
    KEL_REQUIRE(std::equal(expected.kept, expected.kept + count, arguments.vector));
    return true;
}

void check_refusals(KELArgList& list) {
    int none = 0;
    list.argInit(none, nullptr, "-K");
    int fewer = -1;
    list.argInit(fewer, nullptr, "-K");
    try {
        list.argInit(none, nullptr, nullptr);
        KEL_REQUIRE(!"refused");
    } catch (const CORBA_BAD_PARAM&) {
    }
    KEL_REQUIRE(none == 0 && fewer == -1 && list.getArgCount() == 0);
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    Bytes input(data, size);
    const std::uint8_t choice = input.byte();
    const std::string_view prefix = input.text();
    const Arguments arguments = arguments_of(input);
    KELArgList list;
    if (choice == 0) check_refusals(list);
    Expected expected;
    // With little memory a long text, or the list of what is kept, cannot be copied.
    if ((choice & 7) == 7) largest_block = 20u + choice;
    const bool taken = take_options(list, arguments, prefix, expected);
    largest_block = most_memory;
    if (!taken) return 0;
    check_options(list, expected);
    if (expected.option_count == 0) return 0;
    // The last value wins, whoever stores it.
    Expected::Option changed = expected.options[0];
    changed.value = changed.value == nullptr ? changed.name : nullptr;
    list.putArgValue(changed.name, changed.value);
    check_option(list, changed);
    KEL_REQUIRE(list.getArgCount() == static_cast<unsigned long>(expected.option_count));
    return 0;
}
