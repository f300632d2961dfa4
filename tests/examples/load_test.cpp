// A thousand clients at once, a hundred requests each, in every way of serving.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <memory>
#include <vector>

#include "tests/examples/names_process.h"

namespace {

using kel::test::frame;
using kel::test::NamesServer;
using kel::test::RawClient;

// A sanitizer keeps freed memory for a while, so what is resident tells nothing; it looks for leaks itself.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
const bool kKeepsFreedMemory = true;
#elif defined(__has_feature)
const bool kKeepsFreedMemory = __has_feature(address_sanitizer) || __has_feature(thread_sanitizer);
#else
const bool kKeepsFreedMemory = false;
#endif

// The thread sanitizer starts a thread of its own with the server's first one.
#if defined(__SANITIZE_THREAD__)
const int kThreadsBesideClients = 1;
#else
const int kThreadsBesideClients = 0;
#endif

const int kClients = 1000;
const int kRequests = 100;

class NamesLoad : public ::testing::TestWithParam<const char*> {
protected:
    // This process needs a descriptor for each client, too.
    static void SetUpTestSuite() {
        rlimit limit;
        getrlimit(RLIMIT_NOFILE, &limit);
        limit.rlim_cur = limit.rlim_max;
        setrlimit(RLIMIT_NOFILE, &limit);
    }

    // The resident memory of the server in KiB.
    static long resident(const NamesServer& server) {
        FILE* const file = fopen(("/proc/" + std::to_string(server.process()) + "/statm").c_str(), "r");
        long size = 0;
        long pages = 0;
        if (fscanf(file, "%ld %ld", &size, &pages) != 2) pages = -1;
        fclose(file);
        return pages * 4;
    }

    // All clients connect, send a request each and then read a reply each, over and over.
    static void run_clients(const NamesServer& server, int requests) {
        std::vector<std::unique_ptr<RawClient>> clients;
        for (int i = 0; i < kClients; ++i) clients.push_back(std::make_unique<RawClient>(server.port()));
        for (int round = 0; round < requests; ++round) {
            for (int i = 0; i < kClients; ++i) {
                const std::string digits = std::to_string(i);
                const std::string name = std::to_string(digits.size() + 1) + '"' + digits + "\"\n";
                clients[static_cast<std::size_t>(i)]->send(
                    frame(round % 2 == 0 ? "7\"rebind\"\n5\"load\"\n" + name + "2\"v\"\n"
                                         : "8\"resolve\"\n5\"load\"\n" + name));
            }
            const std::string expected = round % 2 == 0 ? "0 " : "0 2\"v\"\n";
            for (const std::unique_ptr<RawClient>& client : clients) {
                ASSERT_EQ(client->receive_message(), expected) << "round " << round;
            }
        }
    }
};

TEST_P(NamesLoad, AThousandClientsAtOnceLeaveNothingBehind) {
    NamesServer server({"-NSmode", GetParam()});
    const int descriptors = server.descriptors();
    const bool starts_threads = std::string("threads") == GetParam();
    const int threads = server.threads() + (starts_threads ? kThreadsBesideClients : 0);
    run_clients(server, 2);  // what the server keeps for later use is there now
    ASSERT_FALSE(HasFatalFailure());
    EXPECT_TRUE(server.settles_at(descriptors, threads)) << server.descriptors();
    const long before = resident(server);
    run_clients(server, kRequests);
    EXPECT_TRUE(server.settles_at(descriptors, threads)) << server.descriptors() << ' ' << server.threads();
    if (!kKeepsFreedMemory) {
        EXPECT_LE(resident(server), before + 4096);
    }
    EXPECT_EQ(server.stop(), 0);
}

INSTANTIATE_TEST_SUITE_P(EachMode, NamesLoad, ::testing::Values("poller", "threads"));

}  // namespace
