// The input side of marshalling: a stream that reads the text KELostream writes and that derived
// classes turn into a reader of any other encoding.
//
//   KEListream   reads scalars, arrays and strings; counts an offset; holds indirection tables
//
//     std::istringstream text("-2 7 x ");
//     KEListream in(text);
//     short a; int b; char c;
//     in >> a >> b >> c;   // -2, 7, 'x'
//
// Every operation is virtual. The encodings of the broker derive from KEListream and override by
// slot, so the order of the declarations is part of the binary interface. The text form needs a
// standard stream: a stream made without one is only a base for derived classes, and its own
// reading operations end the process with an assertion.
//
// A failed read leaves the standard stream failed and the value as the standard extractor leaves
// it; the offset advances as if it had succeeded. The offset wraps at 32 bits. Deliberate: reader
// and writer count differently, as offsets are only ever compared with those of the same side.
// Pinned by InputScalars.ReadingBackCountsDifferentlyFromWriting. Only a length that no memory can
// be found for throws: std::bad_alloc. What a standard stream throws that was told to by its
// exceptions() passes through.
//
// A stream is used by one thread at a time; it takes no lock.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_ISTREAM_H
#define KEL_STREAMS_ISTREAM_H

#include <kel/config.h>
#include <kel/fwd.h>

#include <iosfwd>

class KEL_API KEListream {
public:
    // A stream without a standard stream, without tables, at offset 0.
    KEListream();

    // Reads from `in`, which stays the caller's and must outlive this stream.
    explicit KEListream(std::istream& in);

    // Deliberate: copies are new, empty streams that share nothing with their source, and assignment
    // changes neither side. Pinned by InputStream.CopyIsAnEmptyStream and
    // InputStream.AssignmentChangesNeitherStream.
    KEListream(const KEListream& other);
    KEListream& operator=(const KEListream& other);

    // Gives back one reference of every table. The standard stream is left alone.
    virtual ~KEListream();

    // 1 when there is no standard stream, so that a reader can choose the binary form.
    unsigned char istrm_is_null() const { return _strm == nullptr; }

    // Empties every table that is in use and sets the offset to 0. The tables stay attached.
    virtual void reset();

    // The first table whose kind() is `kind`, in the order of their insertion; null when there is
    // none. The stream keeps its reference.
    virtual KELOffsetTable* get_in_table(int kind);

    // Appends `table` and takes the caller's reference over. Deliberate: `kind` is ignored, look-ups
    // ask the table, and an earlier table of the same kind keeps winning them. Pinned by
    // Tables.TheGivenKindIsIgnored and Tables.TheEarlierTableOfAKindWins.
    virtual void set_in_table(int kind, KELOffsetTable* table);

    // Shares all tables of `source`, one reference more for each. Throws BAD_INV_ORDER (minor 4,
    // COMPLETED_MAYBE) when this stream already has a table.
    virtual void copy_in_tables(const KEListream& source);

    // The offset: what has been read since the last reset(), as counted above.
    virtual unsigned long cur_in_offset() const;

    // A string that operator<<(const char*) wrote. A previous `s` is freed with CORBA::string_free,
    // the new one comes from CORBA::string_alloc and is the caller's; it is null for a null string.
    // Over std::cin: one word into the caller's buffer `s`, bounded only by the standard stream's
    // width(). That form is not for untrusted input.
    virtual KEListream& operator>>(char*& s);

    // One value with the standard extractor, then one character, the separator. The offset grows by
    // the size of what is extracted plus 1.
    virtual KEListream& operator>>(char& c);
    virtual KEListream& operator>>(unsigned char& value);  // from a number, and counted as one: 4 + 1
    virtual KEListream& operator>>(short& value);
    virtual KEListream& operator>>(unsigned short& value);
    virtual KEListream& operator>>(int& value);
    virtual KEListream& operator>>(unsigned int& value);
    virtual KEListream& operator>>(long& value);
    virtual KEListream& operator>>(unsigned long& value);
    virtual KEListream& operator>>(float& value);
    virtual KEListream& operator>>(double& value);
    virtual KEListream& operator>>(long long& value);
    virtual KEListream& operator>>(unsigned long long& value);
    virtual KEListream& operator>>(wchar_t& value);  // from a number

    // A count, then as many characters through get(wchar_t*, unsigned int). A null `ws` becomes a new
    // array, which the caller releases with delete[]; any other `ws` must have room for the count. No
    // terminator is stored among the characters; a new array has a zero behind them.
    virtual KEListream& operator>>(wchar_t*& ws);

    // Raw characters. get() returns what the standard stream's get() does, and counts 4.
    virtual int get();
    virtual KEListream& get(char& c);
    virtual KEListream& get(unsigned char& c);
    virtual KEListream& get(char* bytes, unsigned int n);
    virtual KEListream& get(unsigned char* bytes, unsigned int n);

    // `n` values with white space between them, then one character, the separator. The offset grows
    // by n times the value's binary size, plus 1. Reading stops once the standard stream has failed.
    virtual KEListream& get(wchar_t* values, unsigned int n);
    virtual KEListream& get_wcbuf(wchar_t* values, unsigned int n);  // forwards to the line above
    virtual KEListream& get(short* values, unsigned int n);
    virtual KEListream& get(unsigned short* values, unsigned int n);
    virtual KEListream& get(int* values, unsigned int n);
    virtual KEListream& get(unsigned int* values, unsigned int n);
    virtual KEListream& get(long* values, unsigned int n);
    virtual KEListream& get(unsigned long* values, unsigned int n);
    virtual KEListream& get(float* values, unsigned int n);
    virtual KEListream& get(double* values, unsigned int n);

    // The string that putCString wrote, into `buf` of `len` bytes, terminated when there is room for
    // it. A missing string, a missing opening quote and a string that does not fit are reported on
    // std::cerr; after the last of them `buf` has no terminator.
    virtual KEListream& getCString(char* buf, unsigned int len);

    // Deliberate: the offset moves back by 7, whatever `n` is. Pinned by
    // InputArrays.LongLongArraysMoveTheOffsetBackBySeven.
    virtual KEListream& get(long long* values, unsigned int n);
    virtual KEListream& get(unsigned long long* values, unsigned int n);

    // Whether `n` more bytes can be read: always 1 here, derived classes know better.
    virtual unsigned char is_available(unsigned long n);

    // 0 here; a derived class returns the number of its own encoding.
    virtual int _type_number();

    KELOffsetTable** _tables;      // owned array; each table holds one reference for this stream
    std::int32_t _table_count;     // tables held, null entries included
    std::int32_t _table_capacity;  // length of _tables
    // What cur_in_offset() gives here.
    std::uint32_t _offset;
    std::istream* _strm;  // not owned, may be null
};

#endif
