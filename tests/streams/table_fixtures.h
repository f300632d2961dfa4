// What the tests of indirection tables share: both directions under one set of names.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STREAMS_TABLE_FIXTURES_H
#define KEL_TESTS_STREAMS_TABLE_FIXTURES_H

#include <gtest/gtest.h>

#include <string>
#include <type_traits>

#include "tests/streams/fixtures.h"

struct Out : KELostream {
    void set(int kind, KELOffsetTable* table) { set_out_table(kind, table); }
    KELOffsetTable* find(int kind) { return get_out_table(kind); }
    void share(const KELostream& source) { copy_out_tables(source); }
};

struct In : KEListream {
    void set(int kind, KELOffsetTable* table) { set_in_table(kind, table); }
    KELOffsetTable* find(int kind) { return get_in_table(kind); }
    void share(const KEListream& source) { copy_in_tables(source); }
};

typedef ::testing::Types<In, Out> Directions;

struct DirectionNames {
    template <class Stream>
    static std::string GetName(int) {
        return std::is_same<Stream, In>::value ? "Input" : "Output";
    }
};

#endif
