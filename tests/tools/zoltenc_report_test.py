"""What zoltenc tells of a run: progress, JSON, matched rates, quality, the report."""

import csv
import html
import json
import math
import os
import pty
import re
import signal
import subprocess
import unittest

from zoltenc_runner import ENVIRONMENT, FFMPEG, STUB_ENCODER, ZOLTENC, ToolTest, y4m

CHROMIUM = os.environ.get("CHROMIUM", "")
HAS_LIBAV = os.environ.get("LIBAV", "") == "ON"

needs_libav = unittest.skipUnless(HAS_LIBAV, "this zoltenc was built without libavcodec")


class ReportTest(ToolTest):
    def encode(self, *arguments, **settings):
        return self.assert_succeeds(self.zoltenc(*arguments, stub=False, **settings))

    def ffmpeg(self, *arguments):
        subprocess.run([FFMPEG, "-v", "error", "-nostdin", "-y", *arguments], cwd=self.folder,
                       check=True, timeout=120)

    def rows(self, name="stats.csv"):
        with open(self.folder / name, newline="", encoding="ascii") as file:
            return list(csv.DictReader(file))

    def json_lines(self, text):
        """The objects of a text, of which every line is one."""
        self.assertTrue(text.endswith("\n"), text)
        return [json.loads(line) for line in text.splitlines()]

    def summary(self, *arguments, **settings):
        """Of a run with --json; standard output has nothing else than lines of JSON."""
        lines = self.json_lines(self.encode(*arguments, "--json", **settings).stdout.decode())
        self.assertEqual({line["type"] for line in lines[:-1]} - {"progress"}, set())
        self.assertEqual(lines[-1]["type"], "summary")
        return lines[-1]


def kbits_per_second(rows, frames_per_second):
    return sum(int(row["bytes"]) for row in rows) * 8 * frames_per_second / len(rows) / 1000


class Progress(ReportTest):
    counts = r"[\d.]+ frames/s \([\d.]+x\), [\d.]+ kbit/s now, [\d.]+ of 200 over all, 0:0\d left"

    def start(self, *arguments, **streams):
        command = [*ZOLTENC, "--plugin", STUB_ENCODER, *arguments]
        return subprocess.Popen(command, cwd=self.folder, **streams)

    def test_a_line_every_five_seconds_where_there_is_no_terminal(self):
        clip = ["synthetic:64x64@10:65", "--realtime"]
        with self.start(*clip, "-o", "a.264", stderr=subprocess.PIPE) as told, \
                self.start(*clip, "-o", "b.264", "-q", stderr=subprocess.PIPE) as quiet:
            lines = told.stderr.read().decode().splitlines()
            self.assertEqual(quiet.stderr.read(), b"")
        self.assertEqual((told.returncode, quiet.returncode), (0, 0))
        self.assertEqual(len(lines), 2, lines)
        self.assertRegex(lines[0], rf"^\d\d %, [45]\d/65 frames, {self.counts}$")
        self.assertRegex(lines[1], r"^a\.264: 65 frames")

    def test_a_line_that_is_drawn_over_on_a_terminal(self):
        def shown(*options):
            controller, terminal = pty.openpty()
            clip = ["synthetic:64x64@10:12", "--realtime"]
            with self.start(*clip, "-o", "out.264", *options, stderr=terminal,
                            env={**ENVIRONMENT, "TERM": "xterm"}) as process:
                os.close(terminal)
                text = b""
                try:
                    while chunk := os.read(controller, 4096):
                        text += chunk
                except OSError:  # the other end is closed
                    pass
            os.close(controller)
            self.assertEqual(process.returncode, 0)
            return text.decode()

        pieces = shown().split("\r\033[K")
        self.assertEqual(pieces[0], "")
        self.assertGreater(len(pieces), 3)
        for piece in pieces[1:-1]:
            # Cut off at the edge of the terminal instead of wrapped.
            self.assertRegex(piece, rf"^\033\[\?7l\d+ %, \d+/12 frames, {self.counts}\033\[\?7h$")
        self.assertRegex(pieces[-1], r"^out\.264: 12 frames.* kbit/s of 200 \([+-][\d.]+ %\)\r\n$")
        self.assertEqual(shown("-q"), "")


