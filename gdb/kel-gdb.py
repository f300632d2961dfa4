# Shows the library's objects in gdb.
#
# Installed where gdb loads it by itself, together with libkel.so; or by hand: source kel-gdb.py
#
#     (gdb) print name                 $1 = "vesta"
#     (gdb) print failure              $2 = CORBA_TRANSIENT, minor 0x4f4d006f (OMG 111, as an errno ECONNREFUSED), ...
#     (gdb) print codecs               $3 = KELDictionary of 2 in 32 slots = {["latin-1"] = ..., ...}
#     (gdb) kel threads                the registered threads, newest first
#     (gdb) kel locals                 each thread's per-thread objects by slot
#     (gdb) kel exceptions             the registered exception classes
#
# Only memory is read: nothing is called in the program, so it works on a core file as well. What cannot be
# read, or was optimised out, shows as "?".
#
# SPDX-License-Identifier: MIT
import errno

import gdb
import gdb.printing

TROUBLE = (gdb.error, gdb.MemoryError, RuntimeError, AttributeError, OverflowError, UnicodeError)


# What `read` gives, or "?" when the memory or the type is not there.
def attempt(read, otherwise='?'):
    try:
        return read()
    except TROUBLE:
        return otherwise


def number(value):
    return attempt(lambda: int(value))


def address(value):
    return attempt(lambda: '0x%x' % int(value))


# Anything as print would show it, on one line.
def shown(value):
    return attempt(lambda: value.format_string(max_elements=200, pretty_structs=False))


# The bytes at `pointer` up to the zero as a literal, or null.
def narrow(pointer, limit=400):
    if int(pointer) == 0:
        return 'null'
    text = pointer.reinterpret_cast(gdb.lookup_type('char').pointer()).string('latin-1', length=-1)
    return quoted(text, limit)


def wide(pointer, limit=400):
    if int(pointer) == 0:
        return 'null'
    return 'L' + quoted(pointer.string('utf-32', 'backslashreplace'), limit)


def quoted(text, limit):
    more = '...' if len(text) > limit else ''
    marks = {'"': '\\"', '\\': '\\\\', '\n': '\\n', '\t': '\\t', '\r': '\\r'}
    return '"' + ''.join(marks.get(c, c if c.isprintable() else '\\x%02x' % ord(c)) for c in text[:limit]) + '"' + more


# Shows one object. A class that looks at it as its own class first, or at a part of it, has a constructor of its own.
class Printer:
    def __init__(self, value):
        self.value = value


# --- Strings ------------------------------------------------------------------------------------------


class NarrowText(Printer):
    def to_string(self):
        return attempt(lambda: narrow(self.value['_ptr']))


class WideText(Printer):
    def to_string(self):
        return attempt(lambda: wide(self.value['_ptr']))


# --- Exceptions ---------------------------------------------------------------------------------------

STATUS = {0: 'COMPLETED_YES', 1: 'COMPLETED_NO', 2: 'COMPLETED_MAYBE'}
OWN_CODES = {1: 'the connect timed out'}
RESOLVER = {-1: 'EAI_BADFLAGS', -2: 'EAI_NONAME', -3: 'EAI_AGAIN', -4: 'EAI_FAIL', -5: 'EAI_NODATA',
            -6: 'EAI_FAMILY', -7: 'EAI_SOCKTYPE', -8: 'EAI_SERVICE', -9: 'EAI_ADDRFAMILY', -10: 'EAI_MEMORY',
            -11: 'EAI_SYSTEM', -12: 'EAI_OVERFLOW'}


# The exceptions of which a minor code may be an errno or a resolver's code.
OF_THE_SYSTEM = ('CORBA_NO_RESOURCES', 'CORBA_COMM_FAILURE', 'CORBA_TRANSIENT')


# The set and the number of a minor code of an exception of that class, and what they may stand for.
def minor_text(code, class_name):
    code &= 0xffffffff
    vendor, low = code & 0xfffff000, code & 0xfff
    of_the_system = class_name in OF_THE_SYSTEM
    if of_the_system and code - (1 << 32) in RESOLVER:
        said = 'resolver %s' % RESOLVER[code - (1 << 32)]
    elif vendor == 0x4f4d0000:
        said = 'OMG %d' % low
        if of_the_system and low in errno.errorcode:
            said += ', as an errno %s' % errno.errorcode[low]
    elif vendor == 0x4b450000:
        said = 'KEL %d' % low + (', ' + OWN_CODES[low] if low in OWN_CODES else '')
    else:
        said = 'set 0x%08x, number %d' % (vendor, low)
    return '0x%08x (%s)' % (code, said)


