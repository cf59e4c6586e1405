#!/usr/bin/env python3
"""Pictures a second by number of workers, from the times that bench_wavefront has measured.

Goes through every picture as src/encoder/Wavefront.cpp does: rows are claimed in ascending order by
whoever is free; a macroblock waits for the one above and two to the right of it, or near the end
for the whole row above; a row ends with the appending of its bits, the last one with the filter of
its macroblocks. Half-sample rows are built by the first macroblock that needs them, under a lock.
Workers other than the first start late, and hold up nobody when nothing is left by then. One worker
neither waits nor appends.

What is simulated: that order alone. Each step lasts as long as it did on one thread, so the
simulation knows nothing of processors that share caches, memory and a clock, nor of threads that
have to wait for a processor.

Prints a Markdown table; with --limits a second one, which says what more workers would gain if one
thing cost nothing; --svg writes a plot.
"""

import argparse
import csv
import heapq
import pathlib
import statistics
import sys
from dataclasses import dataclass, field

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent))

import svg
from markdown import table

LEAD = 3  # Wavefront.cpp: kLead
BORDER = 29  # half-sample rows above the picture


@dataclass
class Picture:
    """Times in microseconds; rows from the top, macroblocks from the left."""
    inter: bool = False
    before: float = 0
    after: float = 0
    last_filter: float = 0
    half_row: float = 0  # one row of the half-sample planes
    begin: list = field(default_factory=list)
    append: list = field(default_factory=list)
    steps: list = field(default_factory=list)
    needs: list = field(default_factory=list)
    measured: dict = field(default_factory=dict)

    def one_worker(self):
        """Microseconds for the picture."""
        half = self.half_row * (max(map(max, self.needs)) + BORDER) if self.inter else 0
        return (self.before + sum(self.begin) + sum(map(sum, self.steps)) + half +
                self.last_filter + self.after)


def read(name, column):
    """The pictures of a file of bench_wavefront."""
    pictures = []
    half = {}
    with open(name, newline="", encoding="ascii") as file:
        for line in csv.DictReader(file):
            index, part = int(line["picture"]), line["part"]
            time = float(line[column]) / 1000
            while len(pictures) <= index:
                pictures.append(Picture())
            picture = pictures[index]
            picture.inter = line["type"] == "P"
            if part in ("before", "after"):
                setattr(picture, part, time)
            elif part == "begin":
                picture.begin.append(time)
                picture.steps.append([])
                picture.needs.append([])
            elif part == "step":
                picture.steps[-1].append(time)
                picture.needs[-1].append(int(line["detail"]))
            elif part == "append":
                picture.append.append(time)
            elif part == "filter":
                picture.last_filter = time
            elif part == "half":
                total, rows = half.get(index, (0, 0))
                half[index] = (total + time, rows + int(line["detail"]))
            else:
                picture.measured[part] = time
    for index, (total, rows) in half.items():
        pictures[index].half_row = total / rows
    return pictures


class HalfRows:
    """The half-sample planes of a picture, which grow under a lock."""

    def __init__(self, row_time):
        self.row_time = row_time
        self.end = -BORDER      # where they end when the last builder is done
        self.earlier_end = -BORDER  # and until then
        self.done = 0.0         # when it is

    def ready(self, now, needs):
        """When a worker that needs rows up to `needs` can go on. Called in the order of time."""
        if needs <= (self.end if now >= self.done else self.earlier_end):
            return now
        now = max(now, self.done)
        if needs > self.end:
            now += (needs - self.end) * self.row_time
            self.earlier_end, self.end, self.done = self.end, needs, now
        return now


