// Counted objects, their records and the pool of records.
//
// SPDX-License-Identifier: MIT
#include <kel/core/resource.h>

#include <memory>
#include <string>

#include "tests/faults/matrix/pools.h"
#include "tests/faults/matrix/scenario.h"

namespace {

using namespace kel::test;

class Thing : public KELResource {
public:
    explicit Thing(bool* deleted = nullptr) : _deleted(deleted) {}
    ~Thing() override {
        if (_deleted != nullptr) *_deleted = true;
    }

private:
    bool* _deleted;
};

// A record goes to the pool when its object does, and its mutex to another pool when the record goes.
// All three are empty before and after.
class NoRecords {
public:
    NoRecords() : _before(), _mutexes() {}
    ~NoRecords() { KELResource::garbage_collect(); }

private:
    struct Collected {
        Collected() { KELResource::garbage_collect(); }
    };
    Collected _before;
    EmptyPlainPool _mutexes;
};

class Counting : public Scenario {
    std::string state() override { return std::to_string(_thing->_num_refs()) + " references"; }
    NoRecords _no_records;

protected:
    void park_a_record() {
        Thing other;
        other._ref();
    }
    const std::unique_ptr<Thing> _thing = std::make_unique<Thing>();
};

class FirstReference : public Counting {
    void act() override {
        const unsigned long taken = _thing->_ref();
        gives("%lu, %lu", taken, _thing->_deref());
    }
};
KEL_SCENARIO(FirstReference).giving("2, 1").and_retried();

class ReferenceInARecycledRecord : public Counting {
    void prepare() override { park_a_record(); }
    void act() override { gives("%lu", _thing->_ref()); }
};
KEL_SCENARIO(ReferenceInARecycledRecord).giving("2").and_retried();

class ReferenceThatIsNotShared : public Counting {
public:
    ~ReferenceThatIsNotShared() override { KELResource::set_init_sharing(1); }

private:
    void prepare() override { KELResource::set_init_sharing(0); }
    void act() override { gives("%lu", _thing->_ref()); }
};
KEL_SCENARIO(ReferenceThatIsNotShared).giving("2").and_retried();

class SharingIsSwitchedOff : public Counting {
    void act() override {
        _thing->_set_sharing(0);
        gives("%lu", _thing->_num_refs());
    }
};
KEL_SCENARIO(SharingIsSwitchedOff).giving("1").and_retried();

class CountIsReset : public Counting {
    void act() override {
        _thing->_reset_refs();
        gives("%lu", _thing->_num_refs());
    }
};
KEL_SCENARIO(CountIsReset).giving("0").and_retried();

class ObjectDeletesItself : public Scenario {
public:
    ~ObjectDeletesItself() override {
        if (!_deleted) delete _thing;
    }

private:
    void act() override {
        const unsigned long taken = _thing->_ref();
        const long left = _thing->_unref();
        gives("%lu, %ld, %ld", taken, left, _thing->_unref());
    }
    std::string state() override { return _deleted ? "deleted" : std::to_string(_thing->_num_refs()); }

    NoRecords _no_records;
    bool _deleted = false;
    Thing* _thing = new Thing(&_deleted);
};
KEL_SCENARIO(ObjectDeletesItself).giving("2, 1, 0").and_retried();

class RecordsAreCollected : public Counting {
    void prepare() override { park_a_record(); }
    void act() override { KELResource::garbage_collect(); }
};
KEL_SCENARIO(RecordsAreCollected);

class FirstRecord : public Scenario {
    void act() override {
        Thing thing;
        gives("%lu", thing._ref());
    }
};
KEL_SCENARIO(FirstRecord).giving("2").in_a_fresh_process().and_retried();

}  // namespace