# The class an exception describes itself as, or the one its virtual table belongs to.
def exception_class(value):
    def described():
        return narrow(value['_class']['_name']).strip('"').replace('::', '_')
    kind = attempt(lambda: value.dynamic_type.strip_typedefs().tag, None) or value.type.strip_typedefs().tag
    return attempt(described, kind) if kind == 'KELStdException' else kind


class SystemException:
    def __init__(self, value):
        self.value = attempt(lambda: value.cast(value.dynamic_type), value)

    def to_string(self):
        value = self.value
        status = number(value['_completed'])
        name = exception_class(value)
        text = '%s, minor %s, %s' % (name, attempt(lambda: minor_text(int(value['_minor']), name)),
                                     STATUS.get(status, 'completion status %s' % status))
        reason = attempt(lambda: narrow(value['_reason']['_ptr']))
        return text if reason in ('""', 'null') else text + ', reason ' + reason


# An exception seen as the base of all: what it is, and for a system exception all of it. A user exception shows
# its own fields and asks for this text as one of them.
class AnyException(Printer):
    def to_string(self):
        value = attempt(lambda: self.value.cast(self.value.dynamic_type), self.value)
        kind = value.type.strip_typedefs()
        return SystemException(value).to_string() if is_standard(kind) else kind.tag


class LoadError(Printer):
    def to_string(self):
        return 'KELLoadLibrary::LoadError, code %s, message %s' % (
            number(self.value['_code']), attempt(lambda: narrow(self.value['_message']['_ptr'])))


class Holder:
    def __init__(self, value, field='_exception'):
        self.value = value
        self.field = field

    def to_string(self):
        return attempt(lambda: held(self.value[self.field]))


# The exception that a holder's pointer points to.
def held(pointer):
    if int(pointer) == 0:
        return 'empty'
    target = attempt(lambda: pointer.cast(pointer.dynamic_type).dereference(), None)
    return 'holds ' + (shown(target) if target is not None else address(pointer))


class Environment(Printer):
    def to_string(self):
        return 'CORBA_Environment, ' + attempt(lambda: held(self.value['_exception']['_exception']))


class Description(Printer):
    def to_string(self):
        base = attempt(lambda: narrow(self.value['_base']['_name']) if int(self.value['_base']) else 'none')
        return 'description of %s, %s, base %s' % (attempt(lambda: narrow(self.value['_name'])),
                                                   attempt(lambda: narrow(self.value['_repository_id'])), base)


# --- Dictionaries -------------------------------------------------------------------------------------

MOST_SLOTS = 1 << 20  # a table that claims more has been overwritten


# The records of a table in slot order.
def records(table):
    capacity = int(table['_capacity'])
    if capacity > MOST_SLOTS:
        return
    for slot in range(capacity):
        record = attempt(lambda: table['_table'][slot], None)
        if record is not None and attempt(lambda: int(record), 0) != 0:
            yield record.dereference()


class Dictionary(Printer):
    def to_string(self):
        value = self.value
        name = attempt(lambda: value.type.strip_typedefs().tag.split('<')[0])
        text = '%s of %s in %s slots' % (name, number(value['_count']), number(value['_capacity']))
        if name == 'KELDictionary_r':
            text += ', its lock ' + attempt(lambda: lock_state(value['_pool_head']['_rwlock']))
        return text

    def children(self):
        index = 0
        for record in attempt(lambda: list(records(self.value)), []):
            for field in ('_key', '_value'):
                part = attempt(lambda: record[field], None)
                yield str(index), part if part is not None else '?'
                index += 1

    def display_hint(self):
        return 'map'


# --- Locks and threads --------------------------------------------------------------------------------


def lock_state(lock):
    state = int(lock['_state'])
    waiting = int(lock['_waiting_writers'])
    text = 'free' if state == 0 else 'held by a writer' if state == -1 else 'held by %d reader%s' % (
        state, '' if state == 1 else 's')
    return text + (', %d writer%s waiting' % (waiting, '' if waiting == 1 else 's') if waiting else '')


def mutex_state(mutex):
    data = mutex['_mutex']['__data']
    if int(data['__lock']) == 0:
        return 'free'
    depth = int(data['__count'])
    return 'held by LWP %d%s' % (int(data['__owner']), ', %d times' % depth if depth > 1 else '')


class RWLock(Printer):
    def to_string(self):
        return 'KELRWLock, ' + attempt(lambda: lock_state(self.value))


class Mutex(Printer):
    def to_string(self):
        return '%s, %s' % (self.value.type.strip_typedefs().tag, attempt(lambda: mutex_state(self.value)))