def several_workers(picture, workers, start_up, lead=LEAD, rows_ahead=False):
    """Microseconds for the slice data of a picture.

    rows_ahead: a worker that has claimed a row builds what that needs of the half-sample planes
    before it waits for the row above.
    """
    height, width = len(picture.steps), len(picture.steps[0])
    workers = min(workers, height)
    half_rows = HalfRows(picture.half_row)
    done = [[None] * width for _ in range(height)]
    # What happens next, by time: a worker claims a row (column -1), or a macroblock starts.
    events = [(0.0 if worker == 0 else start_up, worker, -1, -1) for worker in range(workers)]
    waiting = {}  # by (row, column) that is waited for
    next_row = 0
    end = 0.0

    def schedule(time, worker, row, column):
        if row > 0:
            above = (row - 1, min(column + lead, width) - 1)
            other = done[above[0]][above[1]]
            if other is None:
                waiting[above] = (time, worker, row, column)
                return
            time = max(time, other)
        heapq.heappush(events, (time, worker, row, column))

    heapq.heapify(events)
    while events:
        time, worker, row, column = heapq.heappop(events)
        if column < 0:
            if next_row < height:
                time += picture.begin[next_row]
                if picture.inter and rows_ahead:
                    time = half_rows.ready(time, max(picture.needs[next_row]))
                schedule(time, worker, next_row, 0)
                next_row += 1
            continue
        if picture.inter:
            time = half_rows.ready(time, picture.needs[row][column])
        time += picture.steps[row][column]
        if column == width - 1:
            time += picture.append[row]
            if row == height - 1:
                time += picture.last_filter
        done[row][column] = end = time
        if (row, column) in waiting:
            schedule(*waiting.pop((row, column)))
        if column < width - 1:
            schedule(time, worker, row, column + 1)
        else:
            heapq.heappush(events, (time, worker, -1, -1))
    return end


def picture_time(picture, workers, start_up, **rules):
    if workers == 1:
        return picture.one_worker()
    return picture.before + several_workers(picture, workers, start_up, **rules) + picture.after


def gain(pictures, workers, start_up, **rules):
    """Pictures a second over those of one worker."""
    one = sum(picture.one_worker() for picture in pictures)
    return one / sum(picture_time(picture, workers, start_up, **rules) for picture in pictures)


def changed(pictures, change):
    """The pictures with the fields that change(picture) gives."""
    return [Picture(**{**vars(picture), **change(picture)}) for picture in pictures]


def even_steps(picture):
    """Every macroblock of a picture lasts as long as their mean."""
    width = len(picture.steps[0])
    mean = sum(map(sum, picture.steps)) / (width * len(picture.steps))
    return {"steps": [[mean] * width for _ in picture.steps]}


def gains_table(films, counts, start_up):
    rows = []
    for name, pictures in films.items():
        one = sum(picture.one_worker() for picture in pictures) / len(pictures)
        rows.append([name, f"{one / 1000:.2f} ms"] +
                    [f"{gain(pictures, count, start_up):.2f}" for count in counts if count > 1])
    return table(["size", "one worker"] + [f"{count} workers" for count in counts if count > 1],
                 rows)


def limits_table(films, workers, start_up):
    """What the most workers would gain if one thing were otherwise, for one worker as well."""
    rows = []
    for name, pictures in films.items():
        serial = sum(p.before + p.after for p in pictures) / sum(p.one_worker() for p in pictures)
        no_serial_part = changed(pictures, lambda p: {"before": 0.0, "after": 0.0})
        no_half_rows = changed(pictures, lambda p: {"half_row": 0.0})
        no_appending = changed(pictures, lambda p: {"append": [0.0] * len(p.append)})
        gains = (
            gain(pictures, workers, start_up),
            gain(pictures, workers, 0.0),
            gain(no_serial_part, workers, start_up),
            gain(no_appending, workers, start_up),
            gain(changed(pictures, even_steps), workers, start_up),
            gain(pictures, workers, start_up, lead=1),
            gain(no_half_rows, workers, start_up),
            gain(pictures, workers, start_up, rows_ahead=True),
        )
        rows.append([name, f"{100 * serial:.1f} %"] + [f"{value:.2f}" for value in gains])
    return table(["size", "serial part", f"{workers} workers", "no start-up", "no serial part",
                  "no appending", "macroblocks all alike", "a lead of 1", "no half-sample rows",
                  "half-sample rows before waiting"], rows)