class Json(ReportTest):
    def test_the_summary_agrees_with_the_statistics(self):
        summary = self.summary("synthetic:64x48@25:40", "-b", "150", "-g", "15", "-o", "out.264",
                               "--stats", "stats.csv")
        rows = self.rows()
        quantisers = [int(row["qp"]) for row in rows]
        self.assertEqual(summary["exit"], "end")
        self.assertEqual(summary["input"], "synthetic")
        self.assertEqual((summary["width"], summary["height"]), (64, 48))
        self.assertEqual((summary["frames"], summary["key_frames"]), (40, 3))
        self.assertEqual(summary["bytes"], len(self.read("out.264")))
        self.assertAlmostEqual(summary["stream_seconds"], 1.6)
        self.assertAlmostEqual(summary["kbps"], kbits_per_second(rows, 25), 5)
        self.assertEqual((summary["target_kbps"], summary["controller_kbps"]), (150, 150))
        self.assertEqual(summary["qp"]["min"], min(quantisers))
        self.assertEqual(summary["qp"]["max"], max(quantisers))
        self.assertAlmostEqual(summary["qp"]["mean"], sum(quantisers) / 40, 5)
        self.assertNotIn("psnr", summary)

    def test_names_of_any_bytes(self):
        for name, text in (('"a\\b"\n\t\x7f.264', None), ("\u00e4\U0001f3a5.264", None),
                           (b"a\xff\xc0\xaf\xed\xa0\x80b.264", "a" + "\ufffd" * 6 + "b.264")):
            with self.subTest(name=name):
                summary = self.summary("synthetic:16x16@25:2", "-o", name)
                self.assertEqual(summary["output"], text or name)

    def test_the_stream_has_standard_output_to_itself(self):
        plain = self.encode("synthetic:64x48@25:8", "-o", "-").stdout
        (self.folder / "link").symlink_to("/proc/self/fd/1")
        for output in ("-", "link"):
            result = self.encode("synthetic:64x48@25:8", "-o", output, "--json")
            self.assertEqual(result.stdout, plain)
            self.assertEqual(self.json_lines(result.stderr)[-1]["frames"], 8)

    def test_progress_and_every_way_to_end(self):
        self.write("cut.y4m", y4m(frames=3)[:-1])
        self.write("in.y4m", y4m(frames=3))
        for name, does, status, ending, frames in (("cut.y4m", "", 1, "cut", 2),
                                                   ("in.y4m", "drop at 2", 1, "failed", 2)):
            result = self.zoltenc(name, "-o", "out.264", "--json", stub_does=does)
            self.assert_fails(result, status, "picture 2")
            line = self.json_lines(result.stdout.decode())[-1]
            self.assertEqual((line["exit"], line["frames"]), (ending, frames))

        command = [*ZOLTENC, "--plugin", STUB_ENCODER, "synthetic:64x64@25:50000", "--realtime",
                   "-o", "out.264", "--json"]
        with subprocess.Popen(command, cwd=self.folder, stdout=subprocess.PIPE,
                              stderr=subprocess.DEVNULL) as process:
            progress = json.loads(process.stdout.readline())
            process.send_signal(signal.SIGINT)
            rest = self.json_lines(process.stdout.read().decode())
        self.assertEqual(progress["type"], "progress")
        self.assertEqual(progress["frames_expected"], 50000)
        self.assertAlmostEqual(progress["percent"], progress["frames"] / 500, 5)
        self.assertEqual(rest[-1]["exit"], "stopped")


