// Words for the codes of an exception.
//
//   kel_explain(e)   one line that says what a minor code means
//
//     catch (const CORBA_Exception& e) {
//         const CORBA_String_var line(kel_explain(e));
//         std::cerr << line.in() << std::endl;
//     }
//
// prints, for a connection that nobody took,
//
//     IDL:omg.org/CORBA/TRANSIENT:1.0: minor 0x4f4d006f (vendor set 0x4f4d0000 OMG, code 0x06f):
//     errno 111 ECONNREFUSED, Connection refused; completion status NO
//
// in one line. What the exception writes and what travels stays as it is. Any thread.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_EXPLAIN_H
#define KEL_EXCEPTIONS_EXPLAIN_H

#include <kel/config.h>
#include <kel/fwd.h>

// The repository id of `e` and, for a system exception, its minor code with the vendor set and the
// code in hexadecimal, the words for the code, the completion status and the explanation, if any.
//
// Words come from the codes that the OMG has published, from the library's own, and, for the
// exceptions that carry them (NO_RESOURCES, COMM_FAILURE and TRANSIENT), from errno and from the
// resolver's codes. A number with several meanings gets all of them, since an errno is stored in the
// OMG's set too. An errno has the numbers of Linux, whoever sent it. A code without words says so.
//
// The line has no line break. The caller frees it with CORBA::string_free. Throws std::bad_alloc and
// nothing else.
KEL_API char* kel_explain(const CORBA_Exception& e);

#endif
