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

    def test_threads_do_not_change_the_stream(self):
        streams = set()
        for options in (["-t", "1"], ["-t", "2"], ["--threads", "5"], ["-t", "256"], []):
            self.encode("synthetic:208x176@30:20", "-o", "out.264", "-g", "7", *options)
            streams.add(self.read("out.264"))
        self.assertEqual(len(streams), 1)

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


# The raw formats and the names that ffmpeg knows them by; AYUV is put together from planes.
RAW_FORMATS = {
    "IYUV": "yuv420p",
    "YUY2": "yuyv422",
    "AYUV": "yuv444p",
    "BGRA": "bgra",
    "RGBA": "rgba",
    "ARGB": "argb",
    "BGR ": "bgr24",
    "RGB ": "rgb24",
}


class FormatTest(StreamTest):
    """Cases that bring one source into all formats."""

    frames = 6

    def source(self, width, height):
        """Arguments for ffmpeg; full range, as the encoder's conversion from RGB has it."""
        crop = f"format=rgb24,crop={width}:{height},scale=out_range=full"
        return ["-f", "lavfi", "-i", "testsrc2=size=160x96:rate=25",
                "-frames:v", str(self.frames), "-vf", crop]

    def pixels(self, pixel_format, width, height):
        return self.ffmpeg(*self.source(width, height), "-f", "rawvideo",
                           "-pix_fmt", pixel_format, "-")

    def raw(self, fourcc, width, height):
        """A raw file's bytes."""
        pixels = self.pixels(RAW_FORMATS[fourcc], width, height)
        if fourcc != "AYUV":
            return pixels
        plane = width * height
        packed = bytearray()
        for start in range(0, len(pixels), 3 * plane):
            picture = bytearray(b"\xff" * (4 * plane))
            for component in range(3):
                begin = start + component * plane
                picture[component + 1 :: 4] = pixels[begin : begin + plane]
            packed += picture
        return bytes(packed)


class Formats(FormatTest):
    width, height = 96, 80

    def test_every_raw_format_gives_the_same_pictures(self):
        luma = self.pixels("gray", self.width, self.height)
        plane = self.width * self.height
        for fourcc in RAW_FORMATS:
            with self.subTest(format=fourcc):
                self.write("in.raw", self.raw(fourcc, self.width, self.height))
                self.encode("in.raw", "-s", f"{self.width}x{self.height}", "-f", fourcc,
                            "-b", "4000", "-o", "out.264")
                pictures = self.decode("out.264", self.width, self.height)
                self.assertEqual(len(pictures), self.frames)
                for index, picture in enumerate(pictures):
                    source = luma[index * plane : (index + 1) * plane]
                    self.assertGreater(psnr(picture[:plane], source), 30)


def pixel_reader(fourcc, picture, width, height):
    """A function of x and y that gives Y, U and V of a pixel of a picture as files hold it: half a
    pair of chroma samples is stored as a whole one."""
    pairs = (width + 1) // 2
    if fourcc == "IYUV":
        u = width * height
        v = u + pairs * ((height + 1) // 2)

        def pixel(x, y):
            chroma = y // 2 * pairs + x // 2
            return picture[y * width + x], picture[u + chroma], picture[v + chroma]
    elif fourcc == "YUY2":

        def pixel(x, y):
            row = 4 * pairs * y
            pair = row + 4 * (x // 2)
            return picture[row + 2 * x], picture[pair + 1], picture[pair + 3]
    elif fourcc == "AYUV":

        def pixel(x, y):
            return picture[4 * (y * width + x) + 1 :][:3]
    else:
        letters = fourcc.strip()
        red, green, blue = (letters.index(letter) for letter in "RGB")

        def pixel(x, y):
            at = len(letters) * (y * width + x)
            luma = 0.3 * picture[at + red] + 0.59 * picture[at + green] + 0.11 * picture[at + blue]
            return (luma, 128 + (picture[at + blue] - luma) / 1.78,
                    128 + (picture[at + red] - luma) / 1.4)
    return pixel


def coded_planes(fourcc, picture, width, height):
    """The planes that should be coded of a picture as files hold it: its middle, both sides a
    multiple of 16, the corner on a whole pair of the format; chroma samples are the means of
    blocks of 2x2 pixels."""
    pixel = pixel_reader(fourcc, picture, width, height)
    pair_width, pair_height = {"IYUV": (2, 2), "YUY2": (2, 1)}.get(fourcc, (1, 1))
    left = width % 16 // 2 // pair_width * pair_width
    top = height % 16 // 2 // pair_height * pair_height
    rows = [[pixel(left + x, top + y) for x in range(width // 16 * 16)]
            for y in range(height // 16 * 16)]
    chroma = [
        [sum(p[component] for p in (*upper[x : x + 2], *lower[x : x + 2])) / 4
         for upper, lower in zip(rows[::2], rows[1::2]) for x in range(0, len(upper), 2)]
        for component in (1, 2)
    ]
    return [[p[0] for row in rows for p in row], *chroma]


class OddSizes(FormatTest):
    frames = 3
    sizes = ((51, 38), (50, 39), (51, 39), (93, 79))
    # Between what coding leaves, 35.8 dB or more, and what a plane off by one sample has.
    least_psnr = 34
    most_psnr_off_by_one = 28

    def check(self, name, fourcc, stored, width, height, options):
        """Codes a file of the pictures `stored` and looks for their middles in the stream."""
        self.encode(name, "-b", "4000", "-o", "out.264", *options)
        coded_width, coded_height = width // 16 * 16, height // 16 * 16
        pictures = self.decode("out.264", coded_width, coded_height)
        self.assertEqual(len(pictures), self.frames)
        size = len(stored) // self.frames
        for index, picture in enumerate(pictures):
            source = stored[index * size : (index + 1) * size]
            expected = coded_planes(fourcc, source, width, height)
            for plane, row in zip(expected, (coded_width, coded_width // 2, coded_width // 2)):
                coded, picture = picture[: len(plane)], picture[len(plane) :]
                self.assertGreater(psnr(coded, plane), self.least_psnr)
                for offset in (1, row):
                    self.assertLess(psnr(plane, plane[offset:]), self.most_psnr_off_by_one)

    def test_the_middle_is_coded_from_every_format(self):
        for width, height in self.sizes:
            for fourcc in RAW_FORMATS:
                with self.subTest(size=(width, height), format=fourcc):
                    stored = self.raw(fourcc, width, height)
                    self.write("in.raw", stored)
                    self.check("in.raw", fourcc, stored, width, height,
                               ["-s", f"{width}x{height}", "-f", fourcc])
            with self.subTest(size=(width, height), format="Y4M"):
                self.ffmpeg(*self.source(width, height), "-pix_fmt", "yuv420p", "-y", "in.y4m")
                self.check("in.y4m", "IYUV", self.raw("IYUV", width, height), width, height, [])


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