class ThreadId(Printer):
    def to_string(self):
        return attempt(lambda: thread_name(int(self.value['_id'])))


class UniqueId(Printer):
    def to_string(self):
        return str(number(self.value['_value']))


# A pthread_t, and gdb's number of that thread when it knows it.
def thread_name(handle):
    for thread in attempt(lambda: gdb.selected_inferior().threads(), ()):
        known = attempt(lambda: int.from_bytes(thread.handle(), 'little'), None)
        if known == handle:
            return 'thread %d (0x%x)' % (thread.num, handle)
    return 'thread 0x%x' % handle


class Thread(Printer):
    def to_string(self):
        return thread_text(self.value)


def thread_text(thread):
    kind = attempt(lambda: thread.dynamic_type.strip_typedefs().tag)
    stack = number(thread['_stacksize'])
    return '%s of %s, %s' % (kind, attempt(lambda: thread_name(int(thread['_tid']['_id']))),
                             'default stack' if stack == 0 else 'stack of %s bytes' % stack)


# --- Pollers, streams and the rest --------------------------------------------------------------------

EVENTS = ((0x40, 'read'), (0x100, 'write'), (0x08, 'error'))


def events_text(mask):
    names = [name for bit, name in EVENTS if mask & bit]
    rest = mask & ~sum(bit for bit, _ in EVENTS)
    return '|'.join(names + (['0x%x' % rest] if rest else [])) or 'nothing'


def entry_text(poller, index):
    entry = poller['_entries']['items'][index]
    return 'fd %d asks %s, reported %s, user %s' % (
        int(entry['fd']), events_text(int(entry['events'])), events_text(int(entry['revents'])),
        address(poller['_users']['items'][index]))


class Poll:
    def __init__(self, value):
        self.value = attempt(lambda: value.cast(value.dynamic_type), value)

    def count(self):
        return attempt(lambda: int(self.value['_entries']['count']))

    def to_string(self):
        return '%s of %s descriptors' % (attempt(lambda: self.value.type.strip_typedefs().tag), self.count())

    def children(self):
        count = self.count()
        for index in range(count if isinstance(count, int) and 0 <= count < 65536 else 0):
            yield '[%d]' % index, attempt(lambda: entry_text(self.value, index))


KINDS = ('type codes', 'values', 'strings', 'repository ids', 'top-level type codes')


class Stream:
    def __init__(self, value):
        self.value = attempt(lambda: value.cast(value.dynamic_type), value)

    def to_string(self):
        value = self.value
        over = attempt(lambda: 'no standard stream' if int(value['_strm']) == 0 else 'over ' + address(value['_strm']))
        return '%s at offset %s, %s, %s table%s' % (
            attempt(lambda: value.type.strip_typedefs().tag), number(value['_offset']), over,
            number(value['_table_count']), '' if number(value['_table_count']) == 1 else 's')

    def children(self):
        count = number(self.value['_table_count'])
        for index in range(count if isinstance(count, int) and 0 <= count < 4096 else 0):
            yield '[%d]' % index, attempt(lambda: table_text(self.value['_tables'][index]))


def table_text(pointer):
    if int(pointer) == 0:
        return 'null'
    table = pointer.cast(pointer.dynamic_type).dereference()
    return '%s of %d offsets, %s' % (table.type.strip_typedefs().tag, int(table['_by_offset']['_count']),
                                     'in use' if int(table['_in_use']) else 'not in use')


class Resource(Printer):
    def to_string(self):
        return 'KELResource, ' + attempt(lambda: references(self.value))


def references(value):
    record = value['_impl']
    count = 1 if int(record) == 0 else int(record['_count'])
    return '%d reference%s' % (count, '' if count == 1 else 's')


class Pipe(Printer):
    def to_string(self):
        value = self.value
        return 'KELPipe, forward %s -> %s, return %s -> %s' % tuple(
            number(value[f]) for f in ('_write_fd', '_read_fd', '_return_write_fd', '_return_read_fd'))


class Logger(Printer):
    def to_string(self):
        value = self.value
        name = attempt(lambda: narrow(value['_file_name']))
        masks = attempt(lambda: ' '.join('%08x' % int(value['_masks'][i]) for i in range(5)))
        return 'KELDebugLogger to %s, modules %s, %s' % (
            'standard output' if name == 'null' else name, masks,
            attempt(lambda: 'a line is open' if int(value['_in_line']) else 'no line is open'))


# --- Which class is shown by what ---------------------------------------------------------------------

