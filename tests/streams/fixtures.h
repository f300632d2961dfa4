// What the stream tests share.
//
//   Writer, Reader   a stream over a string
//   alike            a locale that shows and reads like the classic one, but is another, so that the standard
//                    library does all the work
//   Swapped          puts a string buffer under a standard stream until the end of the scope
//   TestTable        an indirection table that tells when it dies
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STREAMS_FIXTURES_H
#define KEL_TESTS_STREAMS_FIXTURES_H

#include <kel/streams/istream.h>
#include <kel/streams/offset_table.h>
#include <kel/streams/ostream.h>

#include <locale>
#include <sstream>
#include <string>

inline std::locale alike() { return std::locale(std::locale::classic(), new std::numpunct<char>); }

struct Writer {
    Writer() : out(text) {}
    std::string written() const { return text.str(); }

    std::ostringstream text;
    KELostream out;
};

struct Reader {
    explicit Reader(const std::string& input) : text(input), in(text) {}

    // What has not been read yet.
    std::string rest() {
        text.clear();
        std::ostringstream remaining;
        if (text.peek() != std::char_traits<char>::eof()) remaining << text.rdbuf();
        return remaining.str();
    }

    std::istringstream text;
    KEListream in;
};

// Collects text and counts the flushes that followed it.
class CountingBuffer : public std::stringbuf {
public:
    int flushes = 0;

protected:
    int sync() override {
        ++flushes;
        return std::stringbuf::sync();
    }
};

class Swapped {
public:
    explicit Swapped(std::ios& stream, const std::string& content = "")
        : _stream(stream), _flags(stream.flags()), _before(stream.rdbuf(&buffer)) {
        buffer.str(content);
    }
    ~Swapped() {
        _stream.rdbuf(_before);  // clears the state too
        _stream.flags(_flags);
        _stream.width(0);
    }
    Swapped(const Swapped&) = delete;
    Swapped& operator=(const Swapped&) = delete;

    std::string text() const { return buffer.str(); }

    CountingBuffer buffer;

private:
    std::ios& _stream;
    std::ios::fmtflags _flags;
    std::streambuf* _before;
};

class TestTable : public KELOffsetTable {
public:
    explicit TestTable(int kind, int* deaths = nullptr) : _kind(kind), _deaths(deaths) {}
    ~TestTable() override {
        if (_deaths != nullptr) ++*_deaths;
    }
    int kind() override { return _kind; }

private:
    int _kind;
    int* _deaths;
};

#endif
