# Builds mutants beside a finished build folder and runs tests against them.
#
#     shop = Workshop(root, build)
#     shop.prepare()                      # every unit once, as it is but not optimised
#     library = shop.library(folder, texts)
#
# The commands are those that ninja would run, with other options for speed. A changed file lies under
# its own path in the mutant's folder, which is searched before the sources.
#
# SPDX-License-Identifier: MIT
import os
import shlex
import signal
import subprocess
from concurrent.futures import ThreadPoolExecutor
from pathlib import Path

FASTER = ["-O0", "-g0", "-w"]
DROPPED = {"-O2", "-g", "-Werror", "-MD"}
DROPPED_WITH_VALUE = {"-MT", "-MF", "-o", "-c"}
TIME_LIMIT = 20  # seconds for one test


class DoesNotCompile(Exception):
    pass


def run(command, folder):
    done = subprocess.run(command, cwd=folder, stdin=subprocess.DEVNULL, capture_output=True, text=True)
    if done.returncode != 0:
        raise DoesNotCompile(done.stdout + done.stderr)
    return done.stdout


class Workshop:
    def __init__(self, root, build):
        self.root = root
        self.build = build
        self.folder = build / "mutants"
        self.late = 0
        self.compiles = {}   # object -> words of its command
        self.sources = {}    # object -> source, relative to root
        self.links = {}      # what is linked -> words of its command
        for line in run(["ninja", "-t", "commands"], build).splitlines():
            self.learn(line)
        self.deps = self.read_deps()
        self.library_link = next(v for k, v in self.links.items() if k.startswith("libkel.so."))
        self.units = {self.sources[o]: o for o in self.library_link if o in self.sources}

    def learn(self, line):
        words = shlex.split(line)
        if "-c" in words and "-o" in words:
            made, source = words[words.index("-o") + 1], words[words.index("-c") + 1]
            self.compiles[made] = words
            if Path(source).is_relative_to(self.root):
                self.sources[made] = str(Path(source).relative_to(self.root))
        elif words[:2] == [":", "&&"] and "-o" in words:
            steps = " ".join(words).split(" && ")
            words = steps[1].split()
            self.links[words[words.index("-o") + 1]] = words

    def read_deps(self):
        deps, made = {}, None
        for line in run(["ninja", "-t", "deps"], self.build).splitlines():
            if line.startswith(" "):
                path = Path(line.strip())
                if path.is_relative_to(self.root):
                    deps[made].add(str(path.relative_to(self.root)))
            elif line:
                made = line.split(":")[0]
                deps[made] = set()
        return deps

    def compile(self, made, source, output, overlay):
        """Compiles `source` with the options of object `made`; `overlay` is searched first or is None."""
        words, kept = iter(self.compiles[made]), []
        for word in words:
            if word in DROPPED_WITH_VALUE:
                next(words)
            elif word not in DROPPED:
                kept.append(word)
        search = [f"-I{overlay}"] if overlay else []
        first = next(i for i, word in enumerate(kept) if word.startswith("-"))
        command = kept[:first] + search + kept[first:] + FASTER + ["-o", str(output), "-c", str(source)]
        output.parent.mkdir(parents=True, exist_ok=True)
        run(command, self.build)

    def plain(self, made):
        return self.folder / "plain" / (made.replace("/", "_"))

    def prepare(self):
        """Compiles each unit of the library unchanged, where that is older than the sources."""
        newest = max(p.stat().st_mtime for p in (self.root / "kel").rglob("*"))
        stale = [(s, o) for s, o in self.units.items()
                 if not self.plain(o).exists() or self.plain(o).stat().st_mtime < newest]
        with ThreadPoolExecutor(os.cpu_count()) as pool:
            list(pool.map(lambda u: self.compile(u[1], self.root / u[0], self.plain(u[1]), None), stale))
        self.link_library(self.folder / "plain", {})

    def link_library(self, folder, changed):
        """Links a library of the unchanged units but for `changed`, {object: path}."""
        words = [str(changed.get(w, self.plain(w))) if w in self.sources else w for w in self.library_link]
        words[words.index("-o") + 1] = str(folder / "libkel.so.1")
        run(words, self.build)

    def write(self, folder, texts):
        for file, text in texts.items():
            path = folder / file
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_text(text)

    def library(self, folder, texts):
        """The folder of the library with the changed `texts`: the plain one when no unit changes.

        A private header changes the units that include it. A public one is compiled into the tests, and into
        the units that define what it has in line.
        """
        private = {f for f in texts if "/internal/" in f}
        changed = {o: f for f, o in self.units.items() if f in texts or private & self.deps.get(o, set())}
        for unit, made in self.units.items():
            if texts.keys() & self.deps.get(made, set()) and "#define KEL_INLINE_" in (self.root / unit).read_text():
                changed[made] = unit
        if not changed:
            return self.folder / "plain"
        made = {}
        for unit, source in changed.items():
            made[unit] = folder / (unit.replace("/", "_"))
            place = folder if source in texts else self.root
            self.compile(unit, place / source, made[unit], folder)
        self.link_library(folder, made)
        return folder

    def program_of(self, source):
        """The object of a test's source and the program that it is linked into."""
        made = next(o for o, s in self.sources.items() if s == source)
        return made, next(p for p, words in self.links.items() if made in words)

    def program(self, folder, texts, source):
        """The program that holds the tests of `source`: its own one, or a small one that is compiled
        with the changed public headers."""
        made, program = self.program_of(source)
        public = {f for f in texts if f.endswith(".h") and "/internal/" not in f}
        if not public & self.deps.get(made, set()):
            return self.build / program
        output = folder / (made.replace("/", "_"))
        self.compile(made, self.root / source, output, folder)
        words = [w for w in self.links[program]
                 if not self.sources.get(w, "").endswith("_test.cpp") or w == made]
        words = [str(output) if w == made else w for w in words]
        small = folder / "tests"
        words[words.index("-o") + 1] = str(small)
        run(words, self.build)
        return small

    def passes(self, program, library, arguments, limit=TIME_LIMIT):
        """Whether `program` with `library` exits with 0 within `limit` seconds. `late` counts those that
        had to be ended."""
        environment = dict(os.environ, LD_LIBRARY_PATH=str(library))
        child = subprocess.Popen([str(program)] + arguments, cwd=self.build, env=environment,
                                 stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                                 stderr=subprocess.DEVNULL, start_new_session=True)
        try:
            return child.wait(limit) == 0
        except subprocess.TimeoutExpired:
            os.killpg(child.pid, signal.SIGKILL)
            child.wait()
            self.late += 1
            return False
