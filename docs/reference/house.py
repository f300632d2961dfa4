# Reads a public header as the house writes them: an opening comment with a table of the classes and one
# use, and plain // comments in front of the declarations they speak of.
#
# A comment speaks of the whole run of declarations below it, up to the next blank line or comment. What is
# deleted and what destroys is not meant unless it comes first. Used by filter.py and man.py.
#
# SPDX-License-Identifier: MIT
import os
import re

RULER = re.compile(r'// --- (.+?) -{3,}$')
TRAILING = re.compile(r'^(?P<code>.*?\S)\s+// (?P<text>.+)$')
SCOPE = re.compile(r'^\s*(?:template\s*<[^{]*>\s*)?(?P<kind>class|struct|enum|namespace)\b(?P<rest>[^{;]*)\{')
MACRO = re.compile(r'\bKEL_[A-Z_]+(?:\((?:[^()]|\([^()]*\))*\))?')
ACCESS = re.compile(r'^\s*(public|protected|private):$')


# One paragraph of a comment: "prose", "table" (rows of name and text) or "code" (lines).
class Paragraph:
    def __init__(self, kind, content):
        self.kind = kind
        self.content = content


# A declaration: the lines it stands on, what is said of it and where it stands.
class Declaration:
    def __init__(self, first, last, text, scope, access):
        self.first = first
        self.last = last
        self.text = text  # without comments, attributes and the body
        self.scope = scope  # names of the namespaces and classes around it
        self.access = access
        self.kind = ''  # class struct enum namespace, or '' for everything else
        self.name = ''
        self.comment = []  # lines without their slashes
        self.trailing = ''
        self.group = ''  # title of the part of the class it belongs to

    def is_deleted(self):
        return self.text.endswith('= delete;')

    def is_destructor(self):
        return re.match(r'(virtual )?~', self.text) is not None


class Header:
    def __init__(self, path):
        self.lines = without_definitions(read_lines(path))
        self.opening, self.begin = read_opening(self.lines)
        self.lines = expand_list(self.lines, os.path.dirname(path), self.opening)
        self.declarations = []
        self.groups = []  # (line, title, text) of the rulers
        Reader(self).read()

    # What the table says of `name`, or ''.
    def table_text(self, name):
        for paragraph in self.opening:
            if paragraph.kind == 'table':
                for left, right in paragraph.content:
                    if any(name == word or word.startswith('_') and name.endswith(word) for word in left.split(', ')):
                        return right
        return ''


def read_lines(path):
    with open(path, encoding='utf-8') as file:
        return file.read().splitlines()


# Definitions in line say again what is declared above them.
def without_definitions(lines):
    kept = []
    inside = False
    for line in lines:
        inside = inside or line == 'KEL_INLINE_BEGIN'
        kept.append('' if inside else line)
        inside = inside and line != 'KEL_INLINE_END'
    return kept


# The classes that a header makes from a list: a macro, then the file with the list. Each class gets the
# comment behind its line of the list, each member that of its row in the opening comment.
def expand_list(lines, folder, opening):
    expanded = []
    macro = []
    for line in lines:
        listed = re.match(r'#include <(.*/)?(\w+\.inc)>', line)
        if listed:
            for entry in read_lines(os.path.join(folder, listed.group(2))):
                expanded += expand_entry(macro, entry, opening)
        elif re.match(r'#define \w+\(X\)', line) or (macro and line and macro[-1].endswith('\\')):
            macro.append(line)
        else:
            expanded.append(line)
    return expanded


def expand_entry(macro, entry, opening):
    parts = re.match(r'\w+\((\w+)\) *(//.*)?$', entry)
    if not parts:
        return []
    meaning = parts.group(2) or ''
    expanded = ['// ' + meaning[3].upper() + meaning[4:] + '.'] if meaning else []
    for line in macro[1:]:
        line = line.rstrip('\\').rstrip()[4:]
        name = re.search(r'(CORBA_##X|_\w+)(?=\()|_description', line)
        if name and line.startswith('    ') and not line.startswith('    static CORBA_##X* _downcast(std'):
            said = said_of(name.group(0).replace('##', ''), line, opening)
            said = re.sub(r'\bX\b', parts.group(1), said).replace('CORBA_X', 'CORBA_' + parts.group(1))
            expanded += ['', '    // ' + said] if said else []
        line = line.replace('CORBA::CORBA_##X', 'CORBA_##X')
        expanded.append(re.sub(r'##X\b|\bX\b', lambda m: m.group(0).replace('##X', parts.group(1))
                               if '##' in m.group(0) else parts.group(1), line))
    return expanded + ['']


