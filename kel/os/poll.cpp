// SPDX-License-Identifier: MIT
#include <kel/os/poll.h>

#include <algorithm>
#include <climits>
#include <memory>
#include <new>

static_assert(KELPoll::evMaskRead == POLLRDNORM && KELPoll::evMaskWrite == POLLWRNORM &&
                  KELPoll::evMaskError == POLLERR,
              "the masks go to the system's poll as they are");

const short KELPoll::evMaskRead;
const short KELPoll::evMaskWrite;
const short KELPoll::evMaskError;

KELPoll::SupportedAPIs KELPoll::_defaultAPI = KELPoll::API_POLL;

namespace {

// Computed unsigned: a time that does not fit wraps to its low 32 bits.
std::int32_t to_milliseconds(const timeval& tv) {
    const std::uint32_t ms = static_cast<std::uint32_t>(tv.tv_sec) * 1000u;
    return static_cast<std::int32_t>(ms + static_cast<std::uint32_t>(tv.tv_usec / 1000));
}

timeval from_milliseconds(int ms) {
    timeval tv;
    tv.tv_sec = ms / 1000;
    tv.tv_usec = (ms % 1000) * 1000;
    return tv;
}

}  // namespace

// --- TimeVal ---------------------------------------------------------------------------------------

KELPoll::TimeVal::TimeVal() : _ptr(&_tv), _tv(), _ms(0) {}

void KELPoll::TimeVal::set(const timeval* tv) {
    if (tv == nullptr) {
        _ptr = nullptr;
        _ms = -1;
        return;
    }
    _tv = *tv;
    _ptr = &_tv;
    _ms = to_milliseconds(_tv);
}

void KELPoll::TimeVal::set(int ms) {
    _ms = ms;
    _tv = from_milliseconds(std::max(ms, 0));
    _ptr = ms >= 0 ? &_tv : nullptr;
}

void KELPoll::TimeVal::set(int sec, int usec) {
    _tv.tv_sec = sec;
    _tv.tv_usec = usec;
    _ptr = &_tv;
    _ms = to_milliseconds(_tv);
}

// --- The list that doubles -------------------------------------------------------------------------

template <class T>
KELPoll::List<T>::List(std::int32_t slots)
    : count(0), capacity(std::max(slots, 1)), items(new T[static_cast<std::size_t>(capacity)]) {}

// A copy with twice the capacity when the list is full, else null. The list stays as it is.
template <class T>
T* KELPoll::List<T>::grown() const {
    if (count < capacity) return nullptr;
    if (capacity > INT_MAX / 2) throw std::bad_alloc();
    T* larger = new T[2 * static_cast<std::size_t>(capacity)];
    std::copy(items, items + count, larger);
    return larger;
}

// Replaces the items by what grown() gave; null changes nothing.
template <class T>
void KELPoll::List<T>::adopt(T* larger) {
    if (larger == nullptr) return;
    delete[] items;
    items = larger;
    capacity *= 2;
}

// --- KELPoll ---------------------------------------------------------------------------------------

KELPoll::KELPoll(int capacity) : _entries(capacity), _users(capacity) {}

KELPoll::~KELPoll() = default;

KELPoll* KELPoll::create(int capacity, SupportedAPIs api) {
    if (api == API_SELECT) return new KELImplSelect(capacity);
    return new KELImplPoll(capacity);
}

// Other threads may read the default at this moment.
void KELPoll::defaultAPI(SupportedAPIs api) { __atomic_store(&_defaultAPI, &api, __ATOMIC_RELAXED); }

int KELPoll::milliseconds(timeval* tv) { return tv == nullptr ? -1 : to_milliseconds(*tv); }

void KELPoll::add(int fd, short events, void* user) {
    if (_entries.count == _entries.capacity || _users.count == _users.capacity) {
        std::unique_ptr<pollfd[]> entries(_entries.grown());
        std::unique_ptr<void*[]> users(_users.grown());
        // Nothing below throws: a poller without memory is left as it was.
        _entries.adopt(entries.release());
        _users.adopt(users.release());
    }
    _entries.append(pollfd{fd, events, 0});
    _users.append(user);
}

void KELPoll::remove(int fd) {
    int index = 0;
    while (index < _entries.count) {
        if (_entries.items[index].fd != fd) {
            ++index;
            continue;
        }
        // The last entry fills the gap. It may hold `fd` as well, so the same index is looked at again.
        const int last = --_entries.count;
        _users.count = last;
        _entries.items[index] = _entries.items[last];
        _users.items[index] = _users.items[last];
    }
}

void KELPoll::removeAll() {
    _entries.count = 0;
    _users.count = 0;
}

short KELPoll::requestedEvent(int index) { return has(index) ? _entries.items[index].events : short{0}; }

short KELPoll::reportedEvent(int index) { return has(index) ? _entries.items[index].revents : short{0}; }

bool KELPoll::fdIsSet(int fd) const {
    const pollfd* end = _entries.items + _entries.count;
    return std::any_of(static_cast<const pollfd*>(_entries.items), end,
                       [fd](const pollfd& entry) { return entry.fd == fd; });
}

// --- KELImplPoll -----------------------------------------------------------------------------------

KELImplPoll::KELImplPoll(int capacity) : KELPoll(capacity) {}

