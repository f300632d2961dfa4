#!/usr/bin/env python3
# Every link of a page of the tree leads to a file that is there, and to a heading that is in it.
#
#     links.py ROOT
#
# SPDX-License-Identifier: MIT
import os
import re
import sys


def pages(root):
    for folder, inner, files in os.walk(root):
        inner[:] = [name for name in inner if name not in ('build', '.git', 'source')]
        for name in sorted(files):
            if name.endswith('.md'):
                yield os.path.join(folder, name)


def text_of(page):
    with open(page, encoding='utf-8') as file:
        return re.sub(r'```.*?```', '', file.read(), flags=re.S)


# The names that headings can be linked by.
def anchors(page):
    found = set()
    for heading in re.findall(r'^#+ (.+)$', text_of(page), re.M):
        plain = re.sub(r'[^\w\- ]', '', heading.lower())
        found.add(plain.replace(' ', '-'))
    return found


def broken(page, target):
    path, _, anchor = target.partition('#')
    file = os.path.normpath(os.path.join(os.path.dirname(page), path)) if path else page
    if not os.path.exists(file):
        return 'there is no %s' % path
    if anchor and file.endswith('.md') and anchor not in anchors(file):
        return 'there is no heading #%s' % anchor
    return None


def main(root):
    count = 0
    findings = []
    for page in pages(root):
        for target in re.findall(r'\]\(([^)\s]+)\)', text_of(page)):
            if re.match(r'[a-z]+:', target):
                continue
            count += 1
            problem = broken(page, target)
            if problem:
                findings.append('%s: %s' % (os.path.relpath(page, root), problem))
    print('\n'.join(findings) if findings else 'docs: %d links lead somewhere' % count)
    return 1 if findings or count == 0 else 0


sys.exit(main(sys.argv[1]))
