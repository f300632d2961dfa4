// What an ORB compiles with the oldest standard: the mapping's names and no newer language.
// SPDX-License-Identifier: MIT
#include "tests/exceptions/old_client.h"

static_assert(__cplusplus == 201103L, "this file is about the oldest standard");

namespace kel {
namespace test {

const CORBA::Exception::Description* Full::_desc() const { return &_description; }
void Full::_raise() const { throw *this; }
CORBA::Exception* Full::_deep_copy() { return new Full(*this); }
CORBA::Exception* Full::_factory() { return new Full; }

Full* Full::_downcast(CORBA::Exception* e) {
    return e != 0 && e->_desc()->can_cast(_description) ? static_cast<Full*>(e) : 0;
}

CORBA::Exception::Description Full::_description("Full", "IDL:example.org/Full:1.0", Full::_factory,
                                                 &CORBA::UserException::_description, 0);

void OldClient::work(const char* reason) {
    if (reason != 0) throw CORBA::NO_RESOURCES(1, CORBA::COMPLETED_NO, reason);
    Full()._raise();
}

const char* OldClient::name_of_failure(const char* reason) {
    try {
        work(reason);
    } catch (const CORBA::SystemException& e) {
        return e._name();
    } catch (const CORBA::UserException& e) {
        return e._name();
    }
    return 0;
}

}  // namespace test
}  // namespace kel
