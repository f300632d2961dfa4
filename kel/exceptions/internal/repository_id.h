// Repository ids of the library's own exceptions, and the prefix they carry.
//
//     KEL_REPOSITORY_ID("KELRemarshal")   // "IDL:kel.internal/KELRemarshal:1.0"
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_INTERNAL_REPOSITORY_ID_H
#define KEL_EXCEPTIONS_INTERNAL_REPOSITORY_ID_H

#define KEL_REPOSITORY_PREFIX "kel.internal"
#define KEL_REPOSITORY_ID(name) "IDL:" KEL_REPOSITORY_PREFIX "/" name ":1.0"

#endif