# What the opening comment says of member `name`. Constructors with arguments share one sentence.
def said_of(name, line, opening):
    if name == 'CORBA_X' and '()' not in line:
        return 'The minor code passes the rule of CORBA_SystemException; `reason` is copied.'
    for paragraph in opening:
        for row in paragraph.content if paragraph.kind == 'code' else []:
            left = re.match(re.escape(name) + r'\b\S*(\(.*?\))? {2,}(.+)$', row)
            if left:
                return left.group(2)[0].upper() + left.group(2)[1:] + '.'
    return ''


# The paragraphs of the opening comment, and the number of the first line behind it.
def read_opening(lines):
    text = []
    end = 0
    while end < len(lines) and lines[end].startswith('//'):
        if 'SPDX-License' not in lines[end]:
            text.append(lines[end][2:])
        end += 1
    return paragraphs(without_tests(text)), end


def paragraphs(lines):
    found = []
    block = []
    for line in lines + ['']:
        if line.strip():
            block.append(line)
            continue
        if block:
            found.append(paragraph(block))
        block = []
    return merge_code(found)


def paragraph(block):
    if all(line.startswith('     ') for line in block):
        return Paragraph('code', [line[5:] for line in block])
    if block[0].startswith('   '):
        return Paragraph('table', rows(block))
    return Paragraph('prose', [line.strip() for line in block])


# Rows of "name   other name   text"; a line that is indented further goes on with the text above it.
def rows(block):
    found = []
    for line in block:
        *names, text = re.split(r' {2,}', line.strip())
        if line.startswith('    ') and found:
            found[-1] = (found[-1][0], (found[-1][1] + ' ' + line.strip()).strip())
        elif names:
            found.append((', '.join(names), text))
        else:
            found.append((line.strip(), ''))
    return found


# Blank lines inside an example do not end it.
def merge_code(found):
    merged = []
    for item in found:
        if item.kind == 'code' and merged and merged[-1].kind == 'code':
            merged[-1].content += [''] + item.content
        else:
            merged.append(item)
    return merged


