// Objects that count their references.
//
//   KELResource              base of a counted object; deletes itself with its last reference
//   KELResourceImpl          the record that holds the count
//   KELResourceImplFactory   recycles up to 1024 records
//
//     class Table : public KELResource { ... };
//     Table* table = new Table;   // one reference
//     table->_ref();              // 2
//     table->_unref();            // 1
//     table->_unref();            // 0: deleted
//
// The record is made when the count first changes, so that an object nobody shares has none. The
// count is safe in any thread while the record is shared, which is the initial state; switch it
// off only for objects that stay in one thread.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_RESOURCE_H
#define KEL_CORE_RESOURCE_H

#include <kel/config.h>
#include <kel/core/spin_mutex.h>

class KEL_API KELResourceImpl {
public:
    // The sharing that new and recycled records start with. Initially 1.
    static void set_init_sharing(unsigned char on);
    static unsigned char get_init_sharing();

    // What set_init_sharing() stored; read without a lock.
    static unsigned char _init_sharing;

private:
    friend class KELResource;
    friend class KELResourceImplFactory;

    KELResourceImpl();  // count 1
    KELResourceImpl(const KELResourceImpl&) = delete;
    KELResourceImpl& operator=(const KELResourceImpl&) = delete;

    // Adds `change` to the count, under the mutex when shared, and returns the new count.
    std::int32_t add(std::int32_t change);

    std::int32_t _count;
    unsigned char _sharing;
    KELSpinMutex _mutex;  // guards _count while _sharing is on
};

class KEL_API KELResourceImplFactory {
public:
    KELResourceImplFactory(const KELResourceImplFactory&) = delete;
    KELResourceImplFactory& operator=(const KELResourceImplFactory&) = delete;

    // The one pool of the process, made on first use and never null.
    static KELResourceImplFactory* instance();

    // A record with count 1 and the initial sharing: the one parked last, or a new one. The caller
    // gives it back with destroy(). Throws CORBA::NO_RESOURCES or std::bad_alloc.
    KELResourceImpl* create();

    // Parks the record with count 0, or deletes it when 1024 are parked. Null is ignored.
    void destroy(KELResourceImpl* r);

    // Deletes the parked records, the one parked last first.
    void garbage_collect();

private:
    KELResourceImplFactory();

    KELSpinMutex _guard;
    std::uint32_t _parked_count KEL_GUARDED_BY(_guard);
    KELResourceImpl* _parked[1024] KEL_GUARDED_BY(_guard);
};

class KEL_API KELResource {
public:
    KELResource();

    // The copy is an object of its own, with one reference.
    KELResource(const KELResource& other);
    KELResource& operator=(const KELResource& other);

    // Adds a reference and returns the new count: 2 for the first call on a new object. Throws
    // what KELResourceImplFactory::create() throws.
    unsigned long _ref();

    // Drops a reference and returns the new count. At 0, and when nobody ever changed the count,
    // the object deletes itself and the result is 0.
    virtual long _unref();

    // Drops a reference but never deletes; an object whose count never changed gives 0 and keeps
    // its one reference.
    virtual unsigned long _deref();

    virtual ~KELResource();

    // The references there are: 1 while nobody has changed the count.
    unsigned long _num_refs();

    // Sets the count to 0 without locking.
    void _reset_refs();

    // Switches the locking of this object's count on or off. Call it before the object is shared.
    void _set_sharing(unsigned char on);

    // As KELResourceImpl::set_init_sharing().
    static void set_init_sharing(unsigned char on);

    // Deletes the parked records.
    static void garbage_collect();

    KELResourceImpl* _impl;  // null until first needed

private:
    KELResourceImpl* record();  // makes it if there is none
};

#endif
