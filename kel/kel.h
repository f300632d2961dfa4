// The whole library in one include.
//
//   core/         mutexes, conditions, threads, thread-locals, reader-writer lock, resources
//   containers/   dictionaries and the string functions and holders of the language mapping
//   exceptions/   the exception tree, its registry, the 36 standard system exceptions
//   streams/      marshalling streams and their indirection tables
//   os/           system utilities, addresses, TCP sockets, pollers, pipes
//   services/     library loader, argument list, debug logger, per-thread environment
//
//     #include <kel/kel.h>
//
// A translation unit that needs one family compiles faster with that family's header alone.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_KEL_H
#define KEL_KEL_H

#include <kel/config.h>
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/containers/wstrings.h>
#include <kel/core/condition.h>
#include <kel/core/mutex.h>
#include <kel/core/portlib.h>
#include <kel/core/resource.h>
#include <kel/core/rwlock.h>
#include <kel/core/spin_mutex.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/core/unique_id.h>
#include <kel/exceptions/exception.h>
#include <kel/exceptions/explain.h>
#include <kel/exceptions/raise.h>
#include <kel/exceptions/standard.h>
#include <kel/exceptions/system_exception.h>
#include <kel/fwd.h>
#include <kel/os/address.h>
#include <kel/os/base_util.h>
#include <kel/os/pipe.h>
#include <kel/os/poll.h>
#include <kel/os/portable.h>
#include <kel/os/socket.h>
#include <kel/services/arg_list.h>
#include <kel/services/debug_logger.h>
#include <kel/services/environment.h>
#include <kel/services/load_library.h>
#include <kel/streams/istream.h>
#include <kel/streams/offset_table.h>
#include <kel/streams/ostream.h>
#include <kel/version.h>

#endif