EXACT = {
    'CORBA_String_var': NarrowText, 'KELStringWrapper': NarrowText, 'CORBA_String_out': NarrowText,
    'CORBA_WString_var': WideText, 'CORBA_WString_out': WideText,
    'CORBA_Exception': AnyException, 'CORBA_SystemException': SystemException,
    'KELStdException': SystemException,
    'KELLoadLibrary::LoadError': LoadError, 'CORBA_Exception_var': Holder, 'CORBA_Environment': Environment,
    'CORBA_Exception::Description': Description,
    'KELMutex': Mutex, 'KELRMutex': Mutex, 'KELRWLock': RWLock, 'KELThread': Thread, 'KELThreadId': ThreadId,
    'KELUniqueId': UniqueId, 'KELPoll': Poll, 'KELImplPoll': Poll, 'KELImplSelect': Poll,
    'KEListream': Stream, 'KELostream': Stream, 'KELResource': Resource, 'KELPipe': Pipe, 'KELDebugLogger': Logger,
}


class Printers(gdb.printing.PrettyPrinter):
    def __init__(self):
        super().__init__('kel')

    def __call__(self, value):
        kind = value.type.strip_typedefs()
        if kind.code in (gdb.TYPE_CODE_REF, gdb.TYPE_CODE_RVALUE_REF):
            return None  # gdb shows what it refers to
        tag = kind.unqualified().tag
        if tag is None:
            return None
        if tag.split('<')[0] in ('KELDictionary', 'KELDictionary_r'):
            return Dictionary(value)
        if tag in EXACT:
            return EXACT[tag](value)
        return SystemException(value) if is_standard(kind) else None


# Whether `kind` is one of the standard system exceptions, which add no field to what is shown.
def is_standard(kind):
    fields = attempt(kind.fields, [])
    return bool(fields) and fields[0].is_base_class and fields[0].name == 'KELStdException'


# --- Commands -----------------------------------------------------------------------------------------


class Kel(gdb.Command):
    """Shows what the library keeps: kel threads, kel locals, kel exceptions."""

    def __init__(self):
        super().__init__('kel', gdb.COMMAND_DATA, prefix=True)


def static(name):
    return attempt(lambda: gdb.parse_and_eval(name), None)


class Threads(gdb.Command):
    """Lists the registered thread objects, the newest first."""

    def __init__(self):
        super().__init__('kel threads', gdb.COMMAND_DATA)

    def invoke(self, argument, from_tty):
        thread = static('KELThread::_first')
        if thread is None:
            print('The debug symbols of the library are not loaded.')
            return
        count = 0
        while count < 100000 and attempt(lambda: int(thread), 0) != 0:
            object_ = attempt(lambda: thread.cast(thread.dynamic_type).dereference(), thread.dereference())
            print('%s  %s' % (address(thread), thread_text(object_)))
            thread = attempt(lambda: thread['_next'], 0)
            count += 1
        print('%d registered' % count)


class Locals(gdb.Command):
    """Lists each thread's per-thread objects by slot."""

    def __init__(self):
        super().__init__('kel locals', gdb.COMMAND_DATA)

    def invoke(self, argument, from_tty):
        table = static('KELThreadLocal::_key_dict')
        if table is None:
            print('The debug symbols of the library are not loaded.')
            return
        rows = attempt(lambda: list(records(table.dereference())), []) if attempt(lambda: int(table), 0) else []
        for row in rows:
            print(attempt(lambda: thread_name(int(row['_key']['_id']))))
            for slot in attempt(lambda: list(records(row['_value'].dereference())), []):
                pointer = slot['_value']
                print('  slot %s: %s at %s' % (number(slot['_key']['_value']), attempt(
                    lambda: pointer.dynamic_type.target().tag), address(pointer)))
        print('%d thread%s with per-thread objects' % (len(rows), '' if len(rows) == 1 else 's'))


class Exceptions(gdb.Command):
    """Lists the exception classes of the registry by repository id."""

    def __init__(self):
        super().__init__('kel exceptions', gdb.COMMAND_DATA)

    def invoke(self, argument, from_tty):
        registry = static("'(anonymous namespace)::_excepDict'")
        if registry is None:
            print('The debug symbols of the library are not loaded.')
            return
        rows = attempt(lambda: list(records(registry.dereference())), []) if attempt(lambda: int(registry), 0) else []
        for line in sorted(attempt(lambda: narrow(row['_value']['_repository_id'])).strip('"') for row in rows):
            print(line)
        print('%d registered' % len(rows))


gdb.printing.register_pretty_printer(gdb.current_objfile(), Printers(), replace=True)
for command in (Kel, Threads, Locals, Exceptions):
    command()
