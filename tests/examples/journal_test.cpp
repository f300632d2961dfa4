// Bindings that outlive the server, and the trace it leaves.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/resource.h>
#include <unistd.h>

#include <csignal>
#include <fstream>
#include <sstream>

#include "tests/examples/names_process.h"

namespace {

using kel::test::frame;
using kel::test::NamesServer;
using kel::test::Outcome;
using kel::test::RawClient;
using kel::test::run_program;

// A file in a folder that goes with it.
class TemporaryFile {
public:
    TemporaryFile() : _folder("/tmp/names_XXXXXX") {
        if (::mkdtemp(&_folder[0]) == nullptr) throw std::runtime_error("mkdtemp");
    }
    TemporaryFile(const TemporaryFile&) = delete;
    TemporaryFile& operator=(const TemporaryFile&) = delete;
    ~TemporaryFile() {
        ::unlink(path().c_str());
        ::rmdir(_folder.c_str());
    }

    std::string path() const { return _folder + "/file"; }

    std::string contents() const {
        std::ifstream file(path(), std::ios::binary);
        std::ostringstream all;
        all << file.rdbuf();
        return all.str();
    }

    void append(const std::string& bytes) const { std::ofstream(path(), std::ios::app) << bytes; }

private:
    std::string _folder;
};

std::string text_of(const std::string& s) { return std::to_string(s.size() + 1) + '"' + s + "\"\n"; }

std::string bind_request(const std::string& name, const std::string& value) {
    return frame(text_of("bind") + text_of("main") + text_of(name) + text_of(value));
}

TEST(NamesJournal, BindingsAreThereAgainAfterAStop) {
    TemporaryFile file;
    {
        NamesServer server({"-NSjournal", file.path()});
        server.outcomes(
            "bind a 1\nbind b \"two {words}\"\nrebind a 3\nbind gone x\nunbind gone\nbind empty \"\"\n");
        EXPECT_EQ(server.stop(), 0);
    }
    NamesServer again({"-NSjournal", file.path()});
    const std::vector<std::string> outcomes =
        again.outcomes("list\nresolve a\nresolve b\nresolve empty\nresolve gone\n");
    ASSERT_EQ(outcomes.size(), 5u);
    EXPECT_EQ(outcomes[0], "3 names \"a\" \"b\" \"empty\"");
    EXPECT_EQ(outcomes[1], "\"3\"");
    EXPECT_EQ(outcomes[2], "\"two {words}\"");
    EXPECT_EQ(outcomes[3], "\"\"");
    EXPECT_EQ(outcomes[4], "not found: \"gone\"");
}

// 10,000 binds are on their way when the server is killed. What it has acknowledged is there again.
TEST(NamesJournal, EveryAcknowledgedBindingIsThereAgainAfterACrash) {
    const int binds = 10000;
    TemporaryFile file;
    int acknowledged = 0;
    {
        NamesServer server({"-NSjournal", file.path()});
        RawClient client(server.port());
        for (int i = 0; i < binds; ++i) {
            client.send(bind_request("name" + std::to_string(i), "value" + std::to_string(i)));
            if (i == binds / 2) server.crash();
            if (i >= binds / 2) continue;
            if (i >= 500) {  // 500 requests are always on their way
                ASSERT_EQ(client.receive_message(), "0 ");
                ++acknowledged;
            }
        }
        while (client.receive_message() == "0 ") ++acknowledged;
    }
    EXPECT_GE(acknowledged, binds / 2 - 500);
    NamesServer again({"-NSjournal", file.path()});
    RawClient reader(again.port());
    for (int i = 0; i < acknowledged; ++i) {
        reader.send(frame(text_of("resolve") + text_of("main") + text_of("name" + std::to_string(i))));
        ASSERT_EQ(reader.receive_message(), "0 " + text_of("value" + std::to_string(i)));
    }
}

TEST(NamesJournal, ARecordThatWasCutOffIsDroppedAndNewOnesFollowTheWholeOnes) {
    TemporaryFile file;
    {
        NamesServer server({"-NSjournal", file.path()});
        server.outcomes("bind a 1\n");
    }
    const std::string whole = file.contents();
    file.append(bind_request("b", "2").substr(0, 20));
    {
        NamesServer server({"-NSjournal", file.path()});
        EXPECT_EQ(file.contents(), whole);
        EXPECT_EQ(server.outcomes("bind c 3\n").at(0), "ok");
    }
    NamesServer again({"-NSjournal", file.path()});
    EXPECT_EQ(again.outcomes("list\n").at(0), "2 names \"a\" \"c\"");
}

TEST(NamesJournal, AFileThatIsNoJournalIsRefusedAndKept) {
    TemporaryFile file;
    file.append("a letter to a friend\n");
    const Outcome outcome = run_program({NAMES_SERVER, "-NSjournal", file.path()});
    EXPECT_EQ(outcome.exit_code, 1);
    EXPECT_NE(outcome.err.find("CORBA::MARSHAL"), std::string::npos);
    EXPECT_EQ(file.contents(), "a letter to a friend\n");
}

TEST(NamesJournal, AFileThatCannotBeOpenedIsPersistStore) {
    const Outcome outcome = run_program({NAMES_SERVER, "-NSjournal", "/no/such/folder/journal"});
    EXPECT_EQ(outcome.exit_code, 1);
    EXPECT_NE(outcome.err.find("CORBA::PERSIST_STORE"), std::string::npos);
}

// While it lives, processes that are started can write no file beyond `bytes`.
class FileSizeLimit {
public:
    explicit FileSizeLimit(rlim_t bytes) : _old_action(std::signal(SIGXFSZ, SIG_IGN)) {
        getrlimit(RLIMIT_FSIZE, &_old_limit);
        const rlimit limit = {bytes, _old_limit.rlim_max};
        setrlimit(RLIMIT_FSIZE, &limit);
    }
    FileSizeLimit(const FileSizeLimit&) = delete;
    FileSizeLimit& operator=(const FileSizeLimit&) = delete;
    ~FileSizeLimit() {
        setrlimit(RLIMIT_FSIZE, &_old_limit);
        std::signal(SIGXFSZ, _old_action);
    }

private:
    void (*_old_action)(int);
    rlimit _old_limit;
};

TEST(NamesJournal, AChangeThatCannotBeRecordedIsRefusedAndLeavesTheJournalWhole) {
    TemporaryFile file;
    {
        const FileSizeLimit limit(1000);
        NamesServer server({"-NSjournal", file.path()});
        const std::vector<std::string> outcomes =
            server.outcomes("bind a 1\nbind big \"x\"*2000\nresolve big\nbind b 2\n");
        ASSERT_EQ(outcomes.size(), 4u);
        EXPECT_EQ(outcomes[0], "ok");
        EXPECT_NE(outcomes[1].find("CORBA::PERSIST_STORE"), std::string::npos);
        EXPECT_EQ(outcomes[2], "not found: \"big\"");
        EXPECT_EQ(outcomes[3], "ok");
    }
    NamesServer again({"-NSjournal", file.path()});
    EXPECT_EQ(again.outcomes("list\n").at(0), "2 names \"a\" \"b\"");
}

TEST(NamesJournal, APlugInThatIsNotThereIsExplained) {
    TemporaryFile file;
    const Outcome outcome = run_program({NAMES_SERVER, "-NSjournal", file.path(), "-NSplugin", "nowhere"});
    EXPECT_EQ(outcome.exit_code, 1);
    EXPECT_NE(outcome.err.find("LoadLibrary failed for [nowhere]"), std::string::npos);
    EXPECT_NE(outcome.err.find("CORBA::INITIALIZE"), std::string::npos);
}

TEST(NamesTrace, ShowsTheModulesThatAreEnabledAndNoOthers) {
    TemporaryFile file;
    NamesServer server({"-NStrace", "dispatch", "-NStracefile", file.path()});
    server.outcomes("bind a 1\nresolve nothing\n");
    server.stop();
    const std::string trace = file.contents();
    EXPECT_NE(trace.find("bind [main] [a]\n"), std::string::npos) << trace;
    EXPECT_NE(trace.find("raised names::NotFound\n"), std::string::npos) << trace;
    EXPECT_EQ(trace.find("a client came"), std::string::npos) << trace;
    EXPECT_EQ(trace.find("request of"), std::string::npos) << trace;
}

TEST(NamesTrace, AllShowsEveryModule) {
    TemporaryFile file;
    NamesServer server({"-NStrace", "all", "-NStracefile", file.path()});
    server.outcomes("bind a 1\n");
    server.stop();
    const std::string trace = file.contents();
    for (const char* text : {"a client came", "a client left", "bind [main] [a]", "request of", "reply of"}) {
        EXPECT_NE(trace.find(text), std::string::npos) << text;
    }
}

}  // namespace
