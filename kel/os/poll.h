// Waits until one of several descriptors can be read or written.
//
//   KELPoll            the registered descriptors and what both implementations share
//   KELPoll::TimeVal   a time-out prepared once for either implementation
//   KELImplPoll        waits with the system's poll
//   KELImplSelect      waits with select: descriptors 0 to 1023 only
//
//     std::unique_ptr<KELPoll> poller(KELPoll::create(8, KELPoll::_defaultAPI));
//     poller->add(fd, KELPoll::evMaskRead, connection);
//     if (poller->waitForEvents(500) > 0)                        // milliseconds
//         for (int i = 0; i < poller->count(); ++i)
//             if (poller->reportedEvent(i) != 0) serve(poller->userData(i));
//
// A poller takes no lock: one thread at a time uses it. It owns neither the descriptors nor what
// the user pointers point at.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_POLL_H
#define KEL_OS_POLL_H

#include <kel/config.h>
#include <poll.h>
#include <sys/select.h>

class KEL_API KELPoll {
public:
    // The calls of the system that a poller may wait with.
    enum SupportedAPIs : int {
        API_SELECT = 1,  // select
        API_POLL = 2     // poll
    };

    // What to wait for, and what a wait reports: the bits of the system's poll.
    static const short evMaskRead = 0x0040;
    static const short evMaskWrite = 0x0100;
    static const short evMaskError = 0x0008;

    // A time-out as a timeval and as milliseconds, kept in step. A new one waits no time at all.
    struct KEL_API TimeVal {
        timeval* _ptr;     // this object's `_tv`, or null to wait without limit
        timeval _tv;       // seconds and microseconds
        std::int32_t _ms;  // milliseconds; a negative value waits without limit

        TimeVal();
        TimeVal(const TimeVal&) = delete;
        TimeVal& operator=(const TimeVal&) = delete;

        // Null waits without limit. The value is copied.
        void set(const timeval* tv);
        // Milliseconds; a negative value waits without limit.
        void set(int ms);
        // Seconds and microseconds.
        void set(int sec, int usec);
    };

    // The implementation that tcpConnect uses and that others choose who do not care. It starts as
    // API_POLL. Any thread may set it at any time; pollers that exist stay as they are.
    static SupportedAPIs _defaultAPI;
    static void defaultAPI(SupportedAPIs api);

    // A new poller with room for `capacity` descriptors before it must grow: API_SELECT gives a
    // KELImplSelect, any other value a KELImplPoll. The caller deletes it.
    static KELPoll* create(int capacity, SupportedAPIs api);

    // The time-out in milliseconds, microseconds truncated; -1 for null.
    static int milliseconds(timeval* tv);

    // A capacity below 1 counts as 1. std::bad_alloc when there is no memory.
    explicit KELPoll(int capacity);
    KELPoll(const KELPoll&) = delete;
    KELPoll& operator=(const KELPoll&) = delete;
    virtual ~KELPoll();

    // Registers `fd` for `events`, a sum of the masks. A descriptor may be registered twice; it is
    // then two entries. std::bad_alloc leaves the poller as it was.
    virtual void add(int fd, short events, void* user);

    // Drops every entry of `fd`. Entries may change their index.
    virtual void remove(int fd);

    // Drops all entries and keeps the memory.
    virtual void removeAll();

    // Each wait is one call of the system: the number of ready entries, 0 when the time is over,
    // -1 with errno on failure. An interrupted wait fails with EINTR and is not repeated. A null
    // pointer or a time-out of -1 waits without limit. The forms with a leading underscore may
    // leave the reported events unset; ask them only whether something is ready.
    virtual int _waitForEvents(timeval* tv) = 0;
    virtual int waitForEvents(timeval* tv) = 0;
    virtual int _waitForEvents(int ms) = 0;
    virtual int waitForEvents(int ms) = 0;
    virtual int _waitForEvents(const TimeVal& time) = 0;
    virtual int waitForEvents(const TimeVal& time) = 0;

    // The events of the entry at `index`, from 0 to count() - 1; 0 outside of that.
    virtual short requestedEvent(int index);
    virtual short reportedEvent(int index);

    // Whether some entry holds `fd`.
    bool fdIsSet(int fd) const;

    // The number of entries.
    int count() const { return _entries.count; }
    // The descriptor of the entry at `index`; -1 outside of 0 to count() - 1.
    int descriptor(int index) const { return has(index) ? _entries.items[index].fd : -1; }
    // The user pointer of the entry at `index`; null outside of 0 to count() - 1.
    void* userData(int index) const { return has(index) ? _users.items[index] : nullptr; }

protected:
    // An array that doubles when it is full.
    template <class T>
    struct List {
        // How many items are in use, how many there is room for, and the owned array.
        std::int32_t count;
        std::int32_t capacity;
        T* items;

        // Room for `slots` items, at least for one. Throws std::bad_alloc.
        explicit List(std::int32_t slots);
        List(const List&) = delete;
        List& operator=(const List&) = delete;
        ~List() { delete[] items; }

        // A copy twice as large, which the caller owns, or null when the list is not full yet.
        T* grown() const;
        // Takes what grown() gave over; null is ignored.
        void adopt(T* larger);
        // Adds an item, for which there must be room.
        void append(const T& item) { items[count++] = item; }
    };

    // Whether there is an entry at `index`.
    bool has(int index) const { return index >= 0 && index < _entries.count; }

    // Descriptors with their events.
    List<pollfd> _entries;
    List<void*> _users;  // parallel to _entries: same index, same count
};

class KEL_API KELImplPoll : virtual public KELPoll {
public:
    // As for KELPoll.
    explicit KELImplPoll(int capacity);
    ~KELImplPoll() override;

    // Both forms report the events here: the system writes them into the entries.
    int _waitForEvents(timeval* tv) override;
    int waitForEvents(timeval* tv) override;
    int _waitForEvents(int ms) override;
    int waitForEvents(int ms) override;
    int _waitForEvents(const TimeVal& time) override;
    int waitForEvents(const TimeVal& time) override;

private:
    int poll_entries(int ms);
};

class KEL_API KELImplSelect : virtual public KELPoll {
public:
    // As for KELPoll.
    explicit KELImplSelect(int capacity);
    ~KELImplSelect() override;

    // Each entry is watched for one event, the first it asks for in the order read, write, error.
    // Of the milliseconds only -1 waits without limit; other negative values fail with EINVAL.
    int _waitForEvents(timeval* tv) override;
    int waitForEvents(timeval* tv) override;
    int _waitForEvents(int ms) override;
    int waitForEvents(int ms) override;
    int _waitForEvents(const TimeVal& time) override;
    int waitForEvents(const TimeVal& time) override;

    // Descriptors of 1024 and above can be registered but are never watched.
    void add(int fd, short events, void* user) override;
    void removeAll() override;
    void remove(int fd) override;

    // Gives every entry that the last wait found ready the whole mask it asked for.
    void setReportedEvents();

private:
    int report(int ready);

    fd_set _sets[3];     // read, write, error
    std::int32_t _nfds;  // highest registered descriptor plus one
};

#endif
