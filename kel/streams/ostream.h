// The output side of marshalling: a stream that writes values as readable text and that derived
// classes turn into any other encoding.
//
//   KELostream   writes scalars, arrays and strings; counts an offset; holds indirection tables
//   endl         ends a line and flushes, or marshals "\n" when there is no standard stream
//
//     std::ostringstream text;
//     KELostream out(text);
//     out << short(-2) << 7 << 'x' << endl;   // "-2 7 x \n", offset 3 + 5 + 2
//
// Every operation is virtual. The encodings of the broker derive from KELostream and override by
// slot, so the order of the declarations is part of the binary interface. The text form needs a
// standard stream: a stream made without one is only a base for derived classes, and its own
// writing operations end the process with an assertion.
//
// The offset counts what the binary form would take, not the characters written, and wraps at 32
// bits. Nothing is reported: the state of the standard stream tells what went wrong. What a standard
// stream throws that was told to by its exceptions() passes through.
//
// A stream is used by one thread at a time; it takes no lock.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_OSTREAM_H
#define KEL_STREAMS_OSTREAM_H

#include <kel/config.h>
#include <kel/fwd.h>

#include <iosfwd>

class KEL_API KELostream {
public:
    // A stream without a standard stream, without tables, at offset 0.
    KELostream();

    // Writes to `out`, which stays the caller's and must outlive this stream.
    explicit KELostream(std::ostream& out);

    // Deliberate: copies are new, empty streams that share nothing with their source, and assignment
    // changes neither side. Pinned by OutputStream.CopyIsAnEmptyStream and
    // OutputStream.AssignmentChangesNeitherStream.
    KELostream(const KELostream& other);
    KELostream& operator=(const KELostream& other);

    // Gives back one reference of every table. The standard stream is left alone.
    virtual ~KELostream();

    // Empties every table that is in use and sets the offset to 0. The tables stay attached.
    virtual void reset();

    // The first table whose kind() is `kind`, in the order of their insertion; null when there is
    // none. The stream keeps its reference.
    virtual KELOffsetTable* get_out_table(int kind);

    // Appends `table` and takes the caller's reference over. Deliberate: `kind` is ignored, look-ups
    // ask the table, and an earlier table of the same kind keeps winning them. Pinned by
    // Tables.TheGivenKindIsIgnored and Tables.TheEarlierTableOfAKindWins.
    virtual void set_out_table(int kind, KELOffsetTable* table);

    // Shares all tables of `source`, one reference more for each. Throws BAD_INV_ORDER (minor 4,
    // COMPLETED_MAYBE) when this stream already has a table.
    virtual void copy_out_tables(const KELostream& source);

    // The offset: what has been written since the last reset(), as counted above.
    virtual unsigned long cur_out_offset() const;

    // The length with its terminator (0 for null), then the quoted form of putCString, or one blank
    // for a null or an empty string. Over std::cout and std::cerr: the plain text, nothing else.
    virtual KELostream& operator<<(const char* s);

    // One value with the formatting flags of the standard stream, then one blank. The offset grows
    // by the size of the value's binary form plus 1.
    virtual KELostream& operator<<(char c);
    virtual KELostream& operator<<(unsigned char value);  // as a number
    virtual KELostream& operator<<(short value);
    virtual KELostream& operator<<(unsigned short value);
    virtual KELostream& operator<<(int value);
    virtual KELostream& operator<<(unsigned int value);
    virtual KELostream& operator<<(long value);
    virtual KELostream& operator<<(unsigned long value);
    virtual KELostream& operator<<(float value);
    virtual KELostream& operator<<(double value);
    virtual KELostream& operator<<(long long value);
    virtual KELostream& operator<<(unsigned long long value);
    virtual KELostream& operator<<(wchar_t value);  // as a number

    // A blank, the characters as numbers through put(const wchar_t*, unsigned int), a blank. The
    // length is not written. Over std::cout and std::cerr: the address of the string and a blank.
    virtual KELostream& operator<<(const wchar_t* ws);

    // Raw bytes, no separator; the offset grows by their number.
    virtual KELostream& put(char c);
    virtual KELostream& put(const char* bytes, unsigned int n);
    virtual KELostream& put(const unsigned char* bytes, unsigned int n);

    // `n` values, each as its operator<< writes it. The offset grows by n times the value's share.
    virtual KELostream& put(const wchar_t* values, unsigned int n);
    virtual KELostream& put_wcbuf(const wchar_t* values, unsigned int n);  // forwards to the line above
    virtual KELostream& put(const short* values, unsigned int n);
    virtual KELostream& put(const unsigned short* values, unsigned int n);
    virtual KELostream& put(const int* values, unsigned int n);
    virtual KELostream& put(const unsigned int* values, unsigned int n);
    virtual KELostream& put(const long* values, unsigned int n);
    virtual KELostream& put(const unsigned long* values, unsigned int n);
    virtual KELostream& put(const float* values, unsigned int n);
    virtual KELostream& put(const double* values, unsigned int n);

    // The characters of `s`, which is not null, escaped and in double quotes, then a newline.
    virtual KELostream& putCString(const char* s);

    // Deliberate: the offset grows by 9 once, whatever `n` is. Pinned by
    // OutputArrays.LongLongArraysAddNineOnce.
    virtual KELostream& put(const long long* values, unsigned int n);
    virtual KELostream& put(const unsigned long long* values, unsigned int n);

    // 0 here; a derived class returns the number of its own encoding.
    virtual int _type_number();

    KELOffsetTable** _tables;      // owned array; each table holds one reference for this stream
    std::int32_t _table_count;     // tables held, null entries included
    std::int32_t _table_capacity;  // length of _tables
    // What cur_out_offset() gives here.
    std::uint32_t _offset;
    std::ostream* _strm;  // not owned, may be null
};

// Ends the line: a newline and a flush on the standard stream, or the string "\n" through the
// virtual operator<< of a stream that has none. Leaves the offset to what it calls. Returns `out`.
KEL_API KELostream& endl(KELostream& out);

// Applies a manipulator, so that `out << endl` reads as on standard streams.
inline KELostream& operator<<(KELostream& out, KELostream& (*manipulator)(KELostream&)) {
    return manipulator(out);
}

#endif
