// What is stated for time, the process, files, the pipe and the pollers.
//
// SPDX-License-Identifier: MIT
#include <netdb.h>

#include <cerrno>

#include "tests/faults/matrix/stated.h"

namespace kel {
namespace test {

namespace {

std::vector<Row> time_rows() {
    return {
        // A clock that cannot be read counts as zero in the deadline of a wait.
        {"TimedWait* ThrowingWait*", "gettimeofday", {}, any, ignored()},
        {"TimeOfDay", "gettimeofday", {}, any, gives("-1, error {error}, 0 s")},
        {"SleepOfMilliseconds", "select", {}, any, gives("-1, error {error}")},
        {"SleepOfSeconds", "sleep", {}, any, gives("{error} s left")},
        {"SelectThatKeepsTheTimeOut", "select", {}, any, gives("-1, 7 s")},
    };
}

std::vector<Row> system_rows() {
    const char* const no_version = "Could not obtain OS version information\n";
    return {
        {"MostDescriptors", "sysconf", {}, any, gives("-1")},
        {"LastDescriptor", "sysconf", {}, any, gives("0")},
        {"SystemVersion", "uname", {}, any, gives("null").prints(no_version)},
        {"SystemVersionOfPortable", "uname", {}, any, gives("0, untouched").prints(no_version)},
        // The blank and colon are the library's, the second colon is perror's.
        {"Kill", "kill", {}, any, ignored().prints("vkill: : {text}\n")},
        {"Property", "getenv", {}, any, gives("null")},
        {"MemoryOfTheProcess", "fopen64", {}, any, gives("zeros")},
        // One name for the whole life of the process.
        {"UserName", "getlogin_r", {}, any, gives("Unix User").afterwards("Unix User")},
    };
}

std::vector<Row> file_rows() {
    return {
        {"FileExists", "stat64", {}, any, gives("0")},
        {"WhenceInThisFolder", "stat64", {}, once, gives("1 </a/prog>")},
        {"WhenceInThisFolder", "stat64", {}, for_ever, gives("0 <>")},
        {"WhenceOnThePath", "stat64", {}, nth_once(1), ignored()},
        {"WhenceOnThePath", "stat64", {}, nth_once(2), ignored()},
        {"WhenceOnThePath", "stat64", {}, any, gives("0 <>")},
        {"Whence*", "getenv", {}, any, gives("0 <>")},
    };
}

std::vector<Row> host_entry_rows() {
    return {
        {"SharedHostEntry", "gethostbyname_r", {TRY_AGAIN}, once, ignored()},
        {"SharedHostEntry",
         "gethostbyname_r",
         {TRY_AGAIN},
         for_ever,
         left_out("is asked again without a limit: CachedHostEntry.IsAskedForUntilTheResolverDecides")},
        {"SharedHostEntry HostEntryBy*", "gethostbyname_r gethostbyaddr_r", {}, any, gives("null")},
    };
}

std::vector<Row> channel_rows() {
    return {
        {"PipeIsMade", "pipe", {}, nth(1), throws("NO_RESOURCES")},
        // There is no object whose destructor could close the forward pipe.
        {"PipeIsMade", "pipe", {}, nth(2), throws("NO_RESOURCES").leaves("2 descriptors")},
        {"PipeWrites", "write", {}, nth_once(1), gives("-1, 2")},
        {"PipeWrites", "write", {}, nth(2), gives("3, -1")},
        {"PipeWrites", "write", {}, nth_for_ever(1), gives("-1, -1")},
        {"PipeReads", "read", {}, nth_once(1), gives("-1, 2")},
        {"PipeReads", "read", {}, nth(2), gives("3, -1")},
        {"PipeReads", "read", {}, nth_for_ever(1), gives("-1, -1")},
        // Each wait is one call: an interruption is not repeated.
        {"WaitByPoll", "poll", {}, nth_once(1), gives("-1, 1, reported")},
        {"WaitByPoll", "poll", {}, nth(2), gives("1, -1, reported")},
        {"WaitByPoll", "poll", {}, nth_for_ever(1), gives("-1, -1, silent")},
        {"WaitBySelect", "select", {}, nth_once(1), gives("-1, 1, reported")},
        {"WaitBySelect", "select", {}, nth(2), gives("1, -1, silent")},
        {"WaitBySelect", "select", {}, nth_for_ever(1), gives("-1, -1, silent")},
    };
}

std::vector<Row> ignored_rows() {
    return {
        {"*", "close fcntl64 fclose fchmod setsockopt if_nametoindex dlerror", {}, any, ignored()},
        // Of a message on a standard stream, which takes nothing more after a failed flush.
        {"*", "fflush", {}, any, ignored().cut_short()},
    };
}

}  // namespace

std::vector<Row> process_rows() {
    std::vector<Row> all;
    for (const auto& part : {time_rows(), system_rows(), file_rows(), host_entry_rows(), channel_rows()}) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}

std::vector<Row> general_rows() { return ignored_rows(); }

std::vector<PairRow> process_pair_rows() {
    return {
        // The second file there is not the program either.
        {"WhenceInThisFolder", "stat64", {}, "stat64 getenv", {}, Taken::own, gives("0 <>")},
        {"PipeWrites", "write", {}, "write", {}, Taken::own, gives("-1, -1")},
        {"PipeReads", "read", {}, "read", {}, Taken::own, gives("-1, -1")},
        {"WaitByPoll WaitBySelect",
         "poll select",
         {},
         "poll select",
         {},
         Taken::own,
         gives("-1, -1, silent")},
    };
}

}  // namespace test
}  // namespace kel
