"""What the programs of the bench measured, as their JSON output says it.

A line is named "work/contender", a point of a curve "growth: work/contender@size". Every one is measured several
times in changing order; its figure is the median, its spread the distance between the middle two quarters' ends.
"""

import json
import re
import statistics
from collections import namedtuple

LIMIT, KEL = "limit", "kel"

Figure = namedtuple("Figure", "ns spread least")  # the spread as a share of the median
Goal = namedtuple("Goal", "peer most")
Work = namedtuple("Work", "topic name figures goal")  # figures by contender

_SUFFIX = re.compile(r"/(real_time|manual_time|iterations:\d+|process_time|threads:\d+|repeats:\d+)")


def _time_of(run):
    """Nanoseconds of one item; the time on the wall where others do the work."""
    on_the_wall = re.search(r"/(real|manual)_time", run["name"])
    factor = {"ns": 1, "us": 1e3, "ms": 1e6, "s": 1e9}[run["time_unit"]]
    return run["real_time" if on_the_wall else "cpu_time"] * factor / run.get("items", 1)


def _figure(times):
    median = statistics.median(times)
    if len(times) < 2:
        return Figure(median, 0, median)
    low, _, high = statistics.quantiles(times, n=4, method="inclusive")
    return Figure(median, (high - low) / median, min(times))


def read(files):
    """The figures of all files: {work: {contender: Figure}}, in the order of the programs."""
    times, order = {}, {}
    for number, (topic, file) in enumerate(files):
        for run in json.load(open(file, encoding="utf-8"))["benchmarks"]:
            if run["run_type"] != "iteration" or run.get("error_occurred"):
                continue
            work, contender = _SUFFIX.sub("", run["run_name"]).rsplit("/", 1)
            place = (topic, work)
            order.setdefault(place, (number, run["family_index"]))
            times.setdefault(place, {}).setdefault(contender, []).append(_time_of(run))
    places = sorted(times, key=order.get)
    return {place: {who: _figure(all_of) for who, all_of in times[place].items()} for place in places}


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


def works(figures, wanted):
    """Those that have goals first, in the order of their list, then the others."""
    lines = [place for place in figures if not place[1].startswith("growth: ")]
    ordered = [place for place in wanted if place in lines] + [place for place in lines if place not in wanted]
    return [Work(place[0], place[1], figures[place], wanted.get(place)) for place in ordered
            if KEL in figures[place]]


def curves(figures):
    """{work: {contender: [(size, ns)]}}"""
    result = {}
    for (_, work), by_contender in figures.items():
        if not work.startswith("growth: "):
            continue
        for contender, figure in by_contender.items():
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
