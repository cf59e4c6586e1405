"""How many more bits one encoder needs than another for the same quality.

The Bjontegaard measure: the logarithm of the rate as a function of quality, interpolated between
the measured points, averaged over the qualities that both reach.
"""

import math


class Pchip:
    """A piecewise cubic through points that overshoots none of them (Fritsch and Carlson, slopes
    by Fritsch and Butland)."""

    def __init__(self, xs, ys):
        """Two points or more, xs strictly ascending."""
        self.xs, self.ys = xs, ys
        self.widths = [b - a for a, b in zip(xs, xs[1:])]
        rises = [(b - a) / width for a, b, width in zip(ys, ys[1:], self.widths)]
        self.slopes = [self._end(self.widths, rises)]
        for index in range(1, len(xs) - 1):
            self.slopes.append(self._inner(self.widths[index - 1:index + 1],
                                           rises[index - 1:index + 1]))
        self.slopes.append(self._end(self.widths[::-1], rises[::-1]))

    @staticmethod
    def _inner(widths, rises):
        if rises[0] * rises[1] <= 0:
            return 0.0
        left, right = 2 * widths[1] + widths[0], widths[1] + 2 * widths[0]
        return (left + right) / (left / rises[0] + right / rises[1])

    @staticmethod
    def _end(widths, rises):
        """The slope at the first point: of a parabola through three, kept monotone."""
        if len(rises) == 1:
            return rises[0]
        slope = ((2 * widths[0] + widths[1]) * rises[0] - widths[0] * rises[1]) / sum(widths[:2])
        if slope * rises[0] <= 0:
            return 0.0
        if rises[0] * rises[1] < 0 and abs(slope) > 3 * abs(rises[0]):
            return 3 * rises[0]
        return slope

    def integral(self, low, high):
        """From low to high, both within the points."""
        total = 0.0
        for index, width in enumerate(self.widths):
            start = max(low, self.xs[index])
            end = min(high, self.xs[index + 1])
            if start < end:
                at = [(x - self.xs[index]) / width for x in (start, end)]
                total += width * (self._area(index, at[1]) - self._area(index, at[0]))
        return total

    def _area(self, index, t):
        """From the start of a piece to the share t of its width, over the width."""
        width = self.widths[index]
        return (self.ys[index] * (t - t ** 3 + t ** 4 / 2) +
                self.ys[index + 1] * (t ** 3 - t ** 4 / 2) +
                width * self.slopes[index] * (t ** 2 / 2 - 2 * t ** 3 / 3 + t ** 4 / 4) +
                width * self.slopes[index + 1] * (t ** 4 / 4 - t ** 3 / 3))


def rising(points):
    """Points (rate, quality) by rate, without those that a lower rate equals or beats: rate control
    may miss low targets, so that two targets give about one point."""
    kept = []
    for rate, quality in sorted(points):
        if not kept or (rate > kept[-1][0] and quality > kept[-1][1]):
            kept.append((rate, quality))
    return kept


def bd_rate(reference, other):
    """The mean of the bits that `other` takes over those of `reference` at equal quality, less 1:
    0.1 for a tenth more. Points are (rate above 0, quality). None where the two have fewer than two
    rising points or reach no quality in common."""
    curves = []
    for points in (rising(reference), rising(other)):
        if len(points) < 2:
            return None
        curves.append(Pchip([quality for _, quality in points],
                            [math.log(rate) for rate, _ in points]))
    low = max(curve.xs[0] for curve in curves)
    high = min(curve.xs[-1] for curve in curves)
    if low >= high:
        return None
    mean = (curves[1].integral(low, high) - curves[0].integral(low, high)) / (high - low)
    return math.exp(mean) - 1
