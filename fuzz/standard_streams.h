// Standard streams over bytes in memory, for the targets that read and write text.
//
//   Form        how a standard stream is set up, taken from one byte of the input
//   TextInput   a std::istream over bytes; knows how many were taken
//   TextOutput  a std::ostream into memory
//
//     TextInput real(input.rest(), form), twin(input.rest(), form.tame());
//     KEListream in(real.stream);
//
// The library reads the one stream. The twin is read with the standard operations alone, and both must
// then stand at the same place in the same state.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FUZZ_STANDARD_STREAMS_H
#define KEL_FUZZ_STANDARD_STREAMS_H

#include <istream>
#include <ostream>
#include <streambuf>
#include <string_view>

#include "fuzz/target.h"

namespace kel {
namespace fuzz {

struct Form {
    bool one_by_one = false;  // hands out one byte at a time and can put none back
    bool throwing = false;    // throws when its state stops being good
    bool skips_blanks = true;
    std::ios_base::fmtflags base = std::ios_base::dec;

    Form() = default;
    explicit Form(std::uint8_t choice)
        : one_by_one((choice & 1) != 0), throwing((choice & 2) != 0), skips_blanks((choice & 4) == 0) {
        const std::ios_base::fmtflags bases[] = {std::ios_base::dec, std::ios_base::dec, std::ios_base::hex,
                                                 std::ios_base::fmtflags()};  // the last finds it out itself
        base = bases[choice >> 3 & 3];
    }

    // The same text, without what makes reading it difficult.
    Form tame() const {
        Form form = *this;
        form.one_by_one = form.throwing = false;
        return form;
    }
};

class TextInput : private std::streambuf {
public:
    TextInput(std::string_view bytes, const Form& form)
        : stream(this), _one_by_one(form.one_by_one), _begin(bytes.data()), _size(bytes.size()) {
        show(_one_by_one ? 0 : _size);
        stream.setf(form.base, std::ios_base::basefield);
        if (!form.skips_blanks) stream.unsetf(std::ios_base::skipws);
        if (form.throwing)
            stream.exceptions(std::ios_base::badbit | std::ios_base::failbit | std::ios_base::eofbit);
    }

    std::size_t taken() const { return static_cast<std::size_t>(gptr() - _begin); }

    std::string_view rest() const { return {gptr(), _size - taken()}; }

    std::istream stream;

protected:
    int_type underflow() override {
        if (gptr() == egptr()) {
            const std::size_t n = taken();
            if (!_one_by_one || n == _size) return traits_type::eof();
            setg(gptr(), gptr(), gptr() + 1);
        }
        return traits_type::to_int_type(*gptr());
    }

private:
    // The standard buffer wants writable bytes and writes none.
    void show(std::size_t n) {
        char* const start = const_cast<char*>(_begin);
        setg(start, start, start + n);
    }

    bool _one_by_one;
    const char* _begin;
    std::size_t _size;
};

class TextOutput : private std::streambuf {
public:
    TextOutput() : stream(this) { setp(_text, _text + sizeof _text); }

    std::string_view written() const { return {_text, static_cast<std::size_t>(pptr() - pbase())}; }

    std::ostream stream;

private:
    char _text[8 * largest_input];
};

}  // namespace fuzz
}  // namespace kel

#endif