class Reader:
    def __init__(self, header):
        self.header = header
        self.lines = header.lines
        self.scopes = []  # [kind, name, access]
        self.comment = []
        self.fresh = False  # the comment stands on the line above
        self.first_of_run = None
        self.group = ''

    def read(self):
        at = self.header.begin
        while at < len(self.lines):
            at = self.step(at)

    def step(self, at):
        line = self.lines[at].strip()
        access = ACCESS.match(line)
        if line == '':
            self.comment = []
        elif line.startswith('//'):
            return self.read_comment(at)
        elif line.startswith('#'):
            return self.read_directive(at)
        elif access:
            self.scopes[-1][2] = access.group(1)
            self.comment = []
        elif line == 'extern "C" {':
            self.scopes.append(['namespace', '', 'public'])
            self.comment = []
        elif line.startswith('}'):
            self.scopes.pop()
            self.comment = []
            self.group = ''
        elif re.match(r'KEL_[A-Z_]+\(', line):
            pass  # a list of its own, expanded elsewhere
        else:
            return self.read_declaration(at)
        return at + 1

    def read_comment(self, at):
        text = []
        first = at
        while at < len(self.lines) and self.lines[at].strip().startswith('//'):
            text.append(self.lines[at].strip()[2:])
            at += 1
        ruler = RULER.match(self.lines[first].strip())
        if ruler:
            self.group = ruler.group(1)
            self.header.groups.append((first, ruler.group(1), text[1:]))
        elif at < len(self.lines) and self.lines[at].strip():
            self.comment = without_tests(text)
            self.fresh = True
        return at

    def read_directive(self, at):
        first = at
        while self.lines[at].endswith('\\'):
            at += 1
        if self.lines[first].startswith('#define') and not re.match(r'#define KEL_\w+_H$', self.lines[first]):
            found = self.declare(first, at, '')
            found.kind = 'define'
            found.text = re.match(r'#define \w+(\([^)]*\))?', self.lines[first]).group(0)
        return at + 1

    def read_declaration(self, first):
        depth = 0
        text = ''
        for at in range(first, len(self.lines)):
            code = without_comment(self.lines[at])
            text += ' ' + code.strip()
            depth += balance(code)
            scope = SCOPE.match(text.strip())
            if scope and depth > 0:
                self.open_scope(first, at, scope)
                return at + 1
            if depth == 0 and re.search(r'[;}]$', code.strip()):
                self.declare(first, at, text)
                return at + 1
            if depth == 0 and self.in_enum() and re.search(r'(,|\w)$', code.strip()):
                self.declare(first, at, text)
                return at + 1
        raise ValueError('a declaration without an end in line %d' % (first + 1))

    def in_enum(self):
        return bool(self.scopes) and self.scopes[-1][0] == 'enum'

    def open_scope(self, first, at, match):
        found = self.declare(first, at, match.group(0).rstrip('{'))
        found.kind = match.group('kind')
        names = re.findall(r'[A-Za-z_]\w*', MACRO.sub('', match.group('rest')).split(' : ')[0].replace('::', '__in__'))
        found.name = names[0].split('__in__')[-1] if names else ''
        self.scopes.append([found.kind, found.name, 'private' if found.kind == 'class' else 'public'])
        self.comment = []
        self.group = ''

    def declare(self, first, last, text):
        scope = [name for _, name, _ in self.scopes if name]
        access = 'public'
        for _, _, rights in self.scopes:
            if rights != 'public':
                access = rights
        found = Declaration(first, last, tidy(text), scope, access)
        found.group = self.group
        trailing = TRAILING.match(self.lines[last]) or TRAILING.match(self.lines[first])
        if trailing:
            found.trailing = trailing.group('text')
        if self.fresh:
            self.first_of_run = found
        if self.comment and (self.fresh or speaks_also_of(found, self.first_of_run)):
            found.comment = self.comment
        self.fresh = False
        self.header.declarations.append(found)
        return found


# Whether the comment in front of `first` speaks of `found` too, which stands below it in the same run: not
# when that is known from elsewhere, by a base class or by a comment of its own, or is of another sort.
def speaks_also_of(found, first):
    if found.is_deleted() or found.is_destructor():
        return False
    if is_constructor(first):
        return is_constructor(found) or 'operator=(' in found.text
    same = called(found) == called(first)
    if 'override' in found.text or found.trailing:
        return same
    return True


def called(found):
    words = found.text.split('(')[0].split()
    return words[-1].lstrip('*&_') if words else ''


def is_constructor(found):
    return bool(found.scope) and called(found) == found.scope[-1].lstrip('_')


# The names of the tests that pin a behaviour are for those who change it.
def without_tests(lines):
    text = re.sub(r'\s*Pinned\s+by\s+[A-Z]\w+[./][\w./]*\w(?:(?:,|\s+and)\s+[A-Z]\w+[./][\w./]*\w)*\.(?=\s|$)', '',
                  '\n'.join(lines))
    return [line for line in text.split('\n') if line.strip() or line == '']


def without_comment(line):
    return re.sub(r'(^|\s)// .*$', '', re.sub(r'"(\\.|[^"\\])*"', '""', line))


def balance(code):
    return sum(code.count(c) for c in '({') - sum(code.count(c) for c in ')}')


# The declaration as a reader needs it: one line, no attribute macros, no body, no initialisers.
def tidy(text):
    text = MACRO.sub('', text)
    text = re.sub(r'__attribute__\(\(.*?\)\)', '', text)
    text = re.sub(r'\s+', ' ', text).strip()
    if '(' in text and not text.startswith('typedef'):
        text = re.sub(r'\s*(: _\w+\(.*)?\{.*\}$', ';', text)
    text = re.sub(r'\s+;', ';', text)
    return text.replace('[[noreturn]] ', '')
