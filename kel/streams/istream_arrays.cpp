// SPDX-License-Identifier: MIT
#include <kel/streams/internal/text.h>
#include <kel/streams/istream.h>

using kel::internal::extract_value;
using kel::internal::scan_values;
using kel::internal::text;

namespace {

// Reads `n` values and one separator. A length may come from a peer, so a stream that has failed is
// not asked again for each of the values that are missing.
template <class T>
void extract_all(std::istream& stream, T* values, unsigned int n) {
    for (unsigned int i = 0; i < n && !stream.fail();) {
        const unsigned int scanned = scan_values(stream, values + i, n - i);
        i += scanned;
        if (scanned == 0) extract_value(stream, values[i++]);
    }
    stream.get();
}

template <class T>
KEListream& extract_array(KEListream& in, T* values, unsigned int n, std::uint32_t size) {
    in._offset += size * n;
    extract_all(text(in._strm), values, n);
    in._offset += 1;
    return in;
}

// Deliberate: 64-bit values move the offset back by 8 and forward by 1, however many there are.
// Pinned by InputArrays.LongLongArraysMoveTheOffsetBackBySeven.
template <class T>
KEListream& extract_wide_array(KEListream& in, T* values, unsigned int n) {
    extract_all(text(in._strm), values, n);
    in._offset -= 8;
    in._offset += 1;
    return in;
}

}  // namespace

KEListream& KEListream::get(wchar_t* values, unsigned int n) { return extract_array(*this, values, n, 4); }
KEListream& KEListream::get_wcbuf(wchar_t* values, unsigned int n) { return get(values, n); }

KEListream& KEListream::get(short* values, unsigned int n) { return extract_array(*this, values, n, 2); }
KEListream& KEListream::get(unsigned short* values, unsigned int n) {
    return extract_array(*this, values, n, 2);
}
KEListream& KEListream::get(int* values, unsigned int n) { return extract_array(*this, values, n, 4); }
KEListream& KEListream::get(unsigned int* values, unsigned int n) {
    return extract_array(*this, values, n, 4);
}
KEListream& KEListream::get(long* values, unsigned int n) { return extract_array(*this, values, n, 4); }
KEListream& KEListream::get(unsigned long* values, unsigned int n) {
    return extract_array(*this, values, n, 4);
}
KEListream& KEListream::get(float* values, unsigned int n) { return extract_array(*this, values, n, 4); }
KEListream& KEListream::get(double* values, unsigned int n) { return extract_array(*this, values, n, 8); }

KEListream& KEListream::get(long long* values, unsigned int n) {
    return extract_wide_array(*this, values, n);
}
KEListream& KEListream::get(unsigned long long* values, unsigned int n) {
    return extract_wide_array(*this, values, n);
}
