#!/usr/bin/env python3
"""The programs compare and pareto as a user runs them, on a few pictures.

ZOLT_PROGRAMS names the folder of zoltenc and bench_stream (build/release/bin). What is measured is
not looked at: only that tables and plots hold what they have to. Skipped where a rival is not
installed.
"""

import importlib.machinery
import importlib.util
import os
import pathlib
import shutil
import subprocess
import sys
import tempfile
import unittest
import xml.etree.ElementTree

FOLDER = pathlib.Path(__file__).resolve().parent
PROGRAMS = pathlib.Path(os.environ.get("ZOLT_PROGRAMS", "build/release/bin"))
FILM = ("--pairs", "1", "--frames", "15", "--sizes", "352x288")


def script(name):
    """A program of this folder as a module."""
    loader = importlib.machinery.SourceFileLoader(f"bench_{name}", str(FOLDER / name))
    module = importlib.util.module_from_spec(importlib.util.spec_from_loader(loader.name, loader))
    sys.modules[loader.name] = module
    loader.exec_module(module)
    return module


pareto = script("pareto")


def run(name, *arguments):
    return subprocess.run([sys.executable, "-B", FOLDER / name, *map(str, arguments)],
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True, check=False)


def rows(printed):
    """The cells of a Markdown table, the head left out."""
    lines = [line for line in printed.splitlines() if line.startswith("| ")]
    return [[cell.strip() for cell in line.strip("|").split("|")] for line in lines[1:]]


def notes(drawing):
    """What the marks of a plot say."""
    root = xml.etree.ElementTree.parse(drawing).getroot()
    return [tag.text for tag in root.iter("{http://www.w3.org/2000/svg}title")][1:]


@unittest.skipUnless(shutil.which("x264"), "x264 is not installed")
class CompareTest(unittest.TestCase):
    def test_density(self):
        with tempfile.TemporaryDirectory() as folder:
            plot = pathlib.Path(folder, "plot.svg")
            done = run("compare", *FILM, "--programs", PROGRAMS, "--density", "--clips", "football",
                       "--qps", 24, 36, "--rates", 800, "--table", "sse2", "--svg", plot)
            if "no such clip" in done.stderr:
                self.skipTest("ZOLT_TEST_CLIPS names no folder of clips")
            self.assertEqual(done.returncode, 0, done.stderr)
            table = rows(done.stdout)
            self.assertEqual([row[2] for row in table], ["qp24", "qp36", "800k"])
            for row in table:
                ours, theirs = float(row[6]), float(row[10])
                self.assertAlmostEqual(theirs / ours, 1, delta=0.02)
                self.assertGreater(float(row[12].split()[0]), 0)
            self.assertGreater(float(table[0][3]), float(table[1][3]))
            # In either panel.
            self.assertEqual(len(notes(plot)), 2 * len(table))

    def test_intra(self):
        done = run("compare", *FILM, "--programs", PROGRAMS, "--intra")
        self.assertEqual(done.returncode, 0, done.stderr)
        table = rows(done.stdout)
        self.assertEqual([row[8] for row in table],
                         ["ultrafast, equal rate", "ultrafast, equal QP",
                          "ultrafast, --qp alone"])
        self.assertEqual({row[4] for row in table}, {"100.0 %"})

    def test_wrong_usage(self):
        for arguments, message in ((["--sizes", "350x288"], "multiples of 16"),
                                   (["--intra", "--density"], "not allowed with"),
                                   (["--svg", "x.svg"], "only --density"),
                                   (["--sizes", "160x96"], "no default bit rates"),
                                   (["--qps", "52"], "from 1 to 51"),
                                   (["--programs", "nowhere"], "cannot be run")):
            with self.subTest(arguments=arguments):
                done = run("compare", *arguments)
                self.assertEqual(done.returncode, 2)
                self.assertIn(message, done.stderr)


class ParetoTest(unittest.TestCase):
    @unittest.skipUnless(shutil.which("x264"), "x264 is not installed")
    def test_table_and_plot(self):
        encoders = ["ultrafast", "veryfast"]
        if shutil.which("gst-inspect-1.0") and subprocess.run(
                ["gst-inspect-1.0", "--exists", "openh264enc"], check=False).returncode == 0:
            encoders.append("openh264 low")
        with tempfile.TemporaryDirectory() as folder:
            plot = pathlib.Path(folder, "plot.svg")
            done = run("pareto", *FILM, "--zoltenc", PROGRAMS / "zoltenc", "--encoders",
                       *encoders, "--rates", 500, 1200, "--svg", plot)
            self.assertEqual(done.returncode, 0, done.stderr)
            table = rows(done.stdout)
            self.assertEqual([row[0] for row in table], ["zoltenc", *encoders])
            self.assertEqual(table[0][1:], ["1.00", "1.00", "+0 %", "+0 %"])
            self.assertEqual(len(notes(plot)), 2 * len(table))

    def test_who_is_faster_and_better(self):
        def result(speed, share, gain=0.0):
            points = [(100 * share, 30 + gain), (1000 * share, 40 + gain)]
            return pareto.Result([speed], [speed],
                                 {metric: {"film": points} for metric in pareto.METRICS})
        results = {"zoltenc": result(1.0, 1.0), "ultrafast": result(1.2, 1.5),
                   "superfast": result(0.7, 0.9), "veryfast": result(1.1, 0.95)}
        self.assertEqual(pareto.faster_and_better(results, "PSNR-Y"), ["veryfast"])
        self.assertIn("| ultrafast | 1.20 | 1.20 | +50 % | +50 % |",
                      pareto.results_table(results, 1))
        results["fast"] = result(1.5, 1.0, gain=20.0)
        self.assertIn("| fast | 1.50 | 1.50 | no common quality |",
                      pareto.results_table(results, 1))
        self.assertEqual(pareto.faster_and_better(results, "SSIM-Y"), ["veryfast"])
        self.assertIn(">superfast: speed 0.70, bits 0.90<", pareto.plot(results, ""))
        self.assertNotIn(">fast: ", pareto.plot(results, ""))


if __name__ == "__main__":
    unittest.main()
