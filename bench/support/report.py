#!/usr/bin/env python3
"""Runs the benchmark programs in interleaved rounds and prints one table.

Every measurement is run in rounds: ours, the first peer, the second, …, ours
again. Each run is a process of its own with a time limit; its result is the
lines "key value" on its standard output.
"""

import argparse
import os
import shutil
import signal
import statistics
import subprocess
import sys
import tempfile
from dataclasses import replace
from pathlib import Path

import suites

TIME_LIMIT_S = 120
BEGIN, END = "<!-- bench/run: begin -->", "<!-- bench/run: end -->"


def run_program(programs, cell, folder):
    """The values that the cell's program prints. Raises RuntimeError when it fails."""
    command = [str((cell.folder or programs) / cell.program), *cell.arguments]
    # A session of its own: what the program starts ends with it.
    process = subprocess.Popen(command, stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True,
                               env={**os.environ, "TMPDIR": folder}, start_new_session=True)
    try:
        output, errors = process.communicate(timeout=TIME_LIMIT_S)
    except BaseException as reason:
        os.killpg(process.pid, signal.SIGKILL)
        process.communicate()
        if isinstance(reason, subprocess.TimeoutExpired):
            raise RuntimeError(f"{' '.join(command)}: no result after {TIME_LIMIT_S} s") from None
        raise
    if process.returncode != 0:
        raise RuntimeError(f"{' '.join(command)}: status {process.returncode}\n{errors}")
    return dict(line.split() for line in output.splitlines())


def progress(text):
    """Shows `text` in place of the last one, to a person who waits."""
    if sys.stderr.isatty():
        print(f"\r\033[K{text}", end="", file=sys.stderr, flush=True)


def measure(measurement, rounds, run):
    """A list of values for each peer."""
    values = {peer: [] for peer in measurement.cells}
    for number in range(min(rounds, measurement.most_rounds or rounds)):
        for peer, cell in measurement.cells.items():
            progress(f"{measurement.title}: round {number + 1}, {peer}")
            values[peer].append(float(run(number, cell)[cell.key]) * cell.scale)
    progress("")
    return values


def judge(bar, measurement, medians):
    """The verdict on one bar: "ok" or by what factor it was missed."""
    best = max if measurement.big_is_good else min
    rival = best(medians[peer] for peer in bar.peers) if bar.peers else 1.0
    ratio = medians[suites.OURS] / rival
    missed = bar.limit / ratio if measurement.big_is_good else ratio / bar.limit
    return "ok" if missed <= 1.0 else f"MISSED by {missed:.2f}x"


def shown(value):
    return f"{value:,.0f}" if value >= 100 else f"{value:.3g}"


def rows_of(measurement, values):
    """Table rows: what, peer, median, spread, ours/peer, bar."""
    medians = {peer: statistics.median(list_of) for peer, list_of in values.items()}
    for peer, measured in values.items():
        bars = [f"{bar.text}: {judge(bar, measurement, medians)}"
                for bar in measurement.bars if (bar.peers or (suites.OURS,))[-1] == peer]
        yield (f"{measurement.title}, {measurement.unit}" if peer == suites.OURS else "", peer,
               shown(medians[peer]), f"{shown(min(measured))} – {shown(max(measured))}",
               "" if peer == suites.OURS else f"{medians[suites.OURS] / medians[peer]:.2f}", "; ".join(bars))


HEAD = ("measurement", "peer", "median", "min – max", "ours/peer", "bar")
RIGHT = (False, False, True, True, True, False)


def table(rows):
    """Aligned columns that are a markdown table as well."""
    rows = [HEAD, *rows]
    widths = [max(len(row[i]) for row in rows) for i in range(len(HEAD))]

    def line(row):
        cells = (text.rjust(width) if right else text.ljust(width)
                 for text, width, right in zip(row, widths, RIGHT))
        return "| " + " | ".join(cells) + " |"

    rule = "|" + "|".join("-" * (width + 1) + (":" if right else "-") for width, right in zip(widths, RIGHT)) + "|"
    return "\n".join([line(rows[0]), rule, *map(line, rows[1:])]) + "\n"


def write_markdown(file, text):
    """The table as a file, or in place of the one between a file's marks."""
    if file.exists() and BEGIN in (old := file.read_text(encoding="utf-8")):
        head, rest = old.split(BEGIN, 1)
        text = f"{head}{BEGIN}\n{text}{END}{rest.split(END, 1)[1]}"
    file.write_text(text, encoding="utf-8")


def against(measurement, revision, folder):
    """Ours, and ours of the older revision whose programs are in `folder`."""
    ours = measurement.cells[suites.OURS]
    cells = {suites.OURS: ours, f"Pelorin {revision}": replace(ours, folder=folder)}
    return replace(measurement, cells=cells, bars=())


def arguments():
    parser = argparse.ArgumentParser(prog="bench/run")
    parser.add_argument("suites", nargs="*", metavar="suite", help=", ".join(suites.SUITES))
    parser.add_argument("--programs", type=Path, required=True, help=argparse.SUPPRESS)
    parser.add_argument("--older", type=Path, help=argparse.SUPPRESS)
    parser.add_argument("--against", metavar="REVISION", help="our own build of it in place of all peers")
    parser.add_argument("--quick", action="store_true", help="2 rounds instead of 5")
    parser.add_argument("--rounds", type=int)
    parser.add_argument("--only", default="", help="only measurements whose title contains this")
    parser.add_argument("--markdown", type=Path, help="write the table there as well")
    parsed = parser.parse_args()
    for name in parsed.suites:
        if name not in suites.SUITES:
            parser.error(f"no suite {name!r}; there are {', '.join(suites.SUITES)}")
    return parsed


def main():
    options = arguments()
    rounds = options.rounds or (2 if options.quick else 5)
    chosen = [m for name in options.suites or suites.SUITES for m in suites.SUITES[name]()
              if options.only in m.title]
    if options.older:
        chosen = [against(m, options.against, options.older) for m in chosen]
    folder = tempfile.mkdtemp(prefix="pelorin-bench-")
    rows, failures, runs = [], [], {}

    def run(number, cell):
        """What one run printed serves all measurements that read it."""
        key = (number, cell.folder, cell.program, cell.arguments)
        if key not in runs:
            runs[key] = run_program(options.programs, cell, folder)
        return runs[key]

    try:
        for measurement in chosen:
            try:
                rows += rows_of(measurement, measure(measurement, rounds, run))
            except (RuntimeError, KeyError, ValueError, OSError) as reason:
                failures.append(f"{measurement.title}: {reason}")
    finally:
        shutil.rmtree(folder, ignore_errors=True)
    text = table(rows)
    print(text, end="")
    print(f"{rounds} interleaved rounds; ours/peer is the ratio of the medians.")
    if options.markdown:
        write_markdown(options.markdown, text)
    for failure in failures:
        print(f"bench/run: {failure}", file=sys.stderr)
    return 1 if failures or not rows else 0


if __name__ == "__main__":
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(143))
    sys.exit(main())
