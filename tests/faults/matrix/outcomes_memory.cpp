// What is stated for an allocation that fails: std::bad_alloc, with everything as it was. The rows before
// the last are the functions that do not throw, and what the C and C++ libraries make of it themselves.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/stated.h"

namespace kel {
namespace test {

namespace {

// Functions that give no text, no record or no answer instead.
std::vector<MemoryRow> silent_rows() {
    return {
        {"ErrorText", {gives("null")}},
        {"Whence*", {gives("0 <>")}},
        {"SystemVersion", {gives("null")}},
        {"SystemVersionOfPortable", {gives("0, untouched")}},
        {"UserName", {gives("Unix User").afterwards("Unix User")}},
        {"EnvironmentOfAThread ObjectOfAThread", {gives("no memory")}},
    };
}

// Standard streams turn it into a bad stream.
std::vector<MemoryRow> stream_rows() {
    return {
        {"OutputOf* ExceptionBecomesText", {gives("bad")}},
        {"InputOfScalars InputOfArrays", {gives("0, bad")}},
    };
}

// The C++ library throws from a reserve of its own when there is no memory for the exception. The C
// library gives no file, and writes without a buffer.
std::vector<MemoryRow> c_library_rows() {
    const std::vector<Stated> thrown_all_the_same = {out_of_memory(), ignored()};
    const std::vector<Stated> a_line_less = {ignored(), gives("1 lines, backup of -1 bytes"),
                                             gives("0 lines, backup of -1 bytes")};
    const Stated not_loaded = gives("").prints("LoadLibrary failed for [" KEL_MATRIX_PLUGIN
                                               "]: Exception: KELLoadLibrary::LoadError\n\n");
    const char* const throwing =
        "ConnectRefused ConnectTooLate SocketConnectsTooLate DictionaryMisses DictionaryRefuses "
        "SlotThatIsTaken "
        "ExceptionIsThrown UserExceptionIsThrown LibraryIsMissing ThreadThatThrows";
    const bool of_the_c_library = true;
    return {
        {throwing, thrown_all_the_same, of_the_c_library},
        {"LogLine LogLineAfterAnother LogThatIsClosedBetween", a_line_less, of_the_c_library},
        {"LogRotates", {ignored(), gives("0 lines, backup of 2000 bytes")}, of_the_c_library},
        {"LogRotatesLater", {ignored()}, of_the_c_library},
        {"MemoryOfTheProcess", {ignored(), gives("zeros")}, of_the_c_library},
        {"LibraryForReal", {out_of_memory(), ignored(), not_loaded}, of_the_c_library},
        {"ListForReal ListenForReal", {throws("COMM_FAILURE", "0xfffffff6")}, of_the_c_library},
        {"ConnectForReal", {out_of_memory(), throws("TRANSIENT", "0xfffffff6")}, of_the_c_library},
    };
}

}  // namespace

std::vector<MemoryRow> memory_rows() {
    std::vector<MemoryRow> all;
    for (const auto& part : {silent_rows(), stream_rows(), c_library_rows()})
        all.insert(all.end(), part.begin(), part.end());
    all.push_back({"*", {out_of_memory()}});
    return all;
}

}  // namespace test
}  // namespace kel
