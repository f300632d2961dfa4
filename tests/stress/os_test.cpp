// What is found out about this machine once and kept for all threads. Every test starts a process of
// its own, so that the threads are the first to ask.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/containers/strings.h>
#include <kel/os/base_util.h>
#include <kel/os/portable.h>
#include <sys/socket.h>

#include <string>

#include "tests/stress/together.h"

namespace kel {
namespace test {
namespace {

std::string text(char* owned) {
    const CORBA_String_var hold(owned);
    return hold.in() != nullptr ? hold.in() : "(null)";
}

// All that this machine says of itself, one line a fact.
std::string whoami() {
    int family = 0;
    std::string facts = std::string(KELPortable::host_name()) + "\n";
    facts += std::string(BaseUtil::user_name()) + "\n";
    facts += text(KELPortable::ip_addr(nullptr)) + "\n";
    facts += text(KELPortable::ipAddr(AF_INET, nullptr)) + "\n";
    facts += text(KELPortable::ipAddr(AF_INET6, nullptr)) + "\n";
    facts += text(KELPortable::host2ip(family, nullptr)) + "\n";
    facts += KELPortable::is_local("127.0.0.1") ? "local\n" : "remote\n";
    facts += KELPortable::isLocal(nullptr) ? "local\n" : "remote\n";
    return facts;
}

TEST(HostFacts, AreTheSameForAllThreads) {
    std::string facts[crowd];
    together(crowd, [&facts](int i) {
        facts[i] = whoami();
        for (int n = 0; n < 10; ++n) ASSERT_EQ(whoami(), facts[i]);
    });
    for (const std::string& of_thread : facts) EXPECT_EQ(of_thread, facts[0]);
}

TEST(HostFacts, TextsStayWhereTheyAre) {
    const char* host[crowd] = {};
    const char* user[crowd] = {};
    together(crowd, [&](int i) {
        host[i] = KELPortable::host_name();
        user[i] = BaseUtil::user_name();
    });
    for (int i = 0; i < crowd; ++i) {
        EXPECT_EQ(host[i], host[0]);
        EXPECT_EQ(user[i], user[0]);
    }
}

}  // namespace
}  // namespace test
}  // namespace kel
