"""zoltenc with the real encoder library: its streams, decoded by ffmpeg."""

import csv
import math
import subprocess
import unittest

from zoltenc_runner import FFMPEG, START_CODE, ToolTest


class StreamTest(ToolTest):
    def encode(self, *arguments, **settings):
        return self.assert_succeeds(self.zoltenc(*arguments, stub=False, **settings))

    def ffmpeg(self, *arguments):
        """Runs ffmpeg, which must have nothing to complain about; gives its standard output."""
        result = subprocess.run(
            [FFMPEG, "-v", "error", "-nostdin", *arguments],
            cwd=self.folder,
            capture_output=True,
            timeout=120,
            check=False,
        )
        self.assertEqual((result.returncode, result.stderr), (0, b""))
        return result.stdout

    def decode(self, name, width, height):
        """The pictures of a stream, planar 4:2:0."""
        pixels = self.ffmpeg("-i", name, "-f", "rawvideo", "-pix_fmt", "yuv420p", "-")
        size = width * height * 3 // 2
        self.assertEqual(len(pixels) % size, 0)
        return [pixels[i : i + size] for i in range(0, len(pixels), size)]

    def units(self, name):
        """NAL units without their start codes; none of ours holds three zero bytes."""
        stream = self.read(name)
        self.assertTrue(stream.startswith(START_CODE))
        return stream.split(START_CODE)[1:]


def psnr(a, b):
    error = sum((x - y) ** 2 for x, y in zip(a, b)) / len(a)
    return math.inf if error == 0 else 10 * math.log10(255**2 / error)


class Streams(StreamTest):
    def test_every_picture_is_decoded(self):
        for source, options, size, frames in (
            ("synthetic:176x144@30:20", ["-g", "1"], (176, 144), 20),
            ("synthetic:176x144@30:20", ["-g", "7", "-b", "400"], (176, 144), 20),
            ("synthetic:100x70@25:12", ["-b", "0"], (96, 64), 12),
            ("synthetic:16x16@25:40", ["-g", "300"], (16, 16), 40),
            ("synthetic:16x128@30000/1001:12", ["-g", "3", "-n", "10"], (16, 128), 10),
            ("synthetic:320x16@50:12", ["--skip", "5", "-b", "4000"], (320, 16), 7),
        ):
            with self.subTest(source=source, options=options):
                self.encode(source, "-o", "out.264", *options)
                self.assertEqual(len(self.decode("out.264", *size)), frames)

    def test_parameter_sets_come_first(self):
        for size, sps in (
            ("176x144", "47 4D 00 16 8D 8D 41 62 62"),
            ("320x240", "47 4D 00 16 8D 8D 40 A0 F8 80"),
        ):
            self.encode(f"synthetic:{size}@25:2", "-o", "out.264")
            units = self.units("out.264")
            self.assertEqual(units[0], bytes.fromhex(sps))
            self.assertEqual(units[1], bytes.fromhex("48 CE 03 C1 78 80"))
            self.assertEqual([unit[0] & 31 for unit in units[2:]], [5, 1])

    def test_files_pipes_and_runs_give_the_same_stream(self):
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=25:duration=1", "-pix_fmt",
                    "yuv420p", "in.y4m")
        self.encode("in.y4m", "-o", "file.264")
        expected = self.read("file.264")
        self.assertEqual(len(self.decode("file.264", 64, 48)), 25)
        piped = self.encode("-", "-o", "-", "-v", stdin=self.read("in.y4m"))
        self.assertEqual(piped.stdout, expected)
        self.ffmpeg("-i", "in.y4m", "-f", "rawvideo", "in.yuv")
        self.encode("in.yuv", "-s", "64x48", "-r", "25", "-o", "raw.264")
        self.assertEqual(self.read("raw.264"), expected)


class Formats(StreamTest):
    width, height, frames = 96, 80, 6

    def setUp(self):
        super().setUp()
        source = f"testsrc2=size={self.width}x{self.height}:rate=25"
        self.source = ["-f", "lavfi", "-i", source, "-frames:v", str(self.frames)]
        self.luma = self.pixels("gray")

    def pixels(self, pixel_format):
        # Full range, as the encoder's conversion from RGB has it.
        return self.ffmpeg(*self.source, "-vf", "scale=out_range=full", "-f", "rawvideo",
                           "-pix_fmt", pixel_format, "-")

    def ayuv(self):
        """From planar 4:4:4, which ffmpeg has."""
        planar = self.pixels("yuv444p")
        plane = self.width * self.height
        packed = bytearray()
        for start in range(0, len(planar), 3 * plane):
            picture = bytearray(b"\xff" * (4 * plane))
            for component in range(3):
                begin = start + component * plane
                picture[component + 1 :: 4] = planar[begin : begin + plane]
            packed += picture
        return bytes(packed)

    def test_every_raw_format_gives_the_same_pictures(self):
        sources = {"AYUV": self.ayuv()}
        for fourcc, name in (
            ("IYUV", "yuv420p"),
            ("YUY2", "yuyv422"),
            ("BGRA", "bgra"),
            ("RGBA", "rgba"),
            ("ARGB", "argb"),
            ("BGR ", "bgr24"),
            ("RGB ", "rgb24"),
        ):
            sources[fourcc] = self.pixels(name)
        size = f"{self.width}x{self.height}"
        plane = self.width * self.height
        for fourcc, pixels in sources.items():
            with self.subTest(format=fourcc):
                self.write("in.raw", pixels)
                self.encode("in.raw", "-s", size, "-f", fourcc, "-b", "4000", "-o", "out.264")
                pictures = self.decode("out.264", self.width, self.height)
                self.assertEqual(len(pictures), self.frames)
                for index, picture in enumerate(pictures):
                    source = self.luma[index * plane : (index + 1) * plane]
                    self.assertGreater(psnr(picture[:plane], source), 30)


class Statistics(StreamTest):
    def rows(self, *arguments):
        self.encode(*arguments, "-o", "out.264", "--stats", "stats.csv")
        with open(self.folder / "stats.csv", newline="", encoding="ascii") as file:
            return list(csv.DictReader(file))

    def test_one_row_describes_each_picture(self):
        rows = self.rows("synthetic:64x48@30000/1001:11", "-g", "4", "-b", "0")
        pictures = self.units("out.264")[2:]
        self.assertEqual([row["index"] for row in rows], [str(i) for i in range(11)])
        self.assertEqual([int(row["time_us"]) for row in rows],
                         [i * 1001000000 // 30000 for i in range(11)])
        self.assertEqual("".join(row["type"] for row in rows), "IPPPIPPPIPP")
        self.assertEqual([int(row["bytes"]) for row in rows], [len(unit) for unit in pictures])
        self.assertEqual({row["qp"] for row in rows}, {"28"})

    def test_rate_control_shows_in_the_quantiser(self):
        low = self.rows("synthetic:176x144@30:30", "-b", "64")
        high = self.rows("synthetic:176x144@30:30", "-b", "2000")
        mean = [sum(int(row["qp"]) for row in rows) / 30 for rows in (low, high)]
        self.assertGreater(mean[0], mean[1] + 5)
        self.assertTrue(all(0 <= int(row["qp"]) <= 51 for row in low + high))


if __name__ == "__main__":
    unittest.main()
