// The pipe and the pollers, on descriptors of the system.
//
// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/os/pipe.h>
#include <kel/os/poll.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <string>
#include <vector>

#include "tests/faults/matrix/scenario.h"
#include "tests/support/fault.h"

namespace {

using namespace kel::test;

// --- the pipe ----------------------------------------------------------------------------------------

class PipeIsMade : public Scenario {
public:
    ~PipeIsMade() override {
        for (int fd : still_open()) ::close(fd);
    }

private:
    void prepare() override {
        _ends.reserve(4);
        seams::pipe.script([this](int* ends) {
            const int rc = seams::pipe.real(ends);
            if (rc == 0) _ends.insert(_ends.end(), ends, ends + 2);
            return rc;
        });
    }
    void act() override { const KELPipe pipe; }

    std::string left_over() override {
        const std::size_t n = still_open().size();
        return n == 0 ? "" : std::to_string(n) + " descriptors";
    }
    std::vector<int> still_open() const {
        std::vector<int> open;
        for (int fd : _ends) {
            if (::fcntl(fd, F_GETFD) >= 0) open.push_back(fd);
        }
        return open;
    }

    std::vector<int> _ends;
};
KEL_SCENARIO(PipeIsMade).and_retried();

class PipeWrites : public Scenario {
    void act() override {
        const int there = _pipe.write("abc", 3);
        gives("%d, %d", there, _pipe.write_to_writer("de", 2));
    }
    KELPipe _pipe;
};
KEL_SCENARIO(PipeWrites).giving("3, 2");

class PipeReads : public Scenario {
    void prepare() override {
        _pipe.write("abc", 3);
        _pipe.write_to_writer("de", 2);
    }
    void act() override {
        char bytes[8];
        const int there = _pipe.read(bytes, sizeof bytes);
        gives("%d, %d", there, _pipe.read_from_writer(bytes, sizeof bytes));
    }
    KELPipe _pipe;
};
KEL_SCENARIO(PipeReads).giving("3, 2");

// --- the pollers -------------------------------------------------------------------------------------

// Both forms of the wait, on a descriptor that can be read.
template <KELPoll::SupportedAPIs api>
class Wait : public Scenario {
    void prepare() override { _pipe.write("x", 1); }
    void act() override {
        const std::unique_ptr<KELPoll> poller(KELPoll::create(1, api));
        poller->add(_pipe._read_fd, KELPoll::evMaskRead, this);
        const int plain = poller->_waitForEvents(0);
        const int reporting = poller->waitForEvents(0);
        gives("%d, %d, %s", plain, reporting, poller->reportedEvent(0) != 0 ? "reported" : "silent");
    }
    KELPipe _pipe;
};
using WaitByPoll = Wait<KELPoll::API_POLL>;
using WaitBySelect = Wait<KELPoll::API_SELECT>;
KEL_SCENARIO(WaitByPoll).giving("1, 1, reported").and_retried();
KEL_SCENARIO(WaitBySelect).giving("1, 1, reported").and_retried();

// A third entry does not fit any more.
template <KELPoll::SupportedAPIs api>
class FullPoller : public Scenario {
    void prepare() override {
        _poller->add(3, KELPoll::evMaskRead, this);
        _poller->add(4, KELPoll::evMaskWrite, this);
    }
    void act() override {
        _poller->add(5, KELPoll::evMaskError, nullptr);
        gives("%d entries", _poller->count());
    }
    std::string state() override {
        std::string entries;
        for (int i = 0; i < _poller->count(); ++i) {
            entries += std::to_string(_poller->descriptor(i)) + ":" +
                       std::to_string(_poller->requestedEvent(i)) +
                       (_poller->userData(i) == this ? " mine, " : ", ");
        }
        return entries;
    }
    const std::unique_ptr<KELPoll> _poller{KELPoll::create(2, api)};
};
using FullPollerOverPoll = FullPoller<KELPoll::API_POLL>;
using FullPollerOverSelect = FullPoller<KELPoll::API_SELECT>;
KEL_SCENARIO(FullPollerOverPoll).giving("3 entries").and_retried();
KEL_SCENARIO(FullPollerOverSelect).giving("3 entries").and_retried();

// From one place to sixteen.
template <KELPoll::SupportedAPIs api>
class GrowingPoller : public Scenario {
    void act() override {
        for (int fd = 0; fd < 16; ++fd) _poller->add(fd, KELPoll::evMaskRead, this);
        gives("%d entries", _poller->count());
    }
    std::string state() override {
        for (int i = 0; i < _poller->count(); ++i) {
            if (_poller->descriptor(i) != i || _poller->userData(i) != this) return "mixed up";
        }
        return "in order";
    }
    const std::unique_ptr<KELPoll> _poller{KELPoll::create(1, api)};
};
using GrowingPollerOverPoll = GrowingPoller<KELPoll::API_POLL>;
using GrowingPollerOverSelect = GrowingPoller<KELPoll::API_SELECT>;
KEL_SCENARIO(GrowingPollerOverPoll).giving("16 entries");
KEL_SCENARIO(GrowingPollerOverSelect).giving("16 entries");

}  // namespace
