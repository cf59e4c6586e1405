#!/usr/bin/env python3
"""The measure on curves whose answer is known."""

import math
import unittest

from bd_rate import Pchip, bd_rate

RATES = (100, 250, 600, 1500, 4000)


def decibels(rate, scale=1.0):
    """A curved rate-distortion function of rates: 25 dB at 50, flatter as it rises."""
    return 25 + 9 * math.log(rate * scale / 50) ** 0.8


class InterpolationTest(unittest.TestCase):
    def test_straight_lines_are_kept(self):
        line = Pchip([0.0, 1.0, 4.0, 5.0], [1.0, 3.0, 9.0, 11.0])
        self.assertAlmostEqual(line.integral(0.0, 5.0), 30.0)
        self.assertAlmostEqual(line.integral(0.5, 4.5), 24.0)
        self.assertAlmostEqual(Pchip([2.0, 3.0], [0.0, 2.0]).integral(2.25, 3.0), 0.9375)

    def test_slopes_at_given_points(self):
        # Weighted harmonic means inside; three-point parabolas at the ends, cut off where they
        # would turn.
        curve = Pchip([0.0, 1.0, 3.0, 4.0], [0.0, 1.0, 5.0, 5.5])
        for slope, known in zip(curve.slopes, (2 / 3, 9 / 7, 0.75, 0.0)):
            self.assertAlmostEqual(slope, known)

    def test_nothing_is_overshot(self):
        step = Pchip([0.0, 1.0, 2.0, 3.0], [0.0, 0.0, 1.0, 1.0])
        self.assertEqual(step.integral(0.0, 1.0), 0.0)
        self.assertAlmostEqual(step.integral(1.0, 2.0), 0.5)
        self.assertAlmostEqual(step.integral(2.0, 3.0), 1.0)


class BdRateTest(unittest.TestCase):
    def test_a_constant_share_of_bits(self):
        reference = [(rate, decibels(rate)) for rate in RATES]
        for share in (0.5, 0.9, 1.0, 1.25, 2.0):
            with self.subTest(share=share):
                # The same qualities, and qualities between them, which must be interpolated.
                same = [(rate * share, decibels(rate)) for rate in RATES]
                self.assertAlmostEqual(bd_rate(reference, same), share - 1)
                between = [(rate, decibels(rate, 1 / share)) for rate in RATES]
                self.assertAlmostEqual(bd_rate(reference, between), share - 1, delta=0.005)

    def test_a_share_that_changes_with_quality(self):
        # Twice the bits at 30 dB, half of them at 40 dB: the mean of the logarithms is 0.
        reference = [(100, 30), (1000, 40)]
        self.assertAlmostEqual(bd_rate(reference, [(200, 30), (500, 40)]), 0)
        # Only the upper half in common: from a factor of 1 to one of 1 / 2.
        self.assertAlmostEqual(bd_rate(reference, [(math.sqrt(100 * 1000), 35), (500, 40)]),
                               math.sqrt(0.5) - 1)

    def test_points_that_do_not_rise_count_once(self):
        reference = [(100, 30), (1000, 40)]
        self.assertAlmostEqual(bd_rate(reference, [(200, 30), (210, 29.9), (200, 30), (2000, 40)]),
                               1)

    def test_nothing_in_common(self):
        reference = [(100, 30), (1000, 40)]
        self.assertIsNone(bd_rate(reference, [(100, 41), (1000, 45)]))
        self.assertIsNone(bd_rate(reference, [(100, 35)]))
        self.assertIsNone(bd_rate(reference, []))


if __name__ == "__main__":
    unittest.main()
