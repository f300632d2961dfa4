#!/usr/bin/env python3
"""Sums up what gcov says about the library and writes it in the form that gcovr reports from.

    coverage.py BUILD_FOLDER EXCLUSIONS >coverage.json

gcovr reads gcov too, but one line holds several functions here (a template's instances, a macro's), and
it adds up their branches by number whatever they are. Here each function, template arguments aside, has
branches of its own:

  - the way that an exception takes out of a call is not counted;
  - a condition that is never evaluated in one program is left to the other programs. If none evaluates
    it, its line or the branch that leads to it shows up.

EXCLUSIONS says which lines, and how many branches of a line, are taken out of the count. A rule whose
line is gone is an error. What was taken out is told on standard error.

SPDX-License-Identifier: MIT
"""
import concurrent.futures
import fnmatch
import glob
import json
import os
import re
import subprocess
import sys

LINE = re.compile(r" *(-|[#=]{5}|\d+)\*?: *(\d+):(.*)")
BRANCH = re.compile(r"branch +(\d+) taken (\d+)(?: \((\w+)\))?")
ARC = re.compile(r"(branch|call|unconditional) +\d+ ")
ROOT = os.getcwd()


def without_template_arguments(name):
    """Of an instance of a template: its name. The parameters may be template arguments as well."""
    short = name
    while True:
        shorter = re.sub(r"(?<!operator)(?<!operator<)(?<!-)<[^<>]*>", "", short)
        if shorter == short:
            break
        short = shorter
    return name if short == name else short.replace("(anonymous namespace)", "").partition("(")[0]


def gcov(data):
    command = ["gcov", "--branch-probabilities", "--branch-counts", "--demangled-names", "--stdout", data]
    return subprocess.run(command, capture_output=True, text=True, check=True).stdout


class Line:
    def __init__(self):
        self.text = ""
        self.count = 0
        self.branches = {}  # (function, number of arcs, number of this one) to count

    def add(self, function, arcs):
        for number, arc in enumerate(arcs):
            match = BRANCH.match(arc)
            if match and match[3] != "throw":
                key = (function, len(arcs), number)
                self.branches[key] = self.branches.get(key, 0) + int(match[2])


class Library:
    """The lines of the files under kel/, by file and number."""

    def __init__(self):
        self.files = {}

    def read(self, report):
        lines, line, function, arcs = None, None, "", []
        for text in report.splitlines() + ["-: 0:end"]:
            if ARC.match(text):
                arcs.append(text)
                continue
            if line is not None and re.search(r"\w", line.text):
                line.add(function, arcs)
            line, arcs = None, []
            match = LINE.match(text)
            if match and match[2] == "0":
                if match[3].startswith("Source:"):
                    lines = self.lines_of(match[3][len("Source:"):])
            elif match and lines is not None and match[1] != "-":
                line = lines.setdefault(int(match[2]), Line())
                line.text = match[3].strip()
                line.count += int(match[1]) if match[1].isdigit() else 0
            elif text.startswith("function "):
                function = without_template_arguments(text[len("function "):].rpartition(" called ")[0])

    def lines_of(self, source):
        name = os.path.relpath(os.path.realpath(source), ROOT)
        return self.files.setdefault(name, {}) if name.startswith("kel/") else None


class Rules:
    """What is taken out of the count: `line FILE TEXT` and `branch NUMBER FILE TEXT`."""

    def __init__(self, path):
        self.branches = {}  # (file, text) to number; 0 takes out the line
        self.found = set()
        self.lines_out = self.branches_out = 0
        for text in open(path, encoding="utf-8"):
            match = re.match(r"(?:line|branch (\d+)) (\S+) (.*)", text)
            if match:
                self.branches[("kel/" + match[2], match[3])] = int(match[1] or 0)

    def of(self, name, text):
        for rule, number in self.branches.items():
            if rule[0] == name and fnmatch.fnmatchcase(text, glob.escape(rule[1][:-1]) + rule[1][-1]):
                self.found.add(rule)
                return number
        return None

    def apply(self, name, line):
        """The counts of the branches of `line` that are left; None when the line is taken out."""
        counts = list(line.branches.values())
        number = self.of(name, line.text)
        if number == 0 and line.count == 0:
            self.lines_out += 1
            return None
        for _ in range(min(number or 0, counts.count(0))):
            counts.remove(0)
        self.branches_out += len(line.branches) - len(counts)
        return counts

    def stale(self):
        return [f"{name}: there is no such line: {text}" for name, text in self.branches if (name, text) not in self.found]


def main(build, exclusions):
    data = [os.path.join(at, name) for at, _, names in os.walk(build) for name in names if name.endswith(".gcda")]
    library, rules = Library(), Rules(exclusions)
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        for report in pool.map(gcov, sorted(data)):
            library.read(report)
    files = []
    for name, lines in sorted(library.files.items()):
        kept = []
        for number, line in sorted(lines.items()):
            branches = rules.apply(name, line)
            if branches is not None:
                kept.append({"line_number": number, "count": line.count, "gcovr/noncode": False,
                             "gcovr/excluded": False, "branches": [
                    {"count": count, "fallthrough": False, "throw": False} for count in branches]})
        files.append({"file": name, "lines": kept, "functions": []})
    json.dump({"gcovr/format_version": "0.3", "files": files}, sys.stdout)
    print(f"{rules.lines_out} excluded lines, {rules.branches_out} excluded branches", file=sys.stderr)
    for complaint in rules.stale():
        print(complaint, file=sys.stderr)
    return 1 if rules.stale() else 0


if __name__ == "__main__":
    sys.exit(main(*sys.argv[1:]))