KELImplPoll::~KELImplPoll() = default;

// Deliberate: an interrupted wait fails with EINTR, with select too; only the caller knows how much of
// its time is left. Pinned by Poller.AnInterruptedWaitIsNotRepeated.
int KELImplPoll::poll_entries(int ms) {
    return poll(_entries.items, static_cast<nfds_t>(_entries.count), ms);
}

int KELImplPoll::_waitForEvents(timeval* tv) { return poll_entries(milliseconds(tv)); }
int KELImplPoll::waitForEvents(timeval* tv) { return poll_entries(milliseconds(tv)); }
int KELImplPoll::_waitForEvents(int ms) { return poll_entries(ms); }
int KELImplPoll::waitForEvents(int ms) { return poll_entries(ms); }
int KELImplPoll::_waitForEvents(const TimeVal& time) { return poll_entries(time._ms); }
int KELImplPoll::waitForEvents(const TimeVal& time) { return poll_entries(time._ms); }

// --- KELImplSelect ---------------------------------------------------------------------------------

namespace {

// The events of the three sets, in the order in which an entry is matched with them.
const short set_events[3] = {KELPoll::evMaskRead, KELPoll::evMaskWrite, KELPoll::evMaskError};

// A set has no bit for other descriptors; FD_SET would write past its end.
bool fits_in_a_set(int fd) { return fd >= 0 && fd < FD_SETSIZE; }

int one_above(int fd) { return fd == INT_MAX ? INT_MAX : fd + 1; }

}  // namespace

KELImplSelect::KELImplSelect(int capacity) : KELPoll(capacity), _sets(), _nfds(0) {}

KELImplSelect::~KELImplSelect() = default;

// Deliberate: an entry goes into one set only, so one that asks for read and write is watched for
// read. Pinned by SelectWait.AnEntryForReadAndWriteIsWatchedForReadOnly.
int KELImplSelect::_waitForEvents(timeval* tv) {
    fd_set* watched[3] = {nullptr, nullptr, nullptr};
    for (fd_set& set : _sets) FD_ZERO(&set);
    for (int i = 0; i < _entries.count; ++i) {
        pollfd& entry = _entries.items[i];
        entry.revents = 0;
        if (!fits_in_a_set(entry.fd)) continue;
        for (int kind = 0; kind < 3; ++kind) {
            if ((entry.events & set_events[kind]) == 0) continue;
            FD_SET(entry.fd, &_sets[kind]);
            watched[kind] = &_sets[kind];
            break;
        }
    }
    timeval copy = tv != nullptr ? *tv : timeval();  // select may write into its time-out
    return select(std::min<int>(_nfds, FD_SETSIZE), watched[0], watched[1], watched[2],
                  tv != nullptr ? &copy : nullptr);
}

// Deliberate: only -1 waits without limit; other negative values reach select, which refuses them.
// Pinned by SelectWaitReal.MinusFiveMillisecondsIsInvalid.
int KELImplSelect::_waitForEvents(int ms) {
    if (ms == -1) return _waitForEvents(static_cast<timeval*>(nullptr));
    timeval tv = from_milliseconds(ms);
    return _waitForEvents(&tv);
}

int KELImplSelect::_waitForEvents(const TimeVal& time) { return _waitForEvents(time._ptr); }

int KELImplSelect::waitForEvents(timeval* tv) { return report(_waitForEvents(tv)); }
int KELImplSelect::waitForEvents(int ms) { return report(_waitForEvents(ms)); }
int KELImplSelect::waitForEvents(const TimeVal& time) { return report(_waitForEvents(time)); }

int KELImplSelect::report(int ready) {
    if (ready > 0) setReportedEvents();
    return ready;
}

// Deliberate: a ready entry reports the whole mask it asked for, not the event that came. Pinned by
// SelectWait.AReadyEntryReportsItsWholeMask.
void KELImplSelect::setReportedEvents() {
    for (int i = 0; i < _entries.count; ++i) {
        pollfd& entry = _entries.items[i];
        if (!fits_in_a_set(entry.fd)) continue;
        for (int kind = 0; kind < 3; ++kind) {
            if ((entry.events & set_events[kind]) == 0 || !FD_ISSET(entry.fd, &_sets[kind])) continue;
            entry.revents = entry.events;
            FD_CLR(entry.fd, &_sets[kind]);
            break;
        }
    }
}

void KELImplSelect::add(int fd, short events, void* user) {
    KELPoll::add(fd, events, user);
    _nfds = std::max<int>(_nfds, one_above(fd));
}

void KELImplSelect::removeAll() {
    KELPoll::removeAll();
    _nfds = 0;
}

// Deliberate: the count of descriptors is lowered by one and not recomputed, also for a descriptor
// that was not registered. Pinned by SelectWait.RemovingTheHighestDescriptorLowersTheCountByOne and
// SelectWait.RemovingAnUnregisteredDescriptorStillLowersTheCount.
void KELImplSelect::remove(int fd) {
    if (fits_in_a_set(fd) && fdIsSet(fd)) {
        for (fd_set& set : _sets) FD_CLR(fd, &set);
    }
    KELPoll::remove(fd);
    if (_nfds == one_above(fd)) _nfds = fd;
}
