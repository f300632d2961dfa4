// SPDX-License-Identifier: MIT
#include <kel/exceptions/raise.h>
#include <kel/exceptions/standard.h>

namespace kel {
namespace internal {

void raise_bad_param() { throw CORBA_BAD_PARAM(); }
void raise_object_not_exist() { throw CORBA_OBJECT_NOT_EXIST(); }
void raise_marshal() { throw CORBA_MARSHAL(); }
void raise_timeout() { throw CORBA_TIMEOUT(); }
void raise_no_resources(std::uint32_t minor) { throw CORBA_NO_RESOURCES(minor, CORBA::COMPLETED_NO); }

void raise_bad_inv_order_maybe(std::uint32_t minor) {
    throw CORBA_BAD_INV_ORDER(minor, CORBA::COMPLETED_MAYBE);
}

}  // namespace internal
}  // namespace kel
