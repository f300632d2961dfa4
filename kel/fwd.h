// Declares the library's classes without defining them.
//
// Include it where a pointer or a reference is all that is needed. It lets a low layer name a
// class of a higher one without including that layer's header.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FWD_H
#define KEL_FWD_H

// core
class KELPortLibManager;
class KELIMutex;
class KELMutex;
class KELRMutex;
class KELSpinMutex;
class KELRSpinMutex;
class KELMutex_var;
class KELRMutex_var;
class KELDMutex_var;
class KELCondition;
class KELThreadId;
class KELThread;
class KELUniqueId;
class KELThreadLocal;
class KELRWLock;
class KELRLock_var;
class KELWLock_var;
class KELResource;

// containers
template <class K, class V>
class KELDictionary;
template <class K, class V>
class KELDictionary_r;
class KELStringWrapper;
class CORBA_String_var;
class CORBA_String_out;
class CORBA_WString_var;
class CORBA_WString_out;

// exceptions
class CORBA_TypeCode;
class CORBA_Exception;
class CORBA_Exception_var;
class CORBA_SystemException;
class CORBA_UserException;
class KELStdException;
class KELRemarshal;

// streams
class KEListream;
class KELostream;
class KELOffsetTable;

// os
class BaseUtil;
class KELPortable;
class KELPoll;
class KELPipe;

// services
class KELLoadLibrary;
class KELArgList;
class KELDebugLogger;
class CurrentEnvironment;
class CORBA_Environment;

#endif
