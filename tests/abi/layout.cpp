// Sizes and offsets at either word size: what programs built against the library have compiled in. Each
// line names a class or a field and says where it stands, first with 32-bit words, then with 64-bit ones.
// The numbers are written out, so that a platform type of another size is noticed as well.
//
// Compiled for its assertions only, with access to private fields.
//
// SPDX-License-Identifier: MIT
#include <kel/kel.h>

#include <cstddef>

#define HERE(narrow, wide) (sizeof(void*) == 4 ? (narrow) : (wide))
#define SIZE(type, narrow, wide) static_assert(sizeof(type) == HERE(narrow, wide), "size of " #type);
#define FIELD(type, field, narrow, wide) \
    static_assert(offsetof(type, field) == HERE(narrow, wide), "place of " #field " in " #type);

// --- core: mutexes, conditions and their guards ---

SIZE(pthread_mutex_t, 24, 40)
SIZE(pthread_mutexattr_t, 4, 4)
SIZE(pthread_cond_t, 48, 48)

SIZE(KELIMutex, 4, 8)
SIZE(KELMutex, 28, 48)
FIELD(KELMutex, _mutex, 4, 8)
SIZE(KELRMutex, 32, 56)
FIELD(KELRMutex, _attributes, 4, 8)
FIELD(KELRMutex, _mutex, 8, 16)

SIZE(KELSpinMutex, 8, 16)
FIELD(KELSpinMutex, _impl, 4, 8)
SIZE(KELRSpinMutex, 8, 16)
FIELD(KELRSpinMutex, _impl, 4, 8)
SIZE(KELSpinMutexImpl, 28, 48)
SIZE(KELRSpinMutexImpl, 32, 56)

SIZE(KELSpinMutexImplFactory, 160, 312)
FIELD(KELSpinMutexImplFactory, _free_count, 0, 0)
FIELD(KELSpinMutexImplFactory, _guard, 4, 8)
FIELD(KELSpinMutexImplFactory, _free, 32, 56)
SIZE(KELRSpinMutexImplFactory, 140, 280)
FIELD(KELRSpinMutexImplFactory, _free_count, 0, 0)
FIELD(KELRSpinMutexImplFactory, _guard, 4, 8)
FIELD(KELRSpinMutexImplFactory, _free, 12, 24)

SIZE(KELMutex_var, 8, 16)
FIELD(KELMutex_var, _locked, 4, 8)
SIZE(KELRMutex_var, 8, 16)
FIELD(KELRMutex_var, _locked, 4, 8)
SIZE(KELDMutex_var, 8, 16)
FIELD(KELDMutex_var, _mtx, 0, 0)
FIELD(KELDMutex_var, _locked, 4, 8)

SIZE(KELCondition, 48, 48)

SIZE(KELRWLock, 132, 160)
FIELD(KELRWLock, _mutex, 0, 0)
FIELD(KELRWLock, _state, 28, 48)
FIELD(KELRWLock, _readers, 32, 56)
FIELD(KELRWLock, _waiting_writers, 80, 104)
FIELD(KELRWLock, _writers, 84, 112)
SIZE(KELRLock_var, 8, 16)
FIELD(KELRLock_var, _lock, 0, 0)
FIELD(KELRLock_var, _locked, 4, 8)
SIZE(KELWLock_var, 8, 16)
FIELD(KELWLock_var, _lock, 0, 0)
FIELD(KELWLock_var, _locked, 4, 8)

// --- core: threads, resources, numbers ---

SIZE(KELThreadId, 4, 8)
SIZE(KELThread, 20, 40)
FIELD(KELThread, _tid, 4, 8)
FIELD(KELThread, _next, 8, 16)
FIELD(KELThread, _prev, 12, 24)
FIELD(KELThread, _stacksize, 16, 32)
SIZE(KELThreadLocal, 12, 24)
FIELD(KELThreadLocal, _owner, 4, 8)
FIELD(KELThreadLocal, _slot, 8, 16)

SIZE(KELResource, 8, 16)
FIELD(KELResource, _impl, 4, 8)
SIZE(KELResourceImpl, 16, 24)
FIELD(KELResourceImpl, _count, 0, 0)
FIELD(KELResourceImpl, _sharing, 4, 4)
FIELD(KELResourceImpl, _mutex, 8, 8)
SIZE(KELResourceImplFactory, 4108, 8216)
FIELD(KELResourceImplFactory, _guard, 0, 0)
FIELD(KELResourceImplFactory, _parked_count, 8, 16)
FIELD(KELResourceImplFactory, _parked, 12, 24)

SIZE(KELUniqueId, 4, 4)
SIZE(KELPortLibManager, 1, 1)

// --- containers ---

SIZE(CORBA_String_var, 8, 16)
FIELD(CORBA_String_var, _ptr, 0, 0)
FIELD(CORBA_String_var, _capacity, 4, 8)
SIZE(CORBA_String_out, 4, 8)
SIZE(KELStringWrapper, 4, 8)
SIZE(CORBA_WString_var, 4, 8)
SIZE(CORBA_WString_out, 4, 8)

typedef KELDictionary<KELUniqueId, void*> Plain;
SIZE(Plain, 288, 560)
FIELD(Plain, _capacity, 0, 0)
FIELD(Plain, _count, 4, 4)
FIELD(Plain, _table, 8, 8)
FIELD(Plain, _inline_table, 12, 16)
FIELD(Plain, _pool_head, 140, 272)
FIELD(Plain, _pool, 144, 280)
FIELD(Plain, _last_index, 272, 536)
FIELD(Plain, _bits, 276, 540)
FIELD(Plain, _mask, 280, 544)
FIELD(Plain, _on_remove, 284, 552)
SIZE(Plain::Assoc, 8, 16)
FIELD(Plain::Assoc, _key, 0, 0)
FIELD(Plain::Assoc, _value, 4, 8)
SIZE(Plain::Iterator, 12, 24)

typedef KELDictionary_r<CORBA_String_var, CORBA_String_var> Locked;
SIZE(Locked, 420, 720)
FIELD(Locked, _inline_table, 12, 16)
FIELD(Locked, _pool_head, 140, 272)
FIELD(Locked, _pool, 276, 440)
FIELD(Locked, _last_index, 404, 696)
FIELD(Locked, _bits, 408, 700)
FIELD(Locked, _mask, 412, 704)
FIELD(Locked, _on_remove, 416, 712)
SIZE(Locked::Assoc, 16, 32)
FIELD(Locked::Assoc, _key, 0, 0)
FIELD(Locked::Assoc, _value, 8, 16)

// --- exceptions ---

SIZE(CORBA_Exception, 4, 8)
SIZE(CORBA_UserException, 4, 8)
SIZE(KELRemarshal, 4, 8)
SIZE(CORBA_Exception_var, 4, 8)

SIZE(CORBA_Exception::Description, 24, 48)
FIELD(CORBA_Exception::Description, _name, 4, 8)
FIELD(CORBA_Exception::Description, _repository_id, 8, 16)
FIELD(CORBA_Exception::Description, _factory, 12, 24)
FIELD(CORBA_Exception::Description, _base, 16, 32)
FIELD(CORBA_Exception::Description, _type_code, 20, 40)

SIZE(CORBA::CompletionStatus, 4, 4)
SIZE(CORBA_SystemException, 20, 40)
FIELD(CORBA_SystemException, _minor, 4, 8)
FIELD(CORBA_SystemException, _completed, 8, 16)
FIELD(CORBA_SystemException, _reason, 12, 24)
SIZE(KELStdException, 28, 56)
FIELD(KELStdException, _class, 20, 40)
FIELD(KELStdException, _create, 24, 48)

#define KEL_STANDARD_EXCEPTION(X) SIZE(CORBA_##X, 28, 56)
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION

// --- streams ---

SIZE(KELostream, 24, 40)
FIELD(KELostream, _tables, 4, 8)
FIELD(KELostream, _table_count, 8, 16)
FIELD(KELostream, _table_capacity, 12, 20)
FIELD(KELostream, _offset, 16, 24)
FIELD(KELostream, _strm, 20, 32)
SIZE(KEListream, 24, 40)
FIELD(KEListream, _tables, 4, 8)
FIELD(KEListream, _table_count, 8, 16)
FIELD(KEListream, _table_capacity, 12, 20)
FIELD(KEListream, _offset, 16, 24)
FIELD(KEListream, _strm, 20, 32)

SIZE(KELOffsetWrapper, 4, 8)
SIZE(KELObjWrap, 4, 8)
SIZE(KELOffsetTable, 608, 1168)
FIELD(KELOffsetTable, _by_offset, 4, 8)
FIELD(KELOffsetTable, _by_object, 292, 568)
FIELD(KELOffsetTable, _release, 580, 1128)
FIELD(KELOffsetTable, _mark, 584, 1136)
FIELD(KELOffsetTable, _spare, 588, 1140)
FIELD(KELOffsetTable, _in_use, 592, 1144)
FIELD(KELOffsetTable, _depth, 596, 1148)

// --- os ---

SIZE(timeval, 8, 16)
SIZE(pollfd, 8, 8)
SIZE(fd_set, 128, 128)

SIZE(vhostname, 1052, 1072)
FIELD(vhostname, _hostent, 0, 0)
FIELD(vhostname, _h_errno, 20, 32)
FIELD(vhostname, _result, 24, 40)
FIELD(vhostname, _buffer, 28, 48)
static_assert(sizeof(vhostname::_buffer) == 1024, "room for the names and addresses of one host");

SIZE(BaseUtil, 1, 1)
SIZE(BaseUtil::SysVersion, 8, 8)
FIELD(BaseUtil::SysVersion, major, 0, 0)
FIELD(BaseUtil::SysVersion, minor, 4, 4)
SIZE(KELPortable, 1, 1)
SIZE(KELSysVersion, 4, 4)
FIELD(KELSysVersion, major, 0, 0)
FIELD(KELSysVersion, minor, 2, 2)

SIZE(KELPoll, 28, 40)
FIELD(KELPoll, _entries, 4, 8)
FIELD(KELPoll, _users, 16, 24)
SIZE(KELPoll::List<pollfd>, 12, 16)
FIELD(KELPoll::List<pollfd>, count, 0, 0)
FIELD(KELPoll::List<pollfd>, capacity, 4, 4)
FIELD(KELPoll::List<pollfd>, items, 8, 8)
SIZE(KELPoll::TimeVal, 16, 32)
FIELD(KELPoll::TimeVal, _ptr, 0, 0)
FIELD(KELPoll::TimeVal, _tv, 4, 8)
FIELD(KELPoll::TimeVal, _ms, 12, 24)
SIZE(KELImplPoll, 32, 48)
SIZE(KELImplSelect, 420, 440)
FIELD(KELImplSelect, _sets, 4, 8)
FIELD(KELImplSelect, _nfds, 388, 392)

SIZE(KELPipe, 16, 16)
FIELD(KELPipe, _read_fd, 0, 0)
FIELD(KELPipe, _write_fd, 4, 4)
FIELD(KELPipe, _return_read_fd, 8, 8)
FIELD(KELPipe, _return_write_fd, 12, 12)

// --- services ---

SIZE(KELLoadLibrary, 316, 608)
FIELD(KELLoadLibrary, _libraries, 0, 0)
FIELD(KELLoadLibrary, _lock, 288, 560)
SIZE(KELLoadLibrary::LoadError, 16, 32)
FIELD(KELLoadLibrary::LoadError, _message, 4, 8)
FIELD(KELLoadLibrary::LoadError, _code, 12, 24)

SIZE(KELArgList, 424, 728)
FIELD(KELArgList, _options, 4, 8)

SIZE(KELDebugLogger, 80, 120)
FIELD(KELDebugLogger, _masks, 32, 56)
FIELD(KELDebugLogger, _flags, 52, 76)
FIELD(KELDebugLogger, _trim_size, 56, 80)
FIELD(KELDebugLogger, _lines, 60, 84)
FIELD(KELDebugLogger, _fd, 64, 88)
FIELD(KELDebugLogger, _file_name, 68, 96)
FIELD(KELDebugLogger, _fp, 72, 104)
FIELD(KELDebugLogger, _pending, 76, 112)
FIELD(KELDebugLogger, _in_line, 77, 113)
FIELD(KELDebugLogger, _spare, 78, 114)

SIZE(CORBA_Environment, 4, 8)
SIZE(CurrentEnvironment, 16, 32)
FIELD(CurrentEnvironment, _environment, 12, 24)
