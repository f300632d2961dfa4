// A library for the loader to open and close. It has a static object with something to do both times.
//
// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>

namespace {

const CORBA_String_var name("stress");

}  // namespace

extern "C" KEL_API const char* plugin_name();

const char* plugin_name() { return name.in(); }
