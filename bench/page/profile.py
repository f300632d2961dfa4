"""Where the library's time goes in a line: what perf finds the processor at, some thousand times.

    profile.py FOLDER TOPIC...      prints the profile of every line of the topics

A sample counts for the innermost function of the library's sources that it lies in, be it in line or not, for the
loop of the bench, or for the symbol of another library. All of the system is one. scripts/bench calls it.
"""

import collections
import os
import re
import shutil
import subprocess
import sys
import tempfile

import figures

TOP = os.path.realpath(os.path.join(os.path.dirname(__file__), "..", ".."))
SECONDS = 1      # of measuring, each line
RATE = 5000      # samples a second
SMALLEST = 0.03  # what takes less is not named

_MAPPED = re.compile(r"PERF_RECORD_MMAP2 .*?\[0x(\w+)\(0x(\w+)\) @ (\w+) .*: [-rwxp]{4} (.*)")
_SAMPLE = re.compile(r"\s*([0-9a-f]+) (.*) \((.*)\)$")
_SEGMENT = re.compile(r"\s*LOAD\s+0x(\w+) 0x(\w+) 0x\w+ 0x(\w+)")


def _output(*command, **more):
    return subprocess.run(command, check=True, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, text=True,
                          **more).stdout


def _recorded(program, work):
    """What perf tells of the library's part of the line: its mappings and samples as lines of text."""
    escaped = re.sub(r"[^\w ,]", ".", work)
    with tempfile.TemporaryDirectory() as folder:
        data = os.path.join(folder, "perf.data")
        _output("perf", "record", "--freq", str(RATE), "--output", data, program,
                f"--benchmark_filter=^{escaped}/{figures.KEL}(/|$)", f"--benchmark_min_time={SECONDS}")
        return _output("perf", "script", "--input", data, "--fields", "ip,sym,dso", "--show-mmap-events")


def _offsets(text):
    """[(file, offset of the sample in it, symbol)]"""
    mapped, samples = [], []
    for line in text.splitlines():
        if match := _MAPPED.match(line):
            start, size, offset, file = match.groups()
            mapped.append((int(start, 16), int(size, 16), int(offset, 16), file))
        elif match := _SAMPLE.match(line):
            samples.append((int(match[1], 16), match[2], match[3]))
    for address, symbol, file in samples:
        for start, size, offset, mapped_file in reversed(mapped):
            if mapped_file == file and start <= address < start + size:
                yield file, address - start + offset, symbol
                break
        else:
            yield file, None, symbol


def _functions(file, offsets):
    """{offset: the innermost function of the library's sources that it lies in}"""
    segments = [[int(word, 16) for word in match.groups()]
                for match in map(_SEGMENT.match, _output("readelf", "-lW", file).splitlines()) if match]
    addresses = {}
    for offset in offsets:
        for begin, address, size in segments:
            if begin <= offset < begin + size:
                addresses[offset - begin + address] = offset
    told = _output("addr2line", "-a", "-f", "-i", "-C", "-e", file, input="\n".join(map(hex, addresses)))
    result, offset = {}, None
    lines = iter(told.splitlines())
    for line in lines:
        if line.startswith("0x"):
            offset = addresses[int(line, 16)]
            continue
        source = os.path.realpath(next(lines).rsplit(":", 1)[0])
        if source.startswith(os.path.join(TOP, "kel", "")):
            result.setdefault(offset, _short(line))
    return result


def _short(function):
    """A demangled name without its arguments and its inner name spaces."""
    name = function.replace("(anonymous namespace)::", "").replace("kel::internal::", "")
    operator = re.search(r"operator(<<|>>|\(\)|[^\w\s]+)", name)
    if operator:
        return name[:operator.end()].split(" ")[-1]
    name = name.replace("<=", "")  # in the condition of a template, no bracket
    while (shorter := re.sub(r"<[^<>]*>", "", name)) != name:
        name = shorter
    return re.sub(r"\(.*", "", name).split(" ")[-1]


def _place(file, function, symbol):
    """Whose code it is, and which function of it."""
    if function:
        return "the library", function
    if "kernel" in file or file.startswith("["):
        return "the system", None
    owner = re.sub(r"\.so.*", "", os.path.basename(file))
    if owner.startswith("bench_"):
        return "the bench", None
    return "the library" if owner == "libkel" else owner, None if symbol == "[unknown]" else _short(symbol)


def program(folder, topic):
    return os.path.join(folder, "bench", "bench_" + topic)


def is_possible():
    return shutil.which("perf") is not None


def profile(folder, topic, work):
    """Whose code takes which share of one line, and its functions, the largest first and as text."""
    samples = list(_offsets(_recorded(program(folder, topic), work)))
    functions = {file: _functions(file, {offset for where, offset, _ in samples if where == file and offset})
                 for file in {file for file, _, _ in samples} if file.startswith(TOP + os.sep)}
    places = collections.Counter(_place(file, functions.get(file, {}).get(offset), symbol)
                                 for file, offset, symbol in samples)
    owners = collections.Counter()
    for (owner, _), count in places.items():
        owners[owner] += count

    def percent(count):
        return f"{100 * count / len(samples):.0f} %"

    def of(owner):
        named = [f"`{function}` {percent(count)}" for (who, function), count in places.most_common()
                 if who == owner and function and count >= SMALLEST * len(samples)]
        return f" ({', '.join(named)})" if named else ""

    return ", ".join(f"{percent(count)} {owner}{of(owner)}" for owner, count in owners.most_common()
                     if count >= SMALLEST * len(samples))


def main(folder, *topics):
    if not is_possible():
        sys.exit("bench: perf is not installed")
    ending = "/" + figures.KEL
    for topic in topics:
        lines = _output(program(folder, topic), "--benchmark_list_tests").splitlines()
        for line in lines:
            work, library, _ = line.partition(ending)
            if library and "@" not in line:
                print(f"{work}: {profile(folder, topic, work)}")


if __name__ == "__main__":
    main(*sys.argv[1:])
