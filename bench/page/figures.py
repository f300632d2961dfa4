"""What the programs of the bench measured, as their JSON output says it.

A line is named "work/contender", a point of a curve "growth: work/contender@size". Every one is measured several
times in changing order; its figure is the median of those that were measured while the machine was quiet, its spread
the distance between the ends of their middle two quarters. Where one contender has too few of these, all times of all
contenders of the line count, as what disturbed one would else be missing from another.
"""

import json
import re
import statistics
from collections import namedtuple

LIMIT, KEL = "limit", "kel"

QUIET = 1.1  # of the least time that the probe took in the whole run
FEWEST = 9   # quiet times that a figure is made of

Figure = namedtuple("Figure", "ns spread least")  # the spread as a share of the median
Timed = namedtuple("Timed", "ns probe")
Goal = namedtuple("Goal", "peer most")
Line = namedtuple("Line", "figures taken quiet is_quiet")  # by contender; how many times; whether the quiet alone count


class Work(namedtuple("Work", "topic name line goal")):
    """A line of the table."""
    figures = property(lambda self: self.line.figures)


_SUFFIX = re.compile(r"/(real_time|manual_time|iterations:\d+|process_time|threads:\d+|repeats:\d+)")


def _time_of(run):
    """Nanoseconds of one item; the time on the wall where others do the work."""
    on_the_wall = re.search(r"/(real|manual)_time", run["name"])
    factor = {"ns": 1, "us": 1e3, "ms": 1e6, "s": 1e9}[run["time_unit"]]
    return run["real_time" if on_the_wall else "cpu_time"] * factor / run.get("items", 1)


def _figure(all_times):
    times = [timed.ns for timed in all_times]
    median = statistics.median(times)
    low, _, high = statistics.quantiles(times, n=4, method="inclusive") if len(times) > 1 else times * 3
    return Figure(median, (high - low) / median, min(times))


def _line(contenders, least_probe):
    quiet = {who: [timed for timed in times if timed.probe <= QUIET * least_probe]
             for who, times in contenders.items()}
    is_quiet = min(map(len, quiet.values())) >= FEWEST
    chosen = quiet if is_quiet else contenders
    return Line({who: _figure(times) for who, times in chosen.items()}, sum(map(len, contenders.values())),
                sum(map(len, quiet.values())), is_quiet)


def read(files):
    """What all files tell: {(topic, work): Line}, in the order of the programs."""
    times, order = {}, {}
    for number, (topic, file) in enumerate(files):
        for run in json.load(open(file, encoding="utf-8"))["benchmarks"]:
            if run["run_type"] != "iteration" or run.get("error_occurred"):
                continue
            work, contender = _SUFFIX.sub("", run["run_name"]).rsplit("/", 1)
            place = (topic, work)
            order.setdefault(place, (number, run["family_index"]))
            times.setdefault(place, {}).setdefault(contender, []).append(Timed(_time_of(run), run["probe"]))
    places = sorted(times, key=order.get)
    least_probe = min(timed.probe for place in places for all_of in times[place].values() for timed in all_of)
    return {place: _line(times[place], least_probe) for place in places}


def _rows(file):
    for line in open(file, encoding="utf-8"):
        if line.strip() and not line.startswith("#"):
            yield [cell.strip() for cell in line.split("|")]


def goals(file):
    """{(topic, work): Goal}"""
    return {(topic, work): Goal(peer, float(most)) for topic, work, peer, most in _rows(file)}


def reasons(file):
    """{work: why the library is where it is}"""
    return {work: text for work, text in _rows(file)}


def works(measured, wanted):
    """Those that have goals first, in the order of their list, then the others."""
    lines = [place for place in measured if not place[1].startswith("growth: ")]
    ordered = [place for place in wanted if place in lines] + [place for place in lines if place not in wanted]
    return [Work(*place, measured[place], wanted.get(place)) for place in ordered if KEL in measured[place].figures]


def curves(measured):
    """{work: {contender: [(size, ns)]}}"""
    result = {}
    for (_, work), line in measured.items():
        if not work.startswith("growth: "):
            continue
        for contender, figure in line.figures.items():
            who, size = contender.rsplit("@", 1)
            result.setdefault(work[len("growth: "):], {}).setdefault(who, []).append((int(size), figure.ns))
    return {work: {who: sorted(points) for who, points in lines.items()} for work, lines in result.items()}


def best_peer(work):
    """The fastest contender that is neither the library nor the limit, or None."""
    peers = [who for who in work.figures if who not in (LIMIT, KEL)]
    return min(peers, key=lambda who: work.figures[who].ns, default=None)


def ratio(work, contender):
    """The library's time over the contender's, or None where that was not measured."""
    if contender not in work.figures:
        return None
    return work.figures[KEL].ns / work.figures[contender].ns


def least_ratio(work, contender):
    """The same of the least times that were measured."""
    return work.figures[KEL].least / work.figures[contender].least
