// What is stated for the loader and the logger. A logger never reports: a line is lost, or a file stays as
// it is until the next time.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/stated.h"

namespace kel {
namespace test {

namespace {

const char* const not_loaded = "LoadLibrary failed for [alpha]: Exception: KELLoadLibrary::LoadError\n\n";
// The time is 0, or -1 when the system does not tell it.
const char* const line = "=> Thu Jan  1 00:00:00 1970,03,10000001,server.cpp,42,0\ntext7\n";
const char* const line_without_time = "=> Wed Dec 31 23:59:59 1969,03,10000001,server.cpp,42,-1\ntext7\n";
const Stated ends_in_unlock = ends("pthread_mutex_unlock", "(rc == 0)", "void KELRMutex::unlock()");

const char* const not_closed = "dlclose failed: shared object not open\n";

std::vector<Row> loader_rows() {
    return {
        // The name itself is tried when the one made from it opens nothing.
        {"LibraryIsLoaded", "dlopen", {}, once, gives("alpha ")},
        {"LibraryIsLoaded", "dlopen", {}, for_ever, gives("").prints(not_loaded)},
        {"LibraryIsMissing", "dlopen", {}, any, ignored()},
        {"LibraryForReal", "dlopen", {}, nth_once(1), ignored()},
        {"LibraryForReal",
         "dlopen",
         {},
         any,
         gives("").prints("LoadLibrary failed for [" KEL_MATRIX_PLUGIN
                          "]: Exception: KELLoadLibrary::LoadError\n\n")},
        {"LibraryIsMissing",
         "pthread_mutex_unlock",
         {},
         any,
         ends("pthread_mutex_lock", "(rc == 0)", "void KELMutex::unlock()").after_printing(not_loaded)},
        {"LibraryIsUnloaded", "dlclose", {}, any, ignored().prints(not_closed)},
        {"LibrariesAreUnloaded",
         "dlclose",
         {},
         nth_for_ever(1),
         ignored().prints(std::string(not_closed) + not_closed)},
        {"LibrariesAreUnloaded", "dlclose", {}, any, ignored().prints(not_closed)},
    };
}

std::vector<Row> line_rows() {
    const Stated no_line = gives("0 lines, backup of -1 bytes");
    const Stated one_line = gives("1 lines, backup of -1 bytes");
    return {
        {"LogLine", "fopen64", {}, any, no_line},
        {"LogLineAfterAnother", "fopen64", {}, once, one_line},  // the second line opens the file
        {"LogLineAfterAnother", "fopen64", {}, for_ever, no_line},
        {"LogThatIsClosedBetween", "fopen64", {}, nth_once(1), one_line},
        {"LogThatIsClosedBetween", "fopen64", {}, nth(2), one_line},
        {"LogThatIsClosedBetween", "fopen64", {}, for_ever, no_line},
        {"LogOnStandardOutput", "time", {}, any, ignored().shows(line_without_time)},
        {"LogOnStandardOutput", "getenv", {}, any, ignored().shows(line)},
        {"LogOnStandardOutput", "pthread_mutex_unlock", {}, any, ends_in_unlock.shows(line)},
        // A line that cannot be flushed goes out with the next one, or when the file is closed.
        {"LogL* LogThatIsClosedBetween LogOnStandardOutput LogR*", "time getenv", {}, any, ignored()},
        {"LogL* LogThatIsClosedBetween LogOnStandardOutput", "fflush", {}, any, ignored()},
    };
}

std::vector<Row> rotation_rows() {
    const Stated no_backup = gives("1 lines, backup of -1 bytes");
    return {
        {"LogRotatesLater", "fstat64 fflush fclose rename", {}, nth_for_ever(1), gives("no backup")},
        {"LogRotatesLater", "fstat64 fflush fclose rename fopen64", {}, any, ignored()},
        {"LogRotates", "fstat64", {}, any, no_backup},
        {"LogRotates*", "unlink", {}, any, ignored()},
        {"LogRotates", "fflush", {}, nth(1), no_backup},  // what cannot be flushed is not closed
        // A file that is closed all the same is gone: the line is lost, the next one opens it again.
        {"LogRotates", "fclose", {}, nth(1), gives("0 lines, backup of -1 bytes")},
        {"LogRotates", "rename", {}, any, no_backup},
        {"LogRotates", "fopen64", {}, any, gives("0 lines, backup of 2000 bytes")},
        {"LogRotates", "fflush fclose", {}, any, ignored()},
    };
}

}  // namespace

std::vector<Row> service_rows() {
    std::vector<Row> all;
    for (const auto& part : {loader_rows(), line_rows(), rotation_rows()}) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}

std::vector<PairRow> service_pair_rows() {
    const std::string twice = std::string(not_closed) + not_closed;
    return {
        {"LibraryIsLoaded", "dlopen", {}, "dlopen", {}, Taken::own, gives("").prints(not_loaded)},
        {"LibrariesAreUnloaded", "dlclose", {}, "dlclose", {}, Taken::own, ignored().prints(twice)},
        // The system gives no reason.
        {"Librar*", "dlclose", {}, "dlerror", {}, Taken::own, ignored().prints("dlclose failed: \n")},
        {"LogLineAfterAnother LogThatIsClosedBetween",
         "fopen64",
         {},
         "fopen64",
         {},
         Taken::own,
         gives("0 lines, backup of -1 bytes")},
        // Without a rotation the next flush and the next close are those of the line and of the end.
        {"LogRotates", "fstat64 fflush", {}, "fflush fclose", {}, Taken::as_the_first},
        {"LogOnStandardOutput", "time", {}, "getenv", {}, Taken::as_the_first},
        {"LogOnStandardOutput",
         "time",
         {},
         "pthread_mutex_unlock",
         {},
         Taken::own,
         ends_in_unlock.shows(line_without_time)},
        {"LogRotates", "rename", {}, "fopen64", {}, Taken::own, gives("0 lines, backup of -1 bytes")},
    };
}

}  // namespace test
}  // namespace kel
