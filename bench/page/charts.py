"""The charts of the page, as SVG: bars of the ratios, curves of the growth. Both scales are logarithmic."""

import math
from html import escape

GOOD, BAD, INK, FAINT, PAPER = "#2a7f62", "#c4622d", "#222222", "#d8d8d8", "#ffffff"
COLOURS = {"kel": GOOD, "limit": "#888888"}
PEER_COLOURS = ["#3465a4", "#b5338a", "#c4622d"]


class Svg:
    def __init__(self, width, height):
        self._parts = [f'<svg xmlns="http://www.w3.org/2000/svg" viewBox="0 0 {width} {height}" width="{width}" '
                       f'height="{height}" font-family="sans-serif" font-size="12">']
        self.box(0, 0, width, height, PAPER)

    def box(self, x, y, width, height, colour):
        self._parts.append(f'<rect x="{x:.1f}" y="{y:.1f}" width="{width:.1f}" height="{height:.1f}" fill="{colour}"/>')

    def line(self, points, colour, width=1.0):
        path = " ".join(f"{x:.1f},{y:.1f}" for x, y in points)
        self._parts.append(f'<polyline points="{path}" fill="none" stroke="{colour}" stroke-width="{width}"/>')

    def text(self, x, y, text, anchor="start", colour=INK, weight="normal"):
        self._parts.append(f'<text x="{x:.1f}" y="{y:.1f}" text-anchor="{anchor}" fill="{colour}" '
                           f'font-weight="{weight}">{escape(text)}</text>')

    def __str__(self):
        return "\n".join(self._parts + ["</svg>", ""])


class Scale:
    """Places numbers between two ends by their logarithm."""

    def __init__(self, low, high, start, end):
        self._low, self._span = math.log10(low), math.log10(high) - math.log10(low)
        self._start, self._length = start, end - start

    def __call__(self, number):
        return self._start + (math.log10(number) - self._low) / self._span * self._length


def decades(low, high):
    """The powers of ten from the one at or below `low` to the one at or above `high`."""
    return [10.0 ** e for e in range(math.floor(math.log10(low)), math.ceil(math.log10(high)) + 1)]


def bars(rows, title):
    """A bar for each (name, peer, ratio): to the left the library is faster, to the right the peer."""
    row, top, left, width = 20, 60, 300, 940
    chart = Svg(width, top + row * len(rows) + 20)
    ends = decades(min(r for _, _, r in rows), max(r for _, _, r in rows))
    scale = Scale(ends[0], max(ends[-1], 10), left, width - 200)
    bottom = top + row * len(rows)
    chart.text(20, 22, title, weight="bold")
    for mark in ends:
        chart.line([(scale(mark), top - 4), (scale(mark), bottom)], FAINT)
        chart.text(scale(mark), top - 10, f"{mark:g}", "middle")
    for i, (name, peer, ratio) in enumerate(rows):
        y = top + i * row
        x, one = scale(ratio), scale(1)
        chart.text(left - 8, y + 14, name, "end")
        chart.box(min(x, one), y + 3, max(abs(x - one), 1), row - 6, GOOD if ratio <= 1 else BAD)
        chart.text(max(x, one) + 6, y + 14, f"{ratio:.2f}  {peer}")
    chart.line([(scale(1), top - 4), (scale(1), bottom)], INK, 1.5)
    return str(chart)


def _time(ns):
    for unit, size in (("s", 1e9), ("ms", 1e6), ("µs", 1e3)):
        if ns >= size:
            return f"{ns / size:g} {unit}"
    return f"{ns:g} ns"


def _size(n):
    return f"{n // 1000000}M" if n >= 1000000 else f"{n // 1000}k" if n >= 1000 else str(n)


def _panel(chart, x, y, width, height, name, lines):
    """One plot of nanoseconds against size."""
    sizes = [size for points in lines.values() for size, _ in points]
    times = [ns for points in lines.values() for _, ns in points]
    marks = decades(min(times), max(times))
    if len(marks) == 1:
        marks.append(marks[0] * 10)
    across = Scale(min(sizes), max(sizes), x + 60, x + width - 20)
    up = Scale(marks[0], marks[-1], y + height - 40, y + 50)
    chart.text(x + 10, y + 20, name, weight="bold")
    for mark in marks:
        chart.line([(x + 60, up(mark)), (x + width - 20, up(mark))], FAINT)
        chart.text(x + 54, up(mark) + 4, _time(mark), "end")
    for size in sorted(set(sizes))[::2]:
        chart.text(across(size), y + height - 22, _size(size), "middle")
    peers = [who for who in lines if who not in COLOURS]
    key = x + 60
    for who, points in lines.items():
        colour = COLOURS.get(who) or PEER_COLOURS[peers.index(who) % len(PEER_COLOURS)]
        chart.line([(across(size), up(ns)) for size, ns in points], colour, 2)
        chart.text(key, y + 38, who, colour=colour)
        key += 7 * len(who) + 16


def growth(curves, title):
    """Two plots a row."""
    width, height = 470, 280
    chart = Svg(2 * width, 40 + height * ((len(curves) + 1) // 2))
    chart.text(20, 22, title, weight="bold")
    for i, (name, lines) in enumerate(curves.items()):
        _panel(chart, i % 2 * width, 40 + i // 2 * height, width, height, name, lines)
    return str(chart)
