// SPDX-License-Identifier: MIT
#include "request_line.h"

#include <cctype>
#include <cstdio>
#include <vector>

namespace names {

namespace {

const std::size_t kLongestArgument = 256 * 1024;
const std::size_t kLongestShown = 80;
const std::size_t kEndsShown = 20;

// Takes the arguments of a line apart from left to right.
class Scanner {
public:
    explicit Scanner(const std::string& line) : _line(line), _at(0) {}

    bool at_end() {
        while (_at < _line.size() && _line[_at] == ' ') ++_at;
        return _at == _line.size();
    }

    // False when what comes next is not an argument.
    bool take(std::string& argument) {
        argument.clear();
        if (_line[_at] != '"') return take_word(argument);
        ++_at;
        return take_quoted(argument) && take_repetition(argument) && at_boundary();
    }

private:
    bool at_boundary() const { return _at == _line.size() || _line[_at] == ' '; }

    bool take_word(std::string& word) {
        while (!at_boundary()) {
            if (_line[_at] == '"') return false;
            word += _line[_at++];
        }
        return true;
    }

    bool take_quoted(std::string& text) {
        while (_at < _line.size()) {
            const char c = _line[_at++];
            if (c == '"') return true;
            if (c != '\\') {
                text += c;
            } else if (!take_escape(text)) {
                return false;
            }
        }
        return false;
    }

    bool take_escape(std::string& text) {
        if (_at == _line.size()) return false;
        const char c = _line[_at++];
        if (c == 'x') return take_hexadecimal(text);
        if (c != '"' && c != '\\' && c != 'n' && c != 't') return false;
        text += c == 'n' ? '\n' : c == 't' ? '\t' : c;
        return true;
    }

    // A zero would end the string it stands in, so it is not accepted.
    bool take_hexadecimal(std::string& text) {
        const std::string digits = _line.substr(_at, 2);
        if (digits.size() != 2 || !std::isxdigit(static_cast<unsigned char>(digits[0])) ||
            !std::isxdigit(static_cast<unsigned char>(digits[1])) || digits == "00") {
            return false;
        }
        text += static_cast<char>(std::stoi(digits, nullptr, 16));
        _at += 2;
        return true;
    }

    bool take_repetition(std::string& text) {
        if (_at == _line.size() || _line[_at] != '*') return true;
        std::size_t times = 0;
        for (++_at; _at < _line.size() && std::isdigit(static_cast<unsigned char>(_line[_at])); ++_at) {
            times = times * 10 + static_cast<std::size_t>(_line[_at] - '0');
            if (times * text.size() > kLongestArgument) return false;
        }
        const std::string once = text;
        text.clear();
        for (std::size_t i = 0; i < times; ++i) text += once;
        return true;
    }

    const std::string& _line;
    std::size_t _at;
};

std::string hexadecimal(char c) {
    char text[8];
    std::snprintf(text, sizeof text, "\\x%02x", static_cast<unsigned>(static_cast<unsigned char>(c)));
    return text;
}

// The bytes of UTF-8 stay as they are.
std::string without_control_bytes(const std::string& text) {
    std::string out;
    for (const char c : text) {
        const bool control = static_cast<unsigned char>(c) < 0x20 || c == 0x7f;
        out += control ? hexadecimal(c) : std::string(1, c);
    }
    return out;
}

std::string with_escapes(const std::string& text) {
    std::string out;
    for (const char c : text) {
        if (c == '"' || c == '\\') out += '\\';
        out += c;
    }
    return without_control_bytes(out);
}

std::string length_of(const std::string& text) { return " (" + std::to_string(text.size()) + " bytes)"; }

}  // namespace

bool parse(const std::string& line, Request& request) {
    Scanner scanner(line);
    std::vector<std::string> arguments;
    while (!scanner.at_end()) {
        arguments.emplace_back();
        if (!scanner.take(arguments.back())) return false;
    }
    if (arguments.empty() || arguments.size() > 3) return false;
    arguments.resize(3);
    request.operation = arguments[0].c_str();
    request.name = arguments[1].c_str();
    request.value = arguments[2].c_str();
    return true;
}

std::string quoted(const std::string& text) {
    if (text.size() <= kLongestShown) return '"' + with_escapes(text) + '"';
    return '"' + with_escapes(text.substr(0, kEndsShown)) + "\" ... \"" +
           with_escapes(text.substr(text.size() - kEndsShown)) + '"' + length_of(text);
}

std::string shortened(const std::string& line) {
    if (line.size() <= kLongestShown) return without_control_bytes(line);
    return without_control_bytes(line.substr(0, kEndsShown)) + " ... " +
           without_control_bytes(line.substr(line.size() - kEndsShown)) + length_of(line);
}

}  // namespace names
