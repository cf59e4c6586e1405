#!/usr/bin/env python3
"""The search for a rate, the clocks, and the choice of films."""

import math
import sys
import unittest

import measure


class AtRateTest(unittest.TestCase):
    CRF = dict(slope=-math.log(2) / 6, limits=(0.0, 51.0))

    def search(self, rate_of, target, guess, **arguments):
        """The answer, its rate and the number of tries."""
        tried = []

        def counted(x):
            self.assertTrue(arguments["limits"][0] <= x <= arguments["limits"][1], x)
            tried.append(x)
            return rate_of(x)
        return (*measure.at_rate(target, counted, guess, **arguments), len(tried))

    def test_finds_the_rate(self):
        curves = {
            "as expected": lambda x: 4000 * 2 ** (-x / 6),
            "steeper": lambda x: 9000 * 2 ** (-x / 3),
            "flatter, with an end": lambda x: 150 + 2000 * 2 ** (-x / 12),
            "steps": lambda x: 4000 * 2 ** (-math.floor(x * 8) / 8 / 6),
        }
        for name, curve in curves.items():
            for answer in (12.0, 25.0, 40.0):
                with self.subTest(curve=name, answer=answer):
                    target = curve(answer)
                    _, rate, tries = self.search(curve, target, 28.0, **self.CRF)
                    self.assertAlmostEqual(rate / target, 1, delta=0.0101)
                    self.assertLessEqual(tries, 8)

    def test_rates_that_rise_with_the_parameter(self):
        x, _, _ = self.search(lambda x: 1.1 * math.exp(x), 700, math.log(500), slope=1.0,
                              limits=(0.0, 12.0))
        self.assertAlmostEqual(math.exp(x), 700 / 1.1, delta=7)

    def test_a_jump_gives_the_nearer_side(self):
        _, rate, tries = self.search(lambda x: 1200 if x < 30 else 900, 1000, 28.0, **self.CRF)
        self.assertEqual(rate, 900)
        self.assertLessEqual(tries, 12)

    def test_out_of_reach(self):
        for target, limit in ((1, 51.0), (1e6, 0.0)):
            with self.subTest(target=target):
                x, _, _ = self.search(lambda x: 4000 * 2 ** (-x / 6), target, 28.0, **self.CRF)
                self.assertEqual(x, limit)


class RunTest(unittest.TestCase):
    BUSY = "import time\nwhile time.process_time() < 0.3: pass"

    def test_processor_time_is_that_of_the_whole_family(self):
        child = f"import subprocess, sys; subprocess.run([sys.executable, '-c', {self.BUSY!r}])"
        times, _ = measure.run([sys.executable, "-c", child])
        self.assertTrue(0.3 <= times.processor < 0.9, times)
        times, printed = measure.run([sys.executable, "-c",
                                      "import sys, time; print('out'); time.sleep(0.5);"
                                      "print('err', file=sys.stderr)"])
        self.assertGreaterEqual(times.wall, 0.5)
        self.assertLess(times.processor, 0.3)
        self.assertEqual(sorted(printed.split()), ["err", "out"])

    def test_a_failure_ends_the_comparison(self):
        with self.assertRaisesRegex(SystemExit, "(?s)status 3.*went wrong"):
            measure.run([sys.executable, "-c", "import sys; print('went wrong'); sys.exit(3)"])


class FilmTest(unittest.TestCase):
    def test_runs_of_every_size_code_about_as_much(self):
        for size, pictures in (("1280x720", 300), ("1920x1072", 134), ("352x288", 2727),
                               ("176x144", 3000)):
            self.assertEqual(measure.pictures_of(size, 300), pictures)
        self.assertEqual(measure.pictures_of("1920x1072", 2), 2)

    def test_rates(self):
        film = measure.Film("clip", 352, 288, 30, None, None)
        self.assertEqual(film.macroblocks, 396)
        self.assertAlmostEqual(film.bits_per_macroblock(1188), 100)

    def test_the_nearest_clip(self):
        clips = {"a": 176, "b": 352, "c": 1280}
        for size, clip in (("352x288", "b"), ("640x352", "b"), ("1920x1072", "c"), ("96x96", "a")):
            self.assertEqual(measure.nearest_clip(clips, size), clip)
        self.assertIsNone(measure.nearest_clip({}, "352x288"))


if __name__ == "__main__":
    unittest.main()