class MatchRate(ReportTest):
    clip = "synthetic:176x144@30:40"

    def test_a_rate_that_was_missed_is_met(self):
        for rate in (80, 200):
            with self.subTest(rate=rate):
                plain = self.summary(self.clip, "-b", str(rate), "-o", "plain.264")
                self.assertGreater(abs(plain["kbps"] / rate - 1), 0.03)
                summary = self.summary(self.clip, "-b", str(rate), "-o", "out.264", "--stats",
                                       "stats.csv", "--match-rate")
                self.assertLessEqual(abs(kbits_per_second(self.rows(), 30) / rate - 1), 0.03)
                self.assertTrue(2 <= summary["runs"] <= 4, summary)
                self.assertEqual(self.files(), ["out.264", "plain.264", "stats.csv"])
                # The outputs are those of the run that is told of.
                asked = str(summary["controller_kbps"])
                self.encode(self.clip, "-b", asked, "-o", "again.264", "--stats", "again.csv")
                for name in ("264", "csv"):
                    kept = "out.264" if name == "264" else "stats.csv"
                    self.assertEqual(self.read(kept), self.read("again." + name))
                    (self.folder / ("again." + name)).unlink()

    def test_a_rate_out_of_reach_is_said_and_the_nearest_run_kept(self):
        for rate, limit in ((2, "up to 45"), (4000, "down to 18")):
            with self.subTest(rate=rate):
                plain = self.summary(self.clip, "-b", str(rate), "-o", "out.264")
                result = self.encode(self.clip, "-b", str(rate), "-o", "out.264", "--match-rate",
                                     "--json")
                self.assertIn(limit, result.stderr)
                self.assertIn(f"{rate} kbit/s is not met", result.stderr)
                summary = self.json_lines(result.stdout.decode())[-1]
                self.assertLessEqual(abs(math.log(summary["kbps"] / rate)),
                                     abs(math.log(plain["kbps"] / rate)))
                self.assertEqual(summary["bytes"], len(self.read("out.264")))

    def test_what_cannot_be_repeated_is_refused(self):
        os.mkfifo(self.folder / "pipe")
        self.write("in.y4m", y4m())
        for arguments, *texts in (
            (["in.y4m", "-o", "out.264", "-b", "0"], "-b"),
            (["-", "-o", "out.264"], "standard input"),
            (["in.y4m", "-o", "-"], "standard output"),
        ):
            self.assert_fails(self.zoltenc(*arguments, "--match-rate"), 2, "--match-rate", *texts)
        self.assert_fails(self.zoltenc("none.y4m", "-o", "out.264", "--match-rate"), 1, "none.y4m")
        with subprocess.Popen("cat in.y4m > pipe", shell=True, cwd=self.folder):
            self.assert_fails(self.zoltenc("pipe", "-o", "out.264", "--match-rate"), 2, "pipe",
                              "again")
        self.assertEqual(self.files(), ["in.y4m", "pipe"])