def checks_table(films):
    """The simulation against what bench_wavefront measured of whole pictures on two workers."""
    rows = []
    for name, pictures in films.items():
        def measured(part, of):
            return sum(p.before + p.measured[part] + p.after for p in of)
        start = statistics.median(p.measured["start"] for p in pictures)
        gains = [measured("one", [p]) / measured("several", [p]) for p in pictures]
        rows.append([
            name, f"{sum(p.one_worker() for p in pictures) / measured('one', pictures):.3f}",
            f"{measured('one', pictures) / measured('several', pictures):.2f}",
            f"{min(gains):.2f} to {max(gains):.2f}", f"{gain(pictures, 2, start):.2f}",
            f"{start:.0f} us",
        ])
    return table(["size", "sum of parts / one worker", "two workers measured", "by picture",
                  "two workers simulated", "start of the second"], rows)


def plot(films, counts, start_up):
    """An SVG: gain by number of workers, which stand at equal distances."""
    gains = {name: [gain(pictures, count, start_up) for count in counts]
             for name, pictures in films.items()}
    top_gain = max(2, *(values[-1] for values in gains.values()))
    workers = svg.Axis("workers", 0, len(counts) - 1,
                       [(index, str(count)) for index, count in enumerate(counts)])
    panel = svg.Panel((60, 20, 510, 350), workers,
                      svg.Axis.linear("pictures a second, one worker = 1", 0, top_gain))
    panel.curve([(index, count) for index, count in enumerate(counts)
                 if count <= panel.y_axis.high])
    labels = []
    for series, (name, values) in enumerate(gains.items()):
        panel.curve(list(enumerate(values)), series % svg.SERIES)
        for index, value in enumerate(values):
            panel.mark(index, value, series % svg.SERIES)
        labels.append((values[-1], f"{name} ({values[-1]:.1f})", series % svg.SERIES))
    panel.labels_at_right(labels)
    return svg.drawing(640, 400, "Pictures a second over those of one worker", [panel])


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("files", nargs="+", metavar="FILE.csv",
                        help="what bench_wavefront printed; the name says the size")
    parser.add_argument("--workers", nargs="+", type=int, default=[1, 2, 4, 8, 16, 64],
                        metavar="N", help="(default 1 2 4 8 16 64)")
    parser.add_argument("--start-up", type=float, default=20, metavar="US",
                        help="microseconds until the other workers start (default 20)")
    parser.add_argument("--least", action="store_true",
                        help="the least times of all repetitions in place of their medians")
    parser.add_argument("--limits", action="store_true", help="what limits the most workers")
    parser.add_argument("--check", action="store_true",
                        help="the measured whole pictures beside the simulated ones; for files "
                        "that were measured with two workers")
    parser.add_argument("--svg", metavar="FILE", help="writes the plot")
    arguments = parser.parse_args()
    if min(arguments.workers) < 1 or len(arguments.workers) < 2:
        parser.error("--workers: at least two numbers from 1")
    column = "least_ns" if arguments.least else "median_ns"
    try:
        films = {pathlib.Path(name).stem: read(name, column) for name in arguments.files}
    except (OSError, KeyError, ValueError, IndexError) as error:
        sys.exit(f"simulate.py: {error!r}: not a file of bench_wavefront")
    counts = sorted(arguments.workers)
    print(gains_table(films, counts, arguments.start_up))
    if arguments.limits:
        print("\n" + limits_table(films, counts[-1], arguments.start_up))
    if arguments.check:
        print("\n" + checks_table(films))
    if arguments.svg:
        pathlib.Path(arguments.svg).write_text(plot(films, counts, arguments.start_up),
                                               encoding="ascii")


if __name__ == "__main__":
    main()
