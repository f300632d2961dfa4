// Marshalling streams without a standard stream that write down which operations are called.
//
//   RecordingOstream   notes every text and every unsigned long written
//   ScriptedIstream    answers reads of unsigned longs from a list
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_EXCEPTIONS_RECORDING_STREAMS_H
#define KEL_TESTS_EXCEPTIONS_RECORDING_STREAMS_H

#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cstring>
#include <deque>
#include <string>
#include <vector>

namespace kel {
namespace test {

class RecordingOstream : public KELostream {
public:
    using KELostream::operator<<;
    KELostream& operator<<(const char* s) override {
        calls.push_back(s == nullptr ? "text (null)" : "text " + std::string(s));
        return *this;
    }
    KELostream& operator<<(unsigned long value) override {
        calls.push_back("ulong " + std::to_string(value));
        return *this;
    }

    std::vector<std::string> calls;
};

class ScriptedIstream : public KEListream {
public:
    explicit ScriptedIstream(std::deque<unsigned long> numbers, std::string bytes = "")
        : _numbers(std::move(numbers)), _bytes(std::move(bytes)) {}

    using KEListream::operator>>;
    KEListream& operator>>(unsigned long& value) override {
        if (_numbers.empty()) throw 1;
        value = _numbers.front();
        _numbers.pop_front();
        return *this;
    }

    using KEListream::get;
    KEListream& get(char* bytes, unsigned int n) override {
        std::memcpy(bytes, _bytes.data(), n);
        _bytes.erase(0, n);
        return *this;
    }

    std::size_t left() const { return _numbers.size(); }

private:
    std::deque<unsigned long> _numbers;
    std::string _bytes;
};

}  // namespace test
}  // namespace kel

#endif