class Quality(ReportTest):
    @needs_libav
    def test_numbers_are_those_of_ffmpeg(self):
        """Of the pictures as the engine sees them: here the middle of those of the input."""
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=100x70:rate=25:duration=1", "-pix_fmt",
                    "yuv420p", "in.y4m")
        summary = self.summary("in.y4m", "-b", "100", "-o", "out.264", "--psnr", "--stats",
                               "stats.csv")
        self.ffmpeg("-r", "25", "-i", "out.264", "-r", "25", "-i", "in.y4m", "-lavfi",
                    "[0]split[a][b];[1]crop=96:64:2:2,split[c][d];[a][c]psnr=stats_file=psnr.log;"
                    "[b][d]ssim=stats_file=ssim.log", "-f", "null", "-")
        logs = [[dict(item.split(":") for item in line.split() if ":" in item)
                 for line in self.read(name).decode().splitlines()]
                for name in ("psnr.log", "ssim.log")]
        rows = self.rows()
        self.assertEqual([len(log) for log in logs], [25, 25])
        self.assertEqual(len(rows), 25)
        for row, psnr, ssim in zip(rows, *logs):
            for plane in "yuv":
                self.assertAlmostEqual(float(row[f"psnr_{plane}"]), float(psnr[f"psnr_{plane}"]),
                                       delta=0.01)
            self.assertAlmostEqual(float(row["ssim_y"]), float(ssim["Y"]), delta=0.001)
        for name in ("y", "u", "v"):
            error = sum(float(picture[f"mse_{name}"]) for picture in logs[0]) / 25
            self.assertAlmostEqual(summary["psnr"][name], 10 * math.log10(255**2 / error),
                                   delta=0.01)
        error = sum(float(picture["mse_avg"]) for picture in logs[0]) / 25
        self.assertAlmostEqual(summary["psnr"]["all"], 10 * math.log10(255**2 / error), delta=0.01)
        self.assertAlmostEqual(summary["ssim_y"], sum(float(s["Y"]) for s in logs[1]) / 25,
                               delta=0.001)

    @needs_libav
    def test_pictures_without_any_error(self):
        self.write("in.yuv", b"\x80" * (64 * 48 * 3 // 2) * 3)
        summary = self.summary("in.yuv", "-s", "64x48", "-o", "out.mp4", "--psnr", "--stats",
                               "stats.csv", "--report", "report.html")
        self.assertEqual({row["psnr_y"] for row in self.rows()}, {"inf"})
        self.assertEqual(summary["psnr"]["all"], "inf")
        self.assertEqual(summary["ssim_y"], 1)

    @needs_libav
    def test_a_stream_that_cannot_be_decoded_is_an_error(self):
        result = self.zoltenc("synthetic:64x48@25:3", "-o", "out.264", "--psnr")
        self.assert_fails(result, 1, "picture 0", "libavcodec")
        self.assertEqual(self.files(), [])

    @unittest.skipIf(HAS_LIBAV, "this zoltenc was built with libavcodec")
    def test_without_a_decoder(self):
        clip = "synthetic:64x48@25:3"
        self.assert_fails(self.zoltenc(clip, "-o", "out.264", "--psnr"), 2, "--psnr", "libavcodec")
        result = self.encode(clip, "-o", "out.264", "--report", "report.html")
        self.assertIn("libavcodec", result.stderr)
        self.assertIn(b"libavcodec", self.read("report.html"))


# Looks at the page in a frame of a given width; the result is JSON in the last element.
CHECK_PAGE = """
<iframe id="frame" width="%d" height="900" srcdoc="%s"></iframe><pre id="result"></pre>
<script>
onerror = message => { document.getElementById("result").textContent = message; };
onload = () => {
    const inner = document.getElementById("frame").contentDocument;
    const shown = layer => [...inner.querySelectorAll(layer)].filter(
        element => getComputedStyle(element).visibility === "visible").length;
    const count = () => ({input: shown(".input"), output: shown(".output"), types: shown("svg.types"),
                          motion: shown("svg.motion")});
    const before = count();
    for (const box of inner.querySelectorAll("[type=checkbox], .show-input")) { box.click(); }
    document.getElementById("result").textContent = JSON.stringify({
        width: inner.documentElement.scrollWidth,
        pictures: [...inner.images].map(image => image.naturalWidth),
        curves: [...inner.querySelectorAll(".axes .line")].map(path => path.getTotalLength()),
        before, after: count()});
};
</script>
"""


class Report(ReportTest):
    most_bytes = 3_000_000

    def page(self, *arguments, name="report.html"):
        self.encode(*arguments, "--report", name)
        text = self.read(name).decode()
        self.assertLess(len(text), self.most_bytes)
        for forbidden in ("http:", "https:", "//www", "url(", "@import", "file:"):
            self.assertNotIn(forbidden, text)
        return text

    @needs_libav
    def test_its_numbers_are_those_of_the_statistics(self):
        output = "<b>&\"x\".264"
        text = self.page("synthetic:176x144@30:90", "-b", "300", "-o", output, "--psnr",
                         "--stats", "stats.csv")
        self.assertIn(f"<h1>{html.escape(output, quote=True)}</h1>", text)
        self.assertNotIn("<b>&", text)
        rows = self.rows()
        self.assertIn(f"<b>{kbits_per_second(rows, 30):.1f} <small>kbit/s", text)
        pictures = re.findall(r"<h3>Picture (\d+), ([^<]*)</h3><p class=\"soft\">[\d.]+ s, ([\w ]+), "
                              r"(\d+) bytes, QP (\d+), PSNR-Y ([\d.]+) dB, SSIM-Y ([\d.]+)", text)
        self.assertEqual(len(pictures), 6)
        for index, reason, kind, size, quantiser, psnr, ssim in pictures:
            row = rows[int(index)]
            self.assertEqual((size, quantiser), (row["bytes"], row["qp"]))
            self.assertEqual(kind == "key frame", row["type"] == "I")
            self.assertAlmostEqual(float(psnr), float(row["psnr_y"]), delta=0.006)
            self.assertAlmostEqual(float(ssim), float(row["ssim_y"]), delta=0.0001)
        chosen = {part: int(picture[0]) for picture in pictures for part in picture[1].split(", ")}
        self.assertEqual(chosen["the first picture"], 0)
        self.assertEqual(chosen["the lowest PSNR"],
                         min(range(90), key=lambda i: float(rows[i]["psnr_y"])))
        self.assertEqual(chosen["the largest predicted picture"],
                         max((i for i in range(90) if rows[i]["type"] == "P"),
                             key=lambda i: int(rows[i]["bytes"])))
        # Macroblocks add up.
        for section in text.split("<article")[1:]:
            counts = re.findall(r"</i>[\w ]+? (\d+) \(", section)
            self.assertEqual(sum(map(int, counts)), 11 * 9)

    @needs_libav
    def test_it_stays_small(self):
        self.write("noise.yuv", os.urandom(1920 * 1088 * 3 // 2) * 2
                   + os.urandom(1920 * 1088 * 3 // 2 * 5))
        self.page("noise.yuv", "-s", "1920x1088", "-b", "0", "-o", "out.264")
        self.page("synthetic:32x32@25:6000", "-g", "2", "-b", "4000", "-o", "out.264")

    @needs_libav
    @unittest.skipUnless(CHROMIUM, "Chromium is not installed")
    def test_it_works_in_a_browser(self):
        text = self.page("synthetic:352x288@30:40", "-b", "300", "-o", "out.264")
        for width in (390, 1280):
            with self.subTest(width=width):
                self.write("check.html", (CHECK_PAGE % (width, html.escape(text))).encode())
                result = subprocess.run(
                    [CHROMIUM, "--headless", "--no-sandbox", "--disable-gpu", "--no-first-run",
                     "--disable-background-networking", "--disable-component-update",
                     "--disable-sync", f"--user-data-dir={self.folder / 'profile'}",
                     "--enable-logging=stderr", "--virtual-time-budget=5000", "--dump-dom",
                     "check.html"],
                    cwd=self.folder, capture_output=True, timeout=120, check=True)
                self.assertNotIn(b"CONSOLE", result.stderr)
                found = json.loads(re.search(r'<pre id="result">(.*?)</pre>',
                                             result.stdout.decode())[1])
                self.assertLessEqual(found["width"], width)
                self.assertEqual(found["pictures"], [352] * 12)
                self.assertTrue(all(length > 100 for length in found["curves"]), found)
                self.assertEqual(len(found["curves"]), 4)
                self.assertEqual(found["before"], {"input": 6, "output": 6, "types": 0, "motion": 0})
                # Key frames have no motion to show.
                self.assertEqual((found["after"]["output"], found["after"]["types"]), (0, 6))
                self.assertTrue(1 <= found["after"]["motion"] <= 5, found)


if __name__ == "__main__":
    unittest.main()
