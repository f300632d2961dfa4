// Two streams over the same text: one is plain, the other has a locale that looks the same and is another,
// so that the standard library does all the work. Whatever happens to the one has to happen to the other.
//
//   seen            all that can be told of a standard stream, in words
//   same_writing    does a work on two output streams and compares what became of them
//   same_reading    the same for two input streams
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STREAMS_TWIN_FIXTURES_H
#define KEL_TESTS_STREAMS_TWIN_FIXTURES_H

#include <gtest/gtest.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <functional>
#include <iostream>
#include <locale>
#include <sstream>
#include <string>

#include "tests/streams/fixtures.h"

inline std::string seen(const std::ios& stream) {
    std::ostringstream words;
    words << "state " << stream.rdstate() << ", flags " << stream.flags() << ", width " << stream.width();
    return words.str();
}

// What came of a work: its own words, or those of the exception that ended it.
template <class Work>
std::string outcome(Work work) {
    try {
        work();
        return "returned";
    } catch (const std::ios_base::failure&) {
        return "failure";
    } catch (const std::bad_alloc&) {
        return "bad_alloc";
    } catch (int thrown) {
        return "threw " + std::to_string(thrown);
    }
}

// Whether a buffer's writer has stayed in its room.
inline bool writes_in_its_room(const std::streambuf& buffer) {
    struct Areas : std::streambuf {
        static bool hold(const std::streambuf& b) { return (b.*(&Areas::pptr))() <= (b.*(&Areas::epptr))(); }
    };
    return Areas::hold(buffer);
}

typedef std::function<void(std::ios&)> Dress;  // makes a stream less plain, or fails it

inline void undressed(std::ios&) {}

// One output stream over a string, and what a work did to it.
template <class Work>
std::string written_by(Work work, const Dress& dress, bool ordinary) {
    std::ostringstream text;
    if (ordinary) text.imbue(alike());
    text << 0.5 << 7;  // whatever a locale prepares is prepared
    text.str("");
    dress(text);
    KELostream out(text);
    const std::string end = outcome([&] { work(out); });
    EXPECT_TRUE(writes_in_its_room(*text.rdbuf()));
    return end + ", " + seen(text) + ", offset " + std::to_string(out.cur_out_offset()) + ": " + text.str();
}

template <class Work>
void same_writing(Work work, const Dress& dress = undressed) {
    EXPECT_EQ(written_by(work, dress, false), written_by(work, dress, true));
}

// One input stream over a string. `work` puts into words what it read.
template <class Work>
std::string read_by(Work work, const std::string& input, const Dress& dress, bool ordinary) {
    std::stringstream text(input);
    if (ordinary) text.imbue(alike());
    dress(text);
    KEListream in(text);
    std::string values;
    Swapped errors(std::cerr);
    const std::string end = outcome([&] { values = work(in); });
    std::string told = end + ", " + seen(text) + ", offset " + std::to_string(in.cur_in_offset()) +
                       ", count " + std::to_string(text.gcount()) + ", " + values + ", " + errors.text();
    text.exceptions(std::ios_base::goodbit);
    text.clear();
    return told + ", rest " + text.str().substr(static_cast<std::size_t>(text.tellg()));
}

template <class Work>
void same_reading(Work work, const std::string& input, const Dress& dress = undressed) {
    EXPECT_EQ(read_by(work, input, dress, false), read_by(work, input, dress, true))
        << "of \"" << input << '"';
}

#endif
