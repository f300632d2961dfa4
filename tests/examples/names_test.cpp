// The name service under its clients, good and bad.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>

#include <chrono>
#include <fstream>
#include <memory>
#include <sstream>
#include <thread>

#include "tests/examples/names_process.h"

namespace {

using kel::test::frame;
using kel::test::names_client;
using kel::test::NamesServer;
using kel::test::Outcome;
using kel::test::RawClient;
using kel::test::run_program;
using kel::test::SilentPort;
using kel::test::unused_port;

std::string contents(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    std::ostringstream all;
    all << file.rdbuf();
    return all.str();
}

const std::string kMarshalException = "IDL:omg.org/CORBA/MARSHAL:1.0";

// The server goes on as if nothing had happened: a client is served, and no descriptor stays behind.
void expect_unharmed(const NamesServer& server, int descriptors_before) {
    const std::vector<std::string> outcomes = server.outcomes("rebind alive yes\nresolve alive\n");
    ASSERT_EQ(outcomes.size(), 2u);
    EXPECT_EQ(outcomes[1], "\"yes\"");
    EXPECT_TRUE(server.settles_at(descriptors_before)) << server.descriptors();
}

// A way of serving, named after the option values that choose it.
struct Way {
    const char* mode;
    const char* api;
};

void PrintTo(const Way& way, std::ostream* out) { *out << way.mode << " with " << way.api; }

class Names : public ::testing::TestWithParam<Way> {
protected:
    NamesServer server{{"-NSmode", GetParam().mode, "-NSapi", GetParam().api}};
    const int descriptors = server.descriptors();
};

std::string name_of(const ::testing::TestParamInfo<Way>& info) {
    return std::string(info.param.mode) + "_" + info.param.api;
}

INSTANTIATE_TEST_SUITE_P(EachWay, Names,
                         ::testing::Values(Way{"poller", "poll"}, Way{"poller", "select"},
                                           Way{"threads", "poll"}, Way{"threads", "select"}),
                         name_of);

TEST_P(Names, TheRequestFileGivesTheExpectedOutputByteForByte) {
    const Outcome outcome =
        run_program({NAMES_CLIENT, "-NSport", std::to_string(server.port()), NAMES_FOLDER "/requests.txt"});
    EXPECT_EQ(outcome.exit_code, 0);
    EXPECT_EQ(outcome.err, "");
    EXPECT_TRUE(outcome.out == contents(NAMES_FOLDER "/expected.txt"));
}

TEST_P(Names, ThreeClientsAtOnceDoNotDisturbEachOther) {
    Outcome outcomes[3];
    std::thread threads[3];
    for (int i = 0; i < 3; ++i) {
        threads[i] = std::thread([&, i] {
            outcomes[i] = run_program({NAMES_CLIENT, "-NSport", std::to_string(server.port()), "-NScontext",
                                       "context" + std::to_string(i), NAMES_FOLDER "/requests.txt"});
        });
    }
    for (std::thread& thread : threads) thread.join();
    const std::string expected = contents(NAMES_FOLDER "/expected.txt");
    for (const Outcome& outcome : outcomes) EXPECT_TRUE(outcome.out == expected);
}

TEST_P(Names, BindingsStayAfterTheClientThatMadeThem) {
    EXPECT_EQ(server.outcomes("bind kept value\n").at(0), "ok");
    EXPECT_EQ(server.outcomes("resolve kept\n").at(0), "\"value\"");
}

TEST_P(Names, GarbageIsAnsweredWithMarshalAndEndsThatConnectionAlone) {
    RawClient garbage(server.port());
    garbage.send("GET / HTTP/1.1\r\nHost: somewhere\r\n\r\n");
    EXPECT_NE(garbage.receive_all().find(kMarshalException), std::string::npos);
    expect_unharmed(server, descriptors);
}

TEST_P(Names, ALengthOf4294967295IsAnsweredWithMarshal) {
    RawClient hostile(server.port());
    hostile.send("ffffffff\n");
    EXPECT_NE(hostile.receive_all().find(kMarshalException), std::string::npos);
    expect_unharmed(server, descriptors);
}

TEST_P(Names, AStringLengthOf4294967295CostsOneReply) {
    for (const char* text :
         {"4294967295\"bind\"\n", "4294967295", "4294967296\"a\"\n", "18446744073709551615\"a\"\n",
          "99999999999999999999\"a\"\n", "-1\"a\"\n", "5\"bind\"\n4294967295\"c\"\n"}) {
        RawClient hostile(server.port());
        hostile.send(frame(text));
        EXPECT_NE(hostile.receive_message().find(kMarshalException), std::string::npos) << text;
        hostile.send(frame("5\"list\"\n1 1 "));  // the connection is still good
        EXPECT_EQ(hostile.receive_message(), "0 0 ") << text;
    }
    expect_unharmed(server, descriptors);
}

TEST_P(Names, HalfARequestIsAnsweredWhenItsRestArrives) {
    const std::string request = frame("5\"bind\"\n2\"c\"\n2\"n\"\n2\"v\"\n");
    RawClient slow(server.port());
    slow.send(request.substr(0, 4));
    expect_unharmed(server, descriptors + 1);
    slow.send(request.substr(4, 9));
    expect_unharmed(server, descriptors + 1);
    slow.send(request.substr(13));
    EXPECT_EQ(slow.receive_message(), "0 ");
}

TEST_P(Names, AClientThatHangsUpInTheMiddleIsForgotten) {
    {
        RawClient orderly(server.port());
        orderly.send("000000ff\n5\"bind\"");
    }
    RawClient abrupt(server.port());
    abrupt.send("000000ff\n5\"bind\"");
    abrupt.reset();
    RawClient silent(server.port());
    silent.reset();
    expect_unharmed(server, descriptors);
}

TEST_P(Names, RequestsThatComeTogetherAreAnsweredInTheirOrder) {
    RawClient client(server.port());
    client.send(frame("5\"bind\"\n2\"c\"\n2\"n\"\n2\"v\"\n") + frame("8\"resolve\"\n2\"c\"\n2\"n\"\n") +
                frame("5\"list\"\n2\"c\"\n1 "));
    EXPECT_EQ(client.receive_message(), "0 ");
    EXPECT_EQ(client.receive_message(), "0 2\"v\"\n");
    EXPECT_EQ(client.receive_message(), "0 1 2\"n\"\n");
}

// The replies outgrow what the system keeps for a connection; the server neither waits for this client
// nor goes on reading its requests.
TEST_P(Names, AClientThatDoesNotReadItsRepliesStopsNobodyElse) {
    ASSERT_EQ(server.outcomes("bind big \"x\"*65536\n").at(0), "ok");
    RawClient deaf(server.port());
    std::string requests;
    for (int i = 0; i < 400; ++i) requests += frame("8\"resolve\"\n5\"main\"\n4\"big\"\n");
    deaf.send(requests);
    expect_unharmed(server, descriptors + 1);
    const std::string reply = "0 65537\"" + std::string(65536, 'x') + "\"\n";
    for (int i = 0; i < 400; ++i) ASSERT_TRUE(deaf.receive_message() == reply) << i;
}

TEST_P(Names, AStopAnswersWhatHasArrivedAndEndsWithStatusZero) {
    RawClient client(server.port());
    client.send(frame("5\"bind\"\n2\"c\"\n2\"n\"\n2\"v\"\n"));
    EXPECT_EQ(server.stop(), 0);
    EXPECT_EQ(client.receive_all(), frame("0 "));
}

TEST(NamesServerProgram, APortInUseIsACommFailure) {
    NamesServer first;
    const Outcome second = run_program({NAMES_SERVER, "-NSport", std::to_string(first.port())});
    EXPECT_EQ(second.exit_code, 1);
    EXPECT_NE(second.err.find("CORBA::COMM_FAILURE"), std::string::npos);
    EXPECT_NE(second.err.find("errno 98 EADDRINUSE, Address already in use"), std::string::npos);
    EXPECT_EQ(second.out, "");
}

TEST(NamesServerProgram, TheNextPortOfTheRangeIsTakenWhenTheFirstIsInUse) {
    NamesServer first;
    NamesServer second({"-NSport", std::to_string(first.port()), "-NSrange", "50"});
    EXPECT_GT(second.port(), first.port());
}

TEST(NamesServerProgram, AWrongOptionIsExplained) {
    for (const std::vector<std::string>& options : std::vector<std::vector<std::string>>{{"-NSport", "65536"},
                                                                                         {"-NSport", "x"},
                                                                                         {"-NSport"},
                                                                                         {"-NSapi", "epoll"},
                                                                                         {"-NSnonsense"},
                                                                                         {"extra"}}) {
        std::vector<std::string> program = {NAMES_SERVER};
        program.insert(program.end(), options.begin(), options.end());
        const Outcome outcome = run_program(program);
        EXPECT_EQ(outcome.exit_code, 1) << options[0];
        EXPECT_NE(outcome.err.find("usage: names_server"), std::string::npos) << options[0];
    }
}

TEST(NamesServerProgram, HelpListsTheOptions) {
    const Outcome outcome = run_program({NAMES_SERVER, "--help"});
    EXPECT_EQ(outcome.exit_code, 0);
    for (const char* option : {"-NShost", "-NSport", "-NSrange", "-NSmode", "-NSapi", "-NSjournal",
                               "-NSplugin", "-NStrace", "-NStracefile"}) {
        EXPECT_NE(outcome.out.find(option), std::string::npos) << option;
    }
}

TEST(NamesClientProgram, WithoutAServerEndsWithTransientAfterTheTimeAllowed) {
    const auto start = std::chrono::steady_clock::now();
    const Outcome outcome = names_client(unused_port(), "list\n", {"-NStimeout", "1200"});
    const auto taken = std::chrono::steady_clock::now() - start;
    EXPECT_EQ(outcome.exit_code, 1);
    EXPECT_NE(outcome.err.find("CORBA::TRANSIENT"), std::string::npos);
    EXPECT_NE(outcome.err.find("errno 111 ECONNREFUSED, Connection refused"), std::string::npos);
    EXPECT_GE(taken, std::chrono::milliseconds(1100));
}

TEST(NamesClientProgram, AServerThatNeverAnswersIsATimeout) {
    SilentPort silent;
    const Outcome outcome = names_client(silent.port(), "list\n", {"-NStimeout", "100"});
    EXPECT_EQ(outcome.exit_code, 1);
    EXPECT_NE(outcome.err.find("CORBA::TIMEOUT"), std::string::npos);
}

TEST(NamesClientProgram, ABindNameOfThisMachineIsUsed) {
    NamesServer server;
    EXPECT_EQ(server.client("list\n", {"-NSbind", "127.0.0.1"}).exit_code, 0);
}

TEST(NamesClientProgram, ABadBindNameIsExplained) {
    NamesServer server;
    const Outcome outcome = server.client("list\n", {"-NSbind", "192.0.2.1"});
    EXPECT_EQ(outcome.exit_code, 1);
    EXPECT_NE(outcome.err.find("client bind on [192.0.2.1] failed"), std::string::npos);
}

TEST(NamesClientProgram, AFileThatCannotBeReadIsExplained) {
    const Outcome outcome = run_program({NAMES_CLIENT, "-NSport", "1", "no/such/file"});
    EXPECT_EQ(outcome.exit_code, 1);
    EXPECT_NE(outcome.err.find("cannot read no/such/file"), std::string::npos);
}

TEST(NamesClientProgram, HelpListsTheOptions) {
    const Outcome outcome = run_program({NAMES_CLIENT, "--help"});
    EXPECT_EQ(outcome.exit_code, 0);
    for (const char* option : {"-NShost", "-NSport", "-NStimeout", "-NSbind", "-NScontext"}) {
        EXPECT_NE(outcome.out.find(option), std::string::npos) << option;
    }
}

}  // namespace
