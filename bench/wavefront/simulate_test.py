#!/usr/bin/env python3
"""The simulator on pictures whose times can be told by hand."""

import unittest

from simulate import BORDER, Picture, gain, picture_time


def even(width, height, **fields):
    """Macroblocks of a microsecond each, and nothing else."""
    picture = Picture(begin=[0.0] * height, append=[0.0] * height,
                      steps=[[1.0] * width for _ in range(height)],
                      needs=[[16 * row + 17] * width for row in range(height)])
    for name, value in fields.items():
        setattr(picture, name, value)
    return picture


class Simulate(unittest.TestCase):
    def test_rows_follow_each_other_at_the_lead(self):
        for width, height, workers, time in (
                (10, 5, 5, 10 + 4 * 3),  # a row begins three macroblocks behind the one above
                (10, 5, 64, 10 + 4 * 3),
                (2, 5, 5, 5 * 2),        # a lead longer than the row: one row after the other
                (1, 5, 5, 5),
                (10, 1, 8, 10),
                # Rows 0 and 1 end at 10 and 13, where their workers begin rows 2 and 3.
                (10, 4, 2, 10 + 13)):
            with self.subTest(width=width, height=height, workers=workers):
                self.assertEqual(picture_time(even(width, height), workers, 0.0), time)

    def test_a_slow_macroblock_holds_up_the_rows_below(self):
        picture = even(10, 2)
        picture.steps[0][5] = 21.0
        # (3, 1) waits until (5, 0) is done at 26; seven macroblocks are left of row 1.
        self.assertEqual(picture_time(picture, 2, 0.0), 26 + 7)

    def test_workers_that_start_late_hold_up_nobody(self):
        self.assertEqual(picture_time(even(10, 2), 2, 5.0), 15)
        self.assertEqual(picture_time(even(10, 2), 2, 100.0), 20)
        self.assertEqual(picture_time(even(10, 2), 1, 100.0), 20)

    def test_serial_parts(self):
        picture = even(10, 2, before=100.0, after=50.0, last_filter=4.0, append=[0.0, 2.0])
        self.assertEqual(picture_time(picture, 2, 0.0), 100 + 13 + 2 + 4 + 50)
        self.assertEqual(picture_time(picture, 1, 0.0), 100 + 20 + 4 + 50)

    def test_half_sample_rows_are_built_once_by_whoever_needs_them(self):
        picture = even(10, 2, inter=True, half_row=0.5)
        first, second = (BORDER + 17) * 0.5, 16 * 0.5
        # Row 1 begins when three macroblocks of row 0 are done, and then builds.
        self.assertEqual(picture_time(picture, 2, 0.0), first + 3 + second + 10)
        self.assertEqual(picture_time(picture, 1, 0.0), first + second + 20)
        self.assertEqual(picture_time(picture, 2, 0.0) - 3 - 10,
                         picture_time(picture, 1, 0.0) - 20)
        picture.needs[0] = [33] * 10
        self.assertEqual(picture_time(picture, 2, 0.0), first + second + 13)

    def test_one_worker_is_the_measure(self):
        self.assertEqual(gain([even(10, 5), even(10, 5)], 1, 20.0), 1)
        self.assertEqual(gain([even(10, 5), even(10, 5)], 5, 0.0), 50 / 22)


if __name__ == "__main__":
    unittest.main()
