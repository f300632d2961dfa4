#!/usr/bin/env python3
# Makes the section 3 pages of docs/man/man3 from the public headers, one page a header.
#
#     man.py VERSION FOLDER
#
# SPDX-License-Identifier: MIT
import glob
import os
import re
import sys
import textwrap

sys.dont_write_bytecode = True
import house

# The name of each header's page: that of the class one looks for first, where it is not the first of the
# header's table.
PAGES = {
    'core/mutex.h': 'KELMutex', 'core/spin_mutex.h': 'KELSpinMutex', 'core/condition.h': 'KELCondition',
    'core/thread.h': 'KELThread', 'core/thread_local.h': 'KELThreadLocal', 'core/unique_id.h': 'KELUniqueId',
    'core/rwlock.h': 'KELRWLock', 'core/resource.h': 'KELResource', 'core/portlib.h': 'KELPortLibManager',
    'containers/dictionary.h': 'KELDictionary', 'containers/strings.h': 'CORBA_String_var',
    'containers/wstrings.h': 'CORBA_WString_var', 'exceptions/exception.h': 'CORBA_Exception',
    'exceptions/explain.h': 'kel_explain', 'exceptions/system_exception.h': 'CORBA_SystemException',
    'exceptions/standard.h': 'KELStandardExceptions',
    'streams/istream.h': 'KEListream', 'streams/ostream.h': 'KELostream',
    'streams/offset_table.h': 'KELOffsetTable', 'os/portable.h': 'KELPortable', 'os/base_util.h': 'BaseUtil',
    'os/address.h': 'Getaddrinfo', 'os/socket.h': 'KELSetBindName', 'os/poll.h': 'KELPoll',
    'os/pipe.h': 'KELPipe', 'services/load_library.h': 'KELLoadLibrary', 'services/arg_list.h': 'KELArgList',
    'services/debug_logger.h': 'KELDebugLogger', 'services/environment.h': 'CORBA_Environment',
}

# Bases that no program names: their members are told where the class that has them is.
SHOWN_AS = {'HashTable': 'KELDictionary', 'Assoc': 'KELDictionary::Assoc', 'Iterator': 'KELDictionary::Iterator'}
HIDDEN = ('PlainPoolHead', 'LockedPoolHead')


def text(line):
    line = line.replace('\\', '\\e').replace('-', '\\-').replace('`', '')
    return '\\&' + line if line.startswith(('.', "'")) else line


# One sentence a line is what the formatter expects.
def prose(lines):
    joined = text(' '.join(line.strip() for line in lines))
    joined = re.sub(r'(?<=[a-z0-9_)"\]]{2})([.?!]) (?=[A-Z`])', r'\1\n', joined)
    wrapped = [part for line in joined.split('\n') for part in textwrap.wrap(line, 79, break_long_words=False,
                                                                             break_on_hyphens=False)]
    return ['\\&' + line if line.startswith(('.', "'")) else line for line in wrapped]


def paragraphs(found):
    out = []
    for paragraph in found:
        if paragraph.kind == 'prose':
            out += ['.PP'] + prose(paragraph.content)
        elif paragraph.kind == 'code':
            out += ['.PP', '.in +4n', '.nf'] + [text(line) or '\\&' for line in paragraph.content] + ['.fi', '.in']
        else:
            for left, right in paragraph.content:
                out += ['.TP', '.B ' + text(left)] + (prose([right]) if right else ['\\&'])
    return out


def names(header, page):
    found = [page] if page else []
    for paragraph in header.opening:
        if paragraph.kind == 'table':
            for left, _ in paragraph.content:
                found += re.split(r', ', left)
    found = [re.sub(r'^(::|KELDictionary::)|<.*>', '', name) for name in found]
    plain = [name for name in found if re.match(r'[A-Za-z_][\w:]*$', name) and name not in
             ('CORBA_X', 'CORBA::X', 'Assoc', 'Iterator')]
    if page == 'KELStandardExceptions':
        plain += [d.name for d in header.declarations if d.kind == 'class']
    return sorted(set(plain), key=plain.index)


# What a declaration looks like on its line of the page.
def shown(found):
    line = re.sub(r'^(inline|virtual|explicit) ', '', found.text)
    line = re.sub(r'^template <class P, class = kel::internal::IfPointer<P, (\w+)>> ', '', line)
    line = line.replace('HashTable(', 'KELDictionary(') if 'class HashTable' not in line else line
    return re.sub(r'( override)?( = (0|default))?;$|,$', '', line).replace('"', '\\(dq')


