// Threads.
//
//   KELThreadId   the identifier of one thread; a value, and a key for KELDictionary
//   KELThread     base of every thread: derive, write begin(), construct, run()
//
//     class Listener : public KELThread {
//     public:
//         Listener() : KELThread(0) {}
//         void begin() override;   // runs in the new thread
//     };
//     (new Listener)->run();       // returns at once
//
// Threads are detached; nobody joins them. The object must outlive the thread's use of it. A body
// may delete its own object as its last act.
//
// Constructing, destroying and run() are safe in any thread. instance() and terminateAll() take no
// lock: they must not race construction or destruction of thread objects.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_THREAD_H
#define KEL_CORE_THREAD_H

#include <kel/config.h>
#include <kel/core/mutex.h>
#include <pthread.h>

#ifndef KEL_INLINE_THREAD
// What the definitions in line begin with; empty in the unit that owns them.
#define KEL_INLINE_THREAD KEL_INLINE
#endif

// A thread object's identifier is replaced by its new thread while others read it, so each access
// is one relaxed load or store.
class KEL_API KELThreadId {
public:
    // Stands for no thread yet.
    KELThreadId() : _id() {}
    // Stands for the thread with this identifier of the system.
    KELThreadId(pthread_t id) : _id(id) {}
    KELThreadId(const KELThreadId& other) : _id(other.id()) {}
    KELThreadId& operator=(const KELThreadId& other) {
        __atomic_store_n(&_id, other.id(), __ATOMIC_RELAXED);
        return *this;
    }

    // The identifier of the system.
    pthread_t id() const { return __atomic_load_n(&_id, __ATOMIC_RELAXED); }

private:
    pthread_t _id;
};

// Whether both stand for the same thread.
inline bool operator==(const KELThreadId& a, const KELThreadId& b) { return a.id() == b.id(); }
inline bool operator!=(const KELThreadId& a, const KELThreadId& b) { return !(a == b); }

// 0 when the identifiers are equal, otherwise their order as numbers.
KEL_API int compare(const KELThreadId& a, const KELThreadId& b);

// 32 bits in either word size, as for every hash.
KEL_API unsigned long _kel_hash(const KELThreadId& id);

KEL_INLINE_BEGIN

KEL_INLINE_THREAD int compare(const KELThreadId& a, const KELThreadId& b) {
    const pthread_t x = a.id();
    const pthread_t y = b.id();
    return x < y ? -1 : x > y;
}

KEL_INLINE_THREAD unsigned long _kel_hash(const KELThreadId& id) {
    return static_cast<std::uint32_t>(id.id());
}

KEL_INLINE_END

class KEL_API KELThread {
public:
    // How run() starts a thread: stack size in bytes, start routine, its argument.
    typedef void (*Factory)(unsigned long stacksize, void* (*start)(void*), void* arg);

    // Registers the object and starts nothing. `stacksize` is in bytes and goes to the system as
    // it is; 0 asks for the system's default.
    explicit KELThread(long stacksize);
    KELThread(const KELThread&) = delete;
    KELThread& operator=(const KELThread&) = delete;

    // Takes the object out of the registry. It neither stops its thread nor waits for it.
    virtual ~KELThread();

    // Starts a thread on this object through _factory. A second call starts another one. Throws
    // CORBA::NO_RESOURCES (minor = errno, COMPLETED_NO) when the system gives no thread; a stack
    // size that it refuses, such as one below its minimum, ends the process.
    virtual void run();

    // The body of the thread. A CORBA_Exception that leaves it is printed on standard output; any
    // other exception ends the process.
    virtual void begin() = 0;

    // The newest registered object with this identifier, or null. An object carries its creator's
    // identifier until its own thread has begun.
    static KELThread* instance(const KELThreadId& id) KEL_NO_THREAD_SAFETY_ANALYSIS;

    // Calls terminate() on every registered object, newest first.
    static void terminateAll() KEL_NO_THREAD_SAFETY_ANALYSIS;

    // Do nothing.
    void terminate();
    static void yield();

    // Starts a detached thread: the first value of _factory. Fails as run() does.
    static void _create_thread(unsigned long stacksize, void* (*start)(void*), void* arg);

    // The start routine: `arg` is the KELThread. Always returns null.
    static void* _start(void* arg);

    KELThreadId _tid;  // the creator's until the new thread puts its own here
    KELThread* _next;  // next older object of the registry
    KELThread* _prev;  // next newer object of the registry
    // Bytes; 0 is the system's default.
    long _stacksize;

    static KELThread* _first KEL_GUARDED_BY(_mutex);  // the newest object
    // Guards the registry.
    static KELMutex _mutex;

    // PTHREAD_INHERIT_SCHED or PTHREAD_EXPLICIT_SCHED for new threads; -1 sets no attribute.
    static std::int32_t _inheritsched;

    // Clients may set their own before they start threads.
    static Factory _factory;
};

#endif
