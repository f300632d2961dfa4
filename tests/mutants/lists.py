# What the sources say about mutants: the lists of this folder, the `Deliberate:` comments of kel/ and
# the names of the tests. Reads text only and needs no build.
#
#     mutants = read_lists(root, problems)
#     check_comments(root, mutants, tests, problems)
#
# SPDX-License-Identifier: MIT
import re
from pathlib import Path

TEST = re.compile(r"^(?:TEST|TEST_F|TEST_P|TYPED_TEST)\(\s*(\w+)\s*,\s*(\w+)\s*\)", re.M)
NAME = re.compile(r"\b[A-Z]\w*(?:/\w+)?\.[A-Z]\w+")


class Mutant:
    """One change of the sources, and the tests of which each must fail with it."""

    def __init__(self, title, place):
        self.title = title
        self.place = place    # "tests/mutants/core/vthread.txt:12"
        self.of = None        # the file whose `Deliberate:` comment it contradicts; "" for a generic one
        self.tests = []       # "Suite.Name"
        self.hunks = []       # [file, old lines, new lines]

    def apply(self, root):
        """The changed files and their new texts; raises ValueError when a hunk does not fit."""
        texts = {}
        for file, old, new in self.hunks:
            text = "\n" + (texts.get(file) or (root / file).read_text())
            # A line that stays may begin anywhere in its line, one that goes is a whole line.
            anchor = "" if old[:1] == new[:1] else "\n"
            old, new = anchor + "".join(old), anchor + "".join(new)
            if text.count(old) != 1 or not old.strip():
                raise ValueError(f"{self.place}: a hunk fits {text.count(old)} places of {file}")
            texts[file] = text.replace(old, new)[1:]
        return texts


def read_list(path, root, problems):
    mutants = []
    for number, line in enumerate(path.read_text().splitlines(keepends=True), 1):
        place = f"{path.relative_to(root)}:{number}"
        word, _, rest = line.rstrip("\n").partition(" ")
        rest = rest.strip()
        in_hunk = mutants and mutants[-1].hunks
        if word == "==":
            mutants.append(Mutant(rest, place))
        elif in_hunk and line[0] in " -+":
            _, old, new = mutants[-1].hunks[-1]
            if line[0] in " -":
                old.append(line[1:])
            if line[0] in " +":
                new.append(line[1:])
        elif word.startswith("#") or not line.strip():
            continue
        elif mutants and word == "@@":
            mutants[-1].hunks.append([rest, [], []])
        elif mutants and word == "of":
            mutants[-1].of = rest
        elif mutants and word == "generic":
            mutants[-1].of = ""
        elif mutants and word == "test":
            mutants[-1].tests += rest.split()
        else:
            problems.append(f"{place}: what is this line?")
    return mutants


def read_lists(root, problems):
    """Every mutant of every list. What is malformed is told in `problems`."""
    mutants = []
    for path in sorted((root / "tests/mutants").glob("*/*.txt")):
        mutants += read_list(path, root, problems)
    for mutant in mutants:
        if mutant.of is None:
            problems.append(f"{mutant.place}: is neither `generic` nor `of` a file")
        if not (mutant.tests and mutant.hunks):
            problems.append(f"{mutant.place}: has no test or no change")
        try:
            mutant.apply(root)
        except (ValueError, OSError) as error:
            problems.append(str(error))
    return mutants


def read_tests(root):
    """{"Suite.Name": source file} of every test. A name that stands in two files belongs to both."""
    tests = {}
    for path in sorted((root / "tests").glob("*/*_test.cpp")):
        for suite, name in TEST.findall(path.read_text()):
            tests.setdefault(f"{suite}.{name}", []).append(str(path.relative_to(root)))
    return tests


class Comment:
    """One `Deliberate:` rule: its place and the tests that it says pin it."""

    def __init__(self, place, file, text):
        self.place = place
        self.file = file
        self.tests = [name.split("/")[-1] for name in NAME.findall(text.partition("Pinned by")[2])]


def read_comments(root):
    comments = []
    for path in sorted((root / "kel").rglob("*")):
        if path.suffix not in (".h", ".cpp"):
            continue
        file = str(path.relative_to(root))
        open_comment = None   # [line, text] of the comment that is being read
        for number, line in enumerate(path.read_text().splitlines() + [""], 1):
            before, slashes, said = line.partition("//")
            said = said.strip()
            starts = "Deliberate:" in said
            ends = not slashes or not said or before.strip()
            if open_comment and (starts or ends):
                comments.append(Comment(f"{file}:{open_comment[0]}", file, open_comment[1]))
                open_comment = None
            if starts:
                open_comment = [number, said.partition("Deliberate:")[2]]
            elif open_comment:
                open_comment[1] += " " + said
    return comments


def check_comments(root, mutants, tests, problems):
    """Each test that a comment names exists and is shown by a mutant of that comment to pin it."""
    pinned = set()
    comments = read_comments(root)
    for comment in comments:
        if not comment.tests:
            problems.append(f"{comment.place}: names no test")
        for test in comment.tests:
            pinned.add((comment.file, test))
            if test not in tests:
                problems.append(f"{comment.place}: there is no test {test}")
            if not any(m.of == comment.file and test in m.tests for m in mutants):
                problems.append(f"{comment.place}: no mutant shows that {test} pins the rule")
    for mutant in mutants:
        for test in mutant.tests:
            if len(tests.get(test, [])) != 1:
                problems.append(f"{mutant.place}: there are {len(tests.get(test, []))} tests {test}")
        if mutant.of and not any((mutant.of, test) in pinned for test in mutant.tests):
            problems.append(f"{mutant.place}: no comment of {mutant.of} names one of its tests")
    return comments
