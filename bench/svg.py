"""Plots as SVG for the documentation: readable on light and dark paper, no script, ASCII only."""

import math
import xml.sax.saxutils

SERIES = 9  # the kinds of marks that STYLE has colours for
SHAPES = ("circle", "square", "triangle", "diamond")

STYLE = """
  text { font: 13px sans-serif; fill: #333; }
  .axis { stroke: #333; } .grid { stroke: #ddd; } .level { stroke: #888; stroke-dasharray: 5 4; }
  .paper { fill: #fff; } .zone { fill: #c8553d; fill-opacity: 0.10; }
  .s0 { color: #1f6fb2; } .s1 { color: #c04a2f; } .s2 { color: #2f8250; } .s3 { color: #8a5bb0; }
  .s4 { color: #94701a; } .s5 { color: #0f7f8c; } .s6 { color: #b03a78; } .s7 { color: #5a6472; }
  .s8 { color: #6a7d1d; }
  text.label { fill: currentColor; }
  @media (prefers-color-scheme: dark) {
    text { fill: #ccc; } .paper { fill: #1c1c1c; } .zone { fill-opacity: 0.18; }
    .axis { stroke: #ccc; } .grid { stroke: #3a3a3a; } .level { stroke: #999; }
    .s0 { color: #6db3ee; } .s1 { color: #f08a6c; } .s2 { color: #6cc48d; }
    .s3 { color: #c39be6; } .s4 { color: #d9b44a; } .s5 { color: #4fc3d0; }
    .s6 { color: #e884b6; } .s7 { color: #a9b4c2; } .s8 { color: #b5ca5a; }
  }
"""


class Axis:
    """Values from `low`, at the left or at the bottom, to `high`; `ticks` are (value, label)."""

    def __init__(self, title, low, high, ticks, logarithmic=False):
        self.title, self.ticks, self.logarithmic = title, ticks, logarithmic
        self.low, self.high = low, high

    @classmethod
    def linear(cls, title, low, high):
        """With ticks at 1, 2 or 5 times a power of ten, the outermost at or beyond the values."""
        span = high - low or 1
        step = 10 ** math.floor(math.log10(span / 4))
        step *= next(factor for factor in (1, 2, 5, 10) if span / (step * factor) <= 6)
        first, last = math.floor(low / step + 1e-9), math.ceil(high / step - 1e-9)
        last = max(last, first + 1)
        ticks = [(index * step, f"{index * step:.10g}") for index in range(first, last + 1)]
        return cls(title, ticks[0][0], ticks[-1][0], ticks)

    @classmethod
    def logarithm(cls, title, low, high):
        """With ticks at 1, 2 and 5 times the powers of ten between."""
        low, high = low / 1.08, high * 1.08
        decades = range(math.floor(math.log10(low)), math.ceil(math.log10(high)) + 1)
        values = [factor * 10.0 ** decade for decade in decades for factor in (1, 2, 5)]
        inside = [value for value in values if low <= value <= high]
        if len(inside) < 4:
            inside = [round(factor * 10.0 ** decade, 9) for decade in decades
                      for factor in (1, 1.2, 1.5, 2, 2.5, 3, 4, 5, 6, 8)]
        return cls(title, low, high, [(value, f"{value:.10g}") for value in inside
                                      if low <= value <= high], logarithmic=True)

    def reversed(self):
        return Axis(self.title, self.high, self.low, self.ticks, self.logarithmic)

    def at(self, value):
        """Where a value stands: 0 at `low`, 1 at `high`."""
        scale = math.log if self.logarithmic else float
        return (scale(value) - scale(self.low)) / (scale(self.high) - scale(self.low))


def text(x, y, content, **attributes):
    names = {"kind": "class", "anchor": "text-anchor"}
    written = "".join(f' {names.get(name, name)}="{value}"' for name, value in attributes.items())
    return f'<text x="{x:.1f}" y="{y:.1f}"{written}>{xml.sax.saxutils.escape(content)}</text>'


