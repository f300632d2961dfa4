// SPDX-License-Identifier: MIT
#include <kel/containers/dictionary.h>
#include <kel/core/internal/failure.h>
#include <kel/core/thread_local.h>
#include <kel/core/unique_id.h>

#include <memory>

pthread_key_t KELThreadLocal::_key;
KELThreadLocal::ThreadTable* KELThreadLocal::_key_dict = nullptr;
std::uint32_t KELThreadLocal::_cnt = 1;

namespace {

typedef KELThreadLocal::SlotTable SlotTable;
typedef KELThreadLocal::ThreadTable ThreadTable;

bool key_created KEL_GUARDED_BY(KELThreadLocal::_mutex) = false;

void create_key_once() KEL_REQUIRES(KELThreadLocal::_mutex) {
    if (key_created) return;
    const int rc = pthread_key_create(&KELThreadLocal::_key, &KELThreadLocal::_exit_thread);
    if (rc != 0) kel::internal::create_failed("pthread_key_create");
    key_created = true;
}

// The tables of all threads, made on first use. Static objects of a client may be built before
// KELThreadLocal::_mutex is, which until then is plain: nothing on their way locks it twice.
ThreadTable& thread_table() KEL_REQUIRES(KELThreadLocal::_mutex) {
    if (KELThreadLocal::_key_dict == nullptr) {
        __atomic_store_n(&KELThreadLocal::_key_dict, new ThreadTable, __ATOMIC_RELEASE);
    }
    return *KELThreadLocal::_key_dict;
}

KELThreadLocal* first_object(SlotTable& table) {
    SlotTable::Iterator entry(table);
    return (++entry)->_value;
}

// A slot table whose objects are being finalised. It is in no thread table any more, but finalize()
// may delete other objects of it, whose destructors find it here. finalize() may also register new
// objects and finalise those, hence a list.
class Teardown {
public:
    explicit Teardown(SlotTable* table) KEL_REQUIRES(KELThreadLocal::_mutex)
        : _table(table), _outer(_innermost) {
        _innermost = this;
    }
    Teardown(const Teardown&) = delete;
    Teardown& operator=(const Teardown&) = delete;
    ~Teardown() { _innermost = _outer; }

    void finalize_objects() {
        SlotTable::Iterator entries(*_table);
        while (SlotTable::Assoc* entry = ++entries) {
            if (entry->_value != nullptr) entry->_value->finalize();
            entry->_value = nullptr;
        }
    }

    // Whether `object` was in a table under teardown. It is not finalised any more.
    static bool forget(const KELThreadLocal* object) KEL_REQUIRES(KELThreadLocal::_mutex) {
        for (Teardown* teardown = _innermost; teardown != nullptr; teardown = teardown->_outer) {
            SlotTable::Iterator entries(*teardown->_table);
            while (SlotTable::Assoc* entry = ++entries) {
                if (entry->_value != object) continue;
                entry->_value = nullptr;
                return true;
            }
        }
        return false;
    }

private:
    const std::unique_ptr<SlotTable> _table;
    Teardown* const _outer;
    static Teardown* _innermost KEL_GUARDED_BY(KELThreadLocal::_mutex);
};

Teardown* Teardown::_innermost = nullptr;

}  // namespace

// What may throw comes first; whatever it throws, nothing is registered and the mutex is free.
KELThreadLocal::KELThreadLocal(unsigned long slot) : _owner(pthread_self()), _slot(slot) {
    KELRMutex_var hold(_mutex, 1);
    create_key_once();
    SlotTable* existing = nullptr;
    if (thread_table().atKey(_owner, existing)) {
        existing->add(KELUniqueId(slot), this);
        return;
    }
    // Any value but null makes the key's destructor run, which finds nothing where there is no memory below.
    pthread_setspecific(_key, this);
    std::unique_ptr<SlotTable> table(new SlotTable);
    table->add(KELUniqueId(slot), this);
    thread_table().add(_owner, table.get());
    table.release();
}

// Deliberate: the calling thread's key value is set even when another thread owns the object. Objects
// are destroyed by their own thread, for which it is right.
// Pinned by ThreadLocal.DestroyingAForeignObjectSetsTheCallersKeyValue.
//
// Deliberate: without a table there is no key value to correct. That is the end of an object that outlived
// its finalize(). Pinned by ThreadLocal.DestroyingWithoutTheOwnersTableSetsNoKeyValue.
KELThreadLocal::~KELThreadLocal() {
    KELRMutex_var hold(_mutex, 1);
    if (Teardown::forget(this)) return;
    SlotTable* table = nullptr;
    if (!_dict_instance()->atKey(_owner, table)) return;
    table->removeKeyIfExists(KELUniqueId(_slot));
    if (table->count() != 0) {
        pthread_setspecific(_key, first_object(*table));
        return;
    }
    _dict_instance()->removeKey(_owner);
    delete table;
    pthread_setspecific(_key, nullptr);
}

void KELThreadLocal::finalize() { delete this; }

KELThreadLocal* KELThreadLocal::instance(unsigned long slot) {
    KELRMutex_var hold(_mutex, 1);
    if (_key_dict == nullptr) return nullptr;
    SlotTable* table = nullptr;
    if (!_key_dict->atKey(KELThreadId(pthread_self()), table)) return nullptr;
    KELThreadLocal* object = nullptr;
    table->atKey(KELUniqueId(slot), object);
    return object;
}

KELThreadLocal::ThreadTable* KELThreadLocal::_dict_instance() {
    ThreadTable* table = __atomic_load_n(&_key_dict, __ATOMIC_ACQUIRE);
    if (table != nullptr) return table;
    KELRMutex_var hold(_mutex, 1);
    return &thread_table();
}

// Deliberate: the objects are finalised in the order of their table, whatever the order of their creation,
// and with the mutex held, so that no other thread sees a table half gone.
// Pinned by ThreadLocal.CleanUpFinalizesEachObjectOnceInTableOrder and
// ThreadLocal.CleanUpHoldsTheMutexWhileFinalizing.
//
// Runs when the body of a KELThread returns and again as the destructor of the key; whichever comes
// second finds no table.
void KELThreadLocal::_exit_thread(void*) {
    KELRMutex_var hold(_mutex, 1);
    if (_key_dict == nullptr) return;
    const KELThreadId self(pthread_self());
    SlotTable* table = nullptr;
    if (!_key_dict->atKey(self, table)) return;
    _key_dict->removeKey(self);
    Teardown(table).finalize_objects();
}