def members(header):
    out = []
    group = None
    spoken = None
    for found in header.declarations:
        scope = [s for s in found.scope if s not in ('kel', 'internal')]
        if found.access != 'public' or found.is_deleted() or found.kind in ('namespace', 'define'):
            continue
        if found.name in HIDDEN or (scope and scope[0] in HIDDEN) or (not scope and 'internal' in found.scope
                                                                      and found.name != 'HashTable'):
            continue
        if found.kind:
            name = SHOWN_AS.get(found.name, found.name)
            if not name:
                continue
            said = paragraphs(house.paragraphs(found.comment)) if found.comment else []
            out += ['.SS ' + text(name)] + (said[1:] if said[:1] == ['.PP'] else said)
            group = name
            spoken = None
            continue
        if found.text.startswith(('static_assert', 'friend', 'class ')):
            continue
        if '(const' in found.text and found.text.endswith('= default;'):
            continue
        if not found.comment and (found.is_destructor() or ' override' in found.text):
            continue
        here = '::'.join(SHOWN_AS.get(s, s) for s in scope[-1:]) or 'Functions'
        if here == 'CORBA' and found.text.startswith('typedef'):
            continue
        if here != group:
            out.append('.SS ' + text(here if here != 'CORBA' else 'Functions of namespace CORBA'))
            group = here
        same = spoken is not None and found.comment and found.comment is spoken
        if same:  # one comment, several declarations: they stand above it together
            at = len(out) - 1
            while not out[at].startswith('.B '):
                at -= 1
            out[at + 1:at + 1] = ['.TQ', '.B ' + text(shown(found))]
        else:
            said = paragraphs(house.paragraphs(found.comment)) if found.comment else []
            said = ['.IP' if line == '.PP' else line for line in (said[1:] if said[:1] == ['.PP'] else said)]
            out += ['.TP', '.B ' + text(shown(found))] + (said or ([] if found.trailing else ['\\&']))
        if found.trailing and not same:
            out += prose([found.trailing[0].upper() + found.trailing[1:] + '.'])
        spoken = found.comment or None
    return out


# A first word in capitals, such as TCP, keeps them.
def begun_small(sentence):
    return sentence if sentence[1:2].isupper() else sentence[0].lower() + sentence[1:]


def page(header, path, name, version, others):
    brief = header.opening[0].content[0].rstrip('.')
    brief = re.sub(r'[,:] .*$', '', brief)
    everything = names(header, name)
    out = ['.\\" Made by scripts/man from kel/%s.' % path,
           '.TH %s 3 2026-11-22 "KEL %s" "KEL Library Functions"' % (name, version),
           '.SH NAME']
    out += [text(', '.join(everything)) + ' \\- ' + text(begun_small(brief))]
    out += ['.SH LIBRARY', 'The runtime\\-support and portability library of an ORB (libkel, \\-lkel)',
            '.SH SYNOPSIS', '.B #include <kel/%s>' % path, '.SH DESCRIPTION']
    said = paragraphs(header.opening)
    out += said[1:] if said[0] == '.PP' else said
    out += ['.SH INTERFACE'] + without_repeats(members(header)) + ['.SH SEE ALSO']
    out += ['.BR %s (3),' % text(other) for other in others if other != name] + ['.BR kel (7)']
    return '\n'.join(out) + '\n'


# A heading with nothing below it says nothing.
def without_repeats(lines):
    return [line for i, line in enumerate(lines)
            if not (line.startswith('.SS') and (i + 1 == len(lines) or lines[i + 1].startswith('.SS')))]


# The headers of the folders, each with the name of its page. What only throws for the headers has none.
def pages():
    found = {}
    for path in sorted(glob.glob('kel/*/*.h')):
        path = path[len('kel/'):]
        if path != 'exceptions/raise.h':
            found[path] = PAGES.get(path) or names(house.Header('kel/' + path), '')[0]
    return found


def main(version, folder):
    os.makedirs(folder, exist_ok=True)
    found = pages()
    for path, name in found.items():
        header = house.Header('kel/' + path)
        others = [n for p, n in found.items() if p.split('/')[0] == path.split('/')[0]]
        with open(os.path.join(folder, name + '.3'), 'w', encoding='utf-8') as file:
            file.write(page(header, path, name, version, others))


main(sys.argv[1], sys.argv[2])