class Panel:
    """One pair of axes, `box` = (left, top, right, bottom) of the area between them."""

    def __init__(self, box, x_axis, y_axis, title=""):
        self.left, self.top, self.right, self.bottom = box
        self.x_axis, self.y_axis = x_axis, y_axis
        self.lines = []
        for value, label in y_axis.ticks:
            self.level(value, "grid")
            self.lines.append(text(self.left - 10, self.y(value) + 4, label, anchor="end"))
        for value, label in x_axis.ticks:
            self.lines.append(text(self.x(value), self.bottom + 20, label, anchor="middle"))
        left, right = f'x1="{self.left}"', f'x2="{self.right}"'
        self.lines += [
            f'<line class="axis" {left} y1="{self.bottom}" {right} y2="{self.bottom}"/>',
            f'<line class="axis" {left} y1="{self.top}" x2="{self.left}" y2="{self.bottom}"/>',
            text((self.left + self.right) / 2, self.bottom + 40, x_axis.title, anchor="middle"),
            text(0, 0, y_axis.title, anchor="middle", transform=f"translate({self.left - 42} "
                 f"{(self.top + self.bottom) / 2:.1f}) rotate(-90)"),
            text((self.left + self.right) / 2, self.top - 10, title, anchor="middle"),
        ]

    def x(self, value):
        return self.left + (self.right - self.left) * self.x_axis.at(value)

    def y(self, value):
        return self.bottom - (self.bottom - self.top) * self.y_axis.at(value)

    def level(self, value, kind="level"):
        """A line across, at a value of the y axis."""
        self.lines.append(f'<line class="{kind}" x1="{self.left}" y1="{self.y(value):.1f}" '
                          f'x2="{self.right}" y2="{self.y(value):.1f}"/>')

    def upright(self, value):
        """A line at a value of the x axis."""
        self.lines.append(f'<line class="level" x1="{self.x(value):.1f}" y1="{self.top}" '
                          f'x2="{self.x(value):.1f}" y2="{self.bottom}"/>')

    def upper_right(self, x, y, note):
        """Tints what is right of and above a point, and writes there what that is."""
        self.lines.append(f'<rect class="zone" x="{self.x(x):.1f}" y="{self.top}" '
                          f'width="{self.right - self.x(x):.1f}" '
                          f'height="{self.y(y) - self.top:.1f}"/>')
        self.lines.append(text((self.x(x) + self.right) / 2, self.top + 16, note, anchor="middle"))

    def curve(self, points, series=None):
        """A line through points (x, y); without a series dashed and grey."""
        written = " ".join(f"{self.x(x):.1f},{self.y(y):.1f}" for x, y in points)
        look = ('class="level"' if series is None else
                f'class="s{series}" stroke="currentColor" stroke-width="2"')
        self.lines.append(f'<polyline {look} fill="none" points="{written}"/>')

    def mark(self, x, y, series, note=""):
        self.lines.append(mark(self.x(x), self.y(y), series, note))

    def labels_at_right(self, entries):
        """Labels (y, text, series) beside the right edge, moved down where they would overlap."""
        last = -math.inf
        for place, label, series in sorted((self.y(y), label, series)
                                           for y, label, series in entries):
            last = max(place, last + 16)
            self.lines.append(text(self.right + 8, last + 4, label, kind=f"label s{series}"))

    def labels_beside(self, entries):
        """Labels (x, y, text, series) beside points: where fewest other labels and points are."""
        points = [(self.x(x), self.y(y)) for x, y, _, _ in entries]
        taken = [(x - 5, y - 5, x + 5, y + 5) for x, y in points]
        for (x, y), (_, _, label, series) in zip(points, entries):
            width = 7 * len(label)
            places = [(x + 7, y - 6), (x + 9, y + 4), (x - 9 - width, y + 4),
                      (x - width / 2, y - 10), (x - width / 2, y + 20), (x + 9, y + 20)]
            boxes = [(a, b - 11, a + width, b + 3) for a, b in places]
            costs = [sum(overlap(box, other) for other in taken) + self.outside(box)
                     for box in boxes]
            best = costs.index(min(costs))
            taken.append(boxes[best])
            self.lines.append(text(*places[best], label, kind=f"label s{series}"))

    def outside(self, box):
        """Square pixels of a box beyond the axes."""
        inside = overlap(box, (self.left, self.top, self.right, self.bottom))
        return (box[2] - box[0]) * (box[3] - box[1]) - inside


def overlap(a, b):
    """Square pixels that two boxes (left, top, right, bottom) share."""
    width = min(a[2], b[2]) - max(a[0], b[0])
    height = min(a[3], b[3]) - max(a[1], b[1])
    return max(width, 0) * max(height, 0)


def mark(x, y, series, note=""):
    """A mark at a place of the drawing; colour and shape by series, `note` for the pointer."""
    shape = SHAPES[series % len(SHAPES)]
    if shape == "circle":
        tag = f'circle cx="{x:.1f}" cy="{y:.1f}" r="4"'
    else:
        corners = {"square": ((-3.5, -3.5), (3.5, -3.5), (3.5, 3.5), (-3.5, 3.5)),
                   "triangle": ((0, -5), (4.5, 3.5), (-4.5, 3.5)),
                   "diamond": ((0, -5), (5, 0), (0, 5), (-5, 0))}[shape]
        points = " ".join(f"{x + dx:.1f},{y + dy:.1f}" for dx, dy in corners)
        tag = f'polygon points="{points}"'
    title = f"<title>{xml.sax.saxutils.escape(note)}</title>" if note else ""
    name = shape if shape == "circle" else "polygon"
    return f'<{tag} class="s{series}" fill="currentColor">{title}</{name}>'


def legend(x, y, entries):
    """Lines of the drawing: a mark and a text for each (text, series), one below the other."""
    lines = []
    for index, (label, series) in enumerate(entries):
        lines.append(mark(x, y + 20 * index - 4, series))
        lines.append(text(x + 12, y + 20 * index, label))
    return lines


def drawing(width, height, title, panels, lines=()):
    """The whole file: panels, then further lines."""
    head = [f'<svg xmlns="http://www.w3.org/2000/svg" viewBox="0 0 {width} {height}" role="img">',
            f"<title>{xml.sax.saxutils.escape(title)}</title>", f"<style>{STYLE}</style>",
            f'<rect class="paper" width="{width}" height="{height}"/>']
    body = [line for panel in panels for line in panel.lines]
    return "\n".join([*head, *body, *lines, "</svg>", ""])
