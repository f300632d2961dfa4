// SPDX-License-Identifier: MIT
// The pollers: one wait over descriptors of which one is ready.
#include <bench/support/bench.h>
#include <kel/os/poll.h>
#include <poll.h>
#include <sys/epoll.h>
#include <sys/resource.h>
#include <sys/select.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <vector>

using bench::growth;
using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

// `n` descriptors that can be read from: the last has a byte in it, the others are the same empty pipe.
class Descriptors {
public:
    explicit Descriptors(long n) {
        allow_many();
        if (pipe(_ready) != 0 || pipe(_idle) != 0 || write(_ready[1], "x", 1) != 1) std::abort();
        for (long i = 0; i < n - 1; ++i) all.push_back(dup(_idle[0]));
        all.push_back(_ready[0]);
        if (*std::min_element(all.begin(), all.end()) < 0) std::abort();
    }
    ~Descriptors() {
        for (int fd : all) close(fd);
        close(_ready[1]);
        close(_idle[0]);
        close(_idle[1]);
    }
    Descriptors(const Descriptors&) = delete;
    Descriptors& operator=(const Descriptors&) = delete;

    std::vector<int> all;

private:
    static void allow_many() {
        rlimit limit;
        getrlimit(RLIMIT_NOFILE, &limit);
        limit.rlim_cur = limit.rlim_max;
        setrlimit(RLIMIT_NOFILE, &limit);
    }

    int _ready[2];
    int _idle[2];
};

void wait_raw(benchmark::State& state, long n) {
    const Descriptors descriptors(n);
    std::vector<pollfd> entries;
    for (int fd : descriptors.all) entries.push_back({fd, POLLRDNORM, 0});
    for (auto _ : state) benchmark::DoNotOptimize(poll(entries.data(), entries.size(), 1000));
}

void wait_raw_select(benchmark::State& state, long n) {
    const Descriptors descriptors(n);
    for (auto _ : state) {
        fd_set reading;
        FD_ZERO(&reading);
        int highest = 0;
        for (int fd : descriptors.all) {
            FD_SET(fd, &reading);
            highest = std::max(highest, fd);
        }
        timeval limit = {1, 0};
        benchmark::DoNotOptimize(select(highest + 1, &reading, nullptr, nullptr, &limit));
    }
}

void wait_epoll(benchmark::State& state, long n) {
    const Descriptors descriptors(n);
    const int set = epoll_create1(0);
    for (int fd : descriptors.all) {
        epoll_event event = {};
        event.events = EPOLLIN;
        epoll_ctl(set, EPOLL_CTL_ADD, fd, &event);
    }
    epoll_event events[64];
    for (auto _ : state) benchmark::DoNotOptimize(epoll_wait(set, events, 64, 1000));
    close(set);
}

void wait_kel(benchmark::State& state, long n, KELPoll::SupportedAPIs api) {
    const Descriptors descriptors(n);
    const std::unique_ptr<KELPoll> poller(KELPoll::create(4, api));
    for (int fd : descriptors.all) poller->add(fd, KELPoll::evMaskRead, nullptr);
    for (auto _ : state) benchmark::DoNotOptimize(poller->waitForEvents(1000));
}

void register_raw(benchmark::State& state, long n) {
    for (auto _ : state) {
        std::vector<pollfd> entries;
        std::vector<void*> users;
        for (int fd = 0; fd < n; ++fd) {
            entries.push_back({fd, POLLRDNORM, 0});
            users.push_back(nullptr);
        }
        benchmark::DoNotOptimize(entries.data());
        benchmark::DoNotOptimize(users.data());
    }
}

void register_kel(benchmark::State& state, long n) {
    for (auto _ : state) {
        const std::unique_ptr<KELPoll> poller(KELPoll::create(4, KELPoll::API_POLL));
        for (int fd = 0; fd < n; ++fd) poller->add(fd, KELPoll::evMaskRead, nullptr);
        benchmark::DoNotOptimize(poller.get());
    }
}

void poll_line(const std::string& work, const std::string& who, void (*run)(benchmark::State&, long),
               long n) {
    line(work, who, [=](benchmark::State& state) { run(state, n); });
}

void kel_poll(benchmark::State& state, long n) { wait_kel(state, n, KELPoll::API_POLL); }
void kel_select(benchmark::State& state, long n) { wait_kel(state, n, KELPoll::API_SELECT); }

const bool registered = [] {
    poll_line("poll 64 descriptors, one ready", kLimit, wait_raw, 64);
    poll_line("poll 64 descriptors, one ready", "epoll", wait_epoll, 64);
    poll_line("poll 64 descriptors, one ready", kKel, kel_poll, 64);

    poll_line("select 64 descriptors, one ready", kLimit, wait_raw_select, 64);
    poll_line("select 64 descriptors, one ready", kKel, kel_select, 64);

    poll_line("register 64 descriptors", kLimit, register_raw, 64);
    poll_line("register 64 descriptors", kKel, register_kel, 64);

    for (long n = 16; n <= 16384; n *= 4) {
        growth("pollers, one wait", "poll", n, [=](benchmark::State& state) { wait_raw(state, n); });
        growth("pollers, one wait", "epoll", n, [=](benchmark::State& state) { wait_epoll(state, n); });
        growth("pollers, one wait", kKel, n, [=](benchmark::State& state) { kel_poll(state, n); });
    }
    return true;
}();

}  // namespace
