// SPDX-License-Identifier: MIT
#include <kel/streams/internal/text.h>
#include <kel/streams/ostream.h>

using kel::internal::show_values;
using kel::internal::text;
using kel::internal::write_value;

namespace {

template <class T>
void insert_all(std::ostream& stream, const T* values, unsigned int n) {
    for (unsigned int i = 0; i < n;) {
        const unsigned int written = show_values(stream, values + i, n - i);
        i += written;
        if (written == 0) write_value(stream, values[i++]);
    }
}

// Writes `n` values, each with its separator. `share` is what one of them counts.
template <class T>
KELostream& insert_array(KELostream& out, const T* values, unsigned int n, std::uint32_t share) {
    out._offset += share * n;
    insert_all(text(out._strm), values, n);
    return out;
}

// Deliberate: 64-bit values count 9 together, also when there is none. Pinned by
// OutputArrays.LongLongArraysAddNineOnce.
template <class T>
KELostream& insert_wide_array(KELostream& out, const T* values, unsigned int n) {
    insert_all(text(out._strm), values, n);
    out._offset += 9;
    return out;
}

}  // namespace

KELostream& KELostream::put(const wchar_t* values, unsigned int n) {
    return insert_array(*this, values, n, 5);
}
KELostream& KELostream::put_wcbuf(const wchar_t* values, unsigned int n) { return put(values, n); }

KELostream& KELostream::put(const short* values, unsigned int n) { return insert_array(*this, values, n, 3); }
KELostream& KELostream::put(const unsigned short* values, unsigned int n) {
    return insert_array(*this, values, n, 3);
}
KELostream& KELostream::put(const int* values, unsigned int n) { return insert_array(*this, values, n, 5); }
KELostream& KELostream::put(const unsigned int* values, unsigned int n) {
    return insert_array(*this, values, n, 5);
}
KELostream& KELostream::put(const long* values, unsigned int n) { return insert_array(*this, values, n, 5); }
KELostream& KELostream::put(const unsigned long* values, unsigned int n) {
    return insert_array(*this, values, n, 5);
}
KELostream& KELostream::put(const float* values, unsigned int n) { return insert_array(*this, values, n, 5); }
KELostream& KELostream::put(const double* values, unsigned int n) {
    return insert_array(*this, values, n, 9);
}

KELostream& KELostream::put(const long long* values, unsigned int n) {
    return insert_wide_array(*this, values, n);
}
KELostream& KELostream::put(const unsigned long long* values, unsigned int n) {
    return insert_wide_array(*this, values, n);
}
