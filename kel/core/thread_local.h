// Objects that exist once per thread.
//
//   KELThreadLocal   base of a kind of per-thread object; found again by the slot of its kind
//
//     class Trace : public KELThreadLocal {
//     public:
//         explicit Trace(unsigned long slot) : KELThreadLocal(slot) {}
//     };
//     new Trace(slot);                      // this thread's value for the slot
//     KELThreadLocal::instance(slot);       // the same object; null in any other thread
//
// A kind draws its slot once: hold _mutex, take _cnt and increment it. When a thread ends, each of
// its objects is finalised, in the order of the slot table. The main thread's are not.
//
// Any thread. _mutex guards everything and is held while objects are finalised; it is recursive, so
// finalize() and destructors may come back here.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_THREAD_LOCAL_H
#define KEL_CORE_THREAD_LOCAL_H

#include <kel/config.h>
#include <kel/core/mutex.h>
#include <kel/core/thread.h>
#include <kel/fwd.h>
#include <pthread.h>

class KEL_API KELThreadLocal {
public:
    typedef KELDictionary<KELUniqueId, KELThreadLocal*> SlotTable;  // one thread's objects by slot
    typedef KELDictionary<KELThreadId, SlotTable*> ThreadTable;     // the slot tables by thread

    // Registers the object as the calling thread's value for `slot`. Throws CORBA::BAD_PARAM when
    // the thread has one already, which stays registered, and CORBA::NO_RESOURCES (minor = errno,
    // COMPLETED_NO) when the thread-specific key cannot be created.
    explicit KELThreadLocal(unsigned long slot);
    KELThreadLocal(const KELThreadLocal&) = delete;
    KELThreadLocal& operator=(const KELThreadLocal&) = delete;

    // Unregisters the object from the thread that constructed it. Destroy an object in its own
    // thread: elsewhere it is the caller's thread-specific value that is reset.
    virtual ~KELThreadLocal();

    // Releases the object when its thread ends; the default deletes it.
    virtual void finalize();

    // The calling thread's object for `slot`, or null. Creates nothing and never throws.
    static KELThreadLocal* instance(unsigned long slot);

    // The tables of all threads, made on first use and never freed. Hold _mutex to use them.
    static ThreadTable* _dict_instance() KEL_NO_THREAD_SAFETY_ANALYSIS;

    // Finalises the calling thread's objects. `arg` is ignored; a second call finds nothing to do.
    static void _exit_thread(void* arg);

    KELThreadId _owner;  // the thread that constructed the object
    // The slot of its kind.
    unsigned long _slot;

    // Guards the tables and the slots; held while objects are finalised.
    static KELRMutex _mutex;
    static pthread_key_t _key;  // its destructor is _exit_thread; created by the first construction
    // What _dict_instance() made, or null.
    static ThreadTable* _key_dict KEL_GUARDED_BY(_mutex);
    static std::uint32_t _cnt KEL_GUARDED_BY(_mutex);  // the next free slot
};

#endif
