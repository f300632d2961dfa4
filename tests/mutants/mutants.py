#!/usr/bin/env python3
# Breaks the library in one place at a time and expects the test that is named for it to fail.
#
#     tests/mutants/mutants.py BUILD             all mutants of tests/mutants/*/*.txt
#     tests/mutants/mutants.py BUILD vthread     those whose place or title has the word
#     tests/mutants/mutants.py --lists           only whether the lists agree with the sources
#
# BUILD is a build folder of ninja in which the tests are built. Two things are asked for: every test
# that a `Deliberate:` comment names fails when the code there becomes what one would expect, and each
# generic mutant is seen by its test. A mutant that does not compile is a mistake, not a success; so is
# one with which no program starts. A test that takes longer than 20 s has failed. Before all that the
# named tests must pass with the library as it is, compiled like a mutant.
#
# Ends with a line of figures; exit status 1 when a mutant survives or a list needs mending.
#
# SPDX-License-Identifier: MIT
import os
import resource
import shutil
import sys
import time
from concurrent.futures import ThreadPoolExecutor
from pathlib import Path

sys.dont_write_bytecode = True

from lists import check_comments, read_lists, read_tests  # noqa: E402
from workshop import DoesNotCompile, Workshop  # noqa: E402

ROOT = Path(__file__).resolve().parents[2]


def filter_of(test):
    """Selects a test by its name in the source, whatever it is instantiated with."""
    suite, name = test.split(".")
    return f"{suite}.{name}:{suite}/*.{name}:*/{suite}.{name}/*:*/{suite}/*.{name}/*"


def verdict(shop, tests, mutant, folder):
    """What is wrong with `mutant`, or an empty text when each of its tests fails."""
    texts = mutant.apply(ROOT)
    shop.write(folder, texts)
    library = shop.library(folder, texts)
    for test in mutant.tests:
        program = shop.program(folder, texts, tests[test][0])
        if not shop.passes(program, library, ["--gtest_list_tests"]):
            return "no program starts with it"
        if shop.passes(program, library, [f"--gtest_filter={filter_of(test)}"]):
            return f"survives {test}"
    return ""


def tried(shop, tests, mutant, number):
    folder = shop.folder / str(number)
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir(parents=True)
    start = time.monotonic()
    try:
        problem = verdict(shop, tests, mutant, folder)
    except DoesNotCompile as error:
        problem = f"does not compile:\n{error}"
    if not problem:
        shutil.rmtree(folder)
    if os.environ.get("VERBOSE"):
        print(f"{time.monotonic() - start:6.1f} s  {mutant.place} {problem or 'killed'}", flush=True)
    return problem


def plain_failures(shop, tests, mutants):
    """Those of the named tests that fail although nothing has been changed."""
    programs = {}
    for test in {t for m in mutants for t in m.tests}:
        programs.setdefault(shop.program_of(tests[test][0])[1], set()).add(test)
    failures = []
    for program, names in sorted(programs.items()):
        every = ["--gtest_filter=" + ":".join(filter_of(t) for t in sorted(names))]
        if shop.passes(shop.build / program, shop.folder / "plain", every, 120):
            continue
        for test in sorted(names):
            one = [f"--gtest_filter={filter_of(test)}"]
            if not shop.passes(shop.build / program, shop.folder / "plain", one):
                failures.append(f"{test} fails without a mutant")
    return failures


def main(arguments):
    problems = []
    tests = read_tests(ROOT)
    mutants = read_lists(ROOT, problems)
    comments = check_comments(ROOT, mutants, tests, problems)
    words = arguments[1:]
    if (problems and not words) or not arguments or arguments == ["--lists"]:
        print("\n".join(problems))
        print(f"mutants: {len(mutants)} listed, {len(comments)} rules, {len(problems)} mistakes")
        return 1 if problems else 0

    chosen = [m for m in mutants if not words or any(w in m.place or w in m.title for w in words)]
    shop = Workshop(ROOT, Path(arguments[0]).resolve())
    shop.prepare()
    problems = plain_failures(shop, tests, chosen)
    resource.setrlimit(resource.RLIMIT_CORE, (0, 0))
    start = time.monotonic()
    with ThreadPoolExecutor(os.cpu_count()) as pool:
        found = list(pool.map(lambda n: tried(shop, tests, chosen[n], n), range(len(chosen))))
    for mutant, problem in zip(chosen, found):
        if problem:
            print(f"{mutant.place}: {mutant.title}: {problem}")
    for problem in problems:
        print(problem)
    killed = sum(not problem for problem in found)
    of_rules = sum(bool(m.of) for m in chosen)
    print(f"mutants: {killed} of {len(chosen)} killed, {of_rules} for the {len(comments)} deliberate rules and "
          f"{len(chosen) - of_rules} generic, {shop.late} by the time limit, in {time.monotonic() - start:.0f} s")
    return 0 if killed == len(chosen) and not problems else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
