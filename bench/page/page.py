#!/usr/bin/env python3
"""Makes the page of the bench, and its charts, from the results of its programs.

    page.py BITS FOLDER TOPIC...            prints the table
    page.py BITS FOLDER --write TOPIC...    also writes docs/performance*.{md,svg}

FOLDER is the build's: results/TOPIC.*.json, bench/peers.txt and machine.txt are read from there. scripts/bench
calls it.
"""

import glob
import os
import sys

import charts
import figures
import profile

TOP = os.path.join(os.path.dirname(__file__), "..", "..")
NEAR = 1.05  # what two runs of the same thing differ by: no reason is asked for


def duration(figure):
    if figure is None:
        return "-"
    ns, unit = figure.ns, "ns"
    for larger, size in (("µs", 1e3), ("ms", 1e3)):
        if ns >= 1000:
            ns, unit = ns / size, larger
    return f"{ns:.{2 if ns < 10 else 1 if ns < 100 else 0}f} {unit}"


def share(number):
    return "-" if number is None else f"{number:.2f}"


def goal_text(work):
    if work.goal is None:
        return "-"
    reached = figures.ratio(work, work.goal.peer)
    if reached is None:
        return f"at most {work.goal.most:g} of {work.goal.peer}: absent"
    verdict = "met" if reached <= work.goal.most else "missed"
    digits = 3 if round(reached, 2) == work.goal.most else 2
    return f"at most {work.goal.most:g} of {work.goal.peer}: {reached:.{digits}f}, {verdict}"


def is_missed(work):
    reached = work.goal and figures.ratio(work, work.goal.peer)
    return bool(reached) and reached > work.goal.most


def is_behind(work):
    peer = figures.best_peer(work)
    return peer is not None and figures.ratio(work, peer) > NEAR


def row(work):
    peer = figures.best_peer(work)
    spread = max(figure.spread for figure in work.figures.values())
    return [work.name, duration(work.figures.get(figures.LIMIT)),
            f"{duration(work.figures[peer])} ({peer})" if peer else "-", duration(work.figures[figures.KEL]),
            share(figures.ratio(work, figures.LIMIT)), share(peer and figures.ratio(work, peer)), goal_text(work),
            f"{100 * spread:.0f} %"]


HEAD = ["work", "limit", "best peer (which)", "KEL", "KEL/limit", "KEL/best peer", "goal", "spread"]


def plain_table(works):
    rows = [HEAD] + [row(work) for work in works]
    widths = [max(len(cells[i]) for cells in rows) for i in range(len(HEAD))]
    return "\n".join("  ".join(cell.ljust(width) for cell, width in zip(cells, widths)).rstrip() for cells in rows)


def marked_table(works):
    rows = [HEAD, ["---"] * len(HEAD)] + [row(work) for work in works]
    return "\n".join("| " + " | ".join(cells) + " |" for cells in rows)


def unexplained(works, why):
    return [work for work in works if (is_behind(work) or is_missed(work)) and work.name not in why]


def reason_list(works, why):
    lines = []
    for work in works:
        if not (is_behind(work) or is_missed(work)):
            continue
        kind = "goal missed" if is_missed(work) else f"{figures.best_peer(work)} is ahead"
        lines.append(f"- **{work.name}** ({kind}): {why.get(work.name, 'no reason is known yet.')}")
    return "\n".join(lines) if lines else "None: the library is ahead or level everywhere."


def profile_list(works, folder):
    if not profile.is_possible():
        return "perf was not installed."
    lines = []
    for work in works:
        if is_missed(work):
            closest = figures.least_ratio(work, work.goal.peer)
            where = profile.profile(folder, work.topic, work.name)
            lines.append(f"- **{work.name}** (at most {work.goal.most:g}; closest {closest:.2f}): {where}.")
    return "\n".join(lines) if lines else "No goal is missed."


def summary(works):
    asked = [work for work in works if work.goal and figures.ratio(work, work.goal.peer) is not None]
    missed = [work.name for work in asked if is_missed(work)]
    text = f"{len(asked) - len(missed)} of {len(asked)} goals are met"
    return text + (f"; missed: {', '.join(missed)}." if missed else ".")


def quietness(works):
    quiet, taken = sum(work.line.quiet for work in works), sum(work.line.taken for work in works)
    text = f"In this run {quiet:,} of {taken:,} repetitions were undisturbed."
    short = [work.name for work in works if not work.line.is_quiet]
    return text + (f" Too few were in these lines, of which all count: {', '.join(short)}." if short else "")


def page(bits, works, curves, folder, suffix):
    template = open(os.path.join(TOP, "bench", "page", "page.md.in"), encoding="utf-8").read()
    why = figures.reasons(os.path.join(TOP, "bench", "reasons.txt"))
    return template.format(
        width="32-bit x86" if bits == "32" else "x86-64", option="" if bits == "32" else " --x86_64",
        suffix=suffix, summary=summary(works), quiet=quietness(works), table=marked_table(works),
        reasons=reason_list(works, why), profiles=profile_list(works, folder),
        machine=open(os.path.join(folder, "machine.txt"), encoding="utf-8").read().strip(),
        curves=", ".join(sorted({name.split(",")[0] for name in curves})))


def write(name, text):
    with open(os.path.join(TOP, "docs", name), "w", encoding="utf-8") as file:
        file.write(text)
    print(f"bench: wrote docs/{name}")


def main(bits, folder, *topics):
    writes = "--write" in topics
    topics = [topic for topic in topics if topic != "--write"]
    files = [(topic, file) for topic in topics
             for file in sorted(glob.glob(os.path.join(folder, "results", topic + ".*.json")))]
    measured = figures.read(files)
    works = figures.works(measured, figures.goals(os.path.join(TOP, "bench", "goals.txt")))
    print(plain_table(works))
    print(f"\n{summary(works)} {quietness(works)}")
    why = figures.reasons(os.path.join(TOP, "bench", "reasons.txt"))
    for work in unexplained(works, why):
        print(f"bench: bench/reasons.txt does not say why \"{work.name}\" is behind")
    if not writes:
        return
    curves = figures.curves(measured)
    suffix = "" if bits == "32" else "-x86_64"
    rows = [(work.name, peer, figures.ratio(work, peer)) for work in works
            for peer in [work.goal.peer if work.goal and work.goal.peer in work.figures else figures.best_peer(work)]
            if peer]
    write(f"performance{suffix}.svg", charts.bars(rows, "The library's time over the peer's: below 1 the library is faster"))
    write(f"performance-growth{suffix}.svg", charts.growth(curves, "Cost of one operation against the number of things"))
    write(f"performance{suffix}.md", page(bits, works, curves, folder, suffix))


if __name__ == "__main__":
    main(*sys.argv[1:])
