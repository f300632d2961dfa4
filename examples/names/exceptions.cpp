// SPDX-License-Identifier: MIT
#include "exceptions.h"

#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

namespace names {

CORBA_Exception::Description NotFound::_description("names::NotFound", "IDL:names/NotFound:1.0",
                                                    NotFound::_factory, &CORBA_UserException::_description,
                                                    nullptr);

CORBA_Exception::Description AlreadyBound::_description("names::AlreadyBound", "IDL:names/AlreadyBound:1.0",
                                                        AlreadyBound::_factory,
                                                        &CORBA_UserException::_description, nullptr);

void NameException::_write(KELostream& out) const { out << name(); }

void NameException::_copy(KEListream& in) { in >> _bound_name; }

}  // namespace names
