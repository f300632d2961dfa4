#!/usr/bin/env python3
# Input filter of Doxygen: prints a public header with its plain comments as documentation comments.
#
#     filter.py kel/core/mutex.h
#
# The sources keep their // comments; what a comment speaks of is decided in house.py. Each class also gets
# the line of the opening comment's table that names it, and the opening comment's prose and example, which
# say who may call it and what fails.
#
# SPDX-License-Identifier: MIT
import os
import re
import sys

sys.dont_write_bytecode = True
import house

IN_CODE = re.compile(r'(`[^`]*`)')


# Prose in which nothing is a command to Doxygen but a class or function name, which becomes a link.
def plain(text):
    parts = IN_CODE.split(text)
    for i in range(0, len(parts), 2):
        part = re.sub(r'([\\@<>#*"&])', r'\\\1', parts[i])
        parts[i] = re.sub(r'(^|[\s(])::', r'\1%\::', part).replace("'", '&apos;')
    return ''.join(parts)


def table(rows):
    lines = ['<table class="members">']
    for left, right in rows:
        names = ', '.join('<code>%s</code>' % plain(n) for n in left.split(', '))
        lines.append('<tr><td>%s</td><td>%s</td></tr>' % (names, plain(right)))
    return lines + ['</table>']


def opening(paragraphs):
    lines = []
    for paragraph in paragraphs:
        lines.append('')
        if paragraph.kind == 'prose':
            lines += [plain(line) for line in paragraph.content]
        elif paragraph.kind == 'table':
            lines += table(paragraph.content)
        else:
            lines += ['@code{.cpp}'] + paragraph.content + ['@endcode']
    return lines


def comment(lines):
    return [plain(line.strip()) for line in lines]


def said_by_itself(found):
    text = found.text
    if re.match(r'(\w+)\(const \1&\w*\)', text) and found.is_deleted():
        return ['Objects of this class are not copied.']
    if re.match(r'\w+& operator=', text) and found.is_deleted():
        return ['Objects of this class are not assigned.']
    if re.match(r'(\w+)\(const \1&\) = default;', text) or re.match(r'\w+& operator=\(.*\) = default;', text):
        return ['Copies every field.']
    alias = re.match(r'typedef (?:::)?(CORBA_\w+) (\w+);', text)
    if alias:
        return ['The name in the language mapping of `%s`.' % alias.group(1)]
    if '_downcast(std::nullptr_t)' in text:
        return ['A null literal gives null.']
    return []


# The documentation of a class: its row of the table, its own comment, the opening comment.
def of_class(found, header):
    row = header.table_text(found.name)
    if found.scope:  # a class within a class
        row = row or header.table_text('::' + found.name)
        return opening(house.paragraphs(found.comment)) or ([row[0].upper() + row[1:] + '.'] if row else [])
    lines = ['@brief %s%s.' % (row[0].upper() + row[1:], '') if row else ''] if row else []
    lines = [line.replace('..', '.') for line in map(plain_brief, lines)]
    lines += opening(house.paragraphs(found.comment))
    if row:
        lines += opening([p for p in header.opening[1:] if p.kind != 'table'])
    return lines


def plain_brief(line):
    return '@brief ' + plain(line[len('@brief '):])


def documentation(found, header):
    if re.match(r'(template <[^>]*> )?(class|struct) \w+;$', found.text):
        return []  # only announced here
    if found.kind in ('class', 'struct') and found.name:
        lines = of_class(found, header)
        return lines if any(lines) else []
    lines = comment(found.comment) or said_by_itself(found)
    if found.kind == 'define' and not lines:
        row = header.table_text(re.match(r'#define (\w+)', found.text).group(1))
        if not any(paragraph.kind == 'table' for paragraph in header.opening):
            row = header.opening[0].content[0]  # which speaks of all of them
        lines = [plain(row)] if row else []
    return lines


def main(path):
    header = house.Header(path)
    name = path[path.index('kel/'):] if 'kel/' in path else os.path.basename(path)
    out = ['/// @file ' + name]
    out += ['/// ' + line for line in ['@brief ' + plain(header.opening[0].content[0])]
            + comment(header.opening[0].content[1:]) + opening(header.opening[1:])]
    starts = {found.first: found for found in header.declarations}
    groups = {line: (title, text) for line, title, text in header.groups}
    grouped = ''
    for number in range(header.begin, len(header.lines)):
        line = header.lines[number]
        found = starts.get(number)
        if number in groups:
            if grouped:
                out.append('///@}')
            out.append('/// @name ' + groups[number][0])
            out += ['/// ' + text for text in comment(groups[number][1])]
            out.append('///@{')
            grouped = True
            continue
        if found:
            out += ['/// ' + text for text in documentation(found, header)]
        elif grouped and line == '};':
            out.append('///@}')
            grouped = ''
        # Doxygen finds a base only under its bare name.
        line = re.sub(r'(public kel::internal::HashTable)<.*> \{', r'\1 {', line)
        trailing = house.TRAILING.match(line)
        if trailing and not line.strip().startswith(('//', '#', '}')):
            text = trailing.group('text')
            after = '///< ' + plain(text[0].upper() + text[1:]) + ('' if text.endswith('.') else '.')
            line = trailing.group('code') + '  ' + after
        out.append(line)
    print('\n'.join(out))


main(sys.argv[1])
