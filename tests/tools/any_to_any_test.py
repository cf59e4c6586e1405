"""Any video in, every container out: the pictures, their times, their size and the duration are the
input's, and a decoder has nothing to complain about.

ZOLT_TEST_CLIPS may name a folder of video files.
"""

import json
import os
import pathlib
import shutil
import subprocess
import unittest
from fractions import Fraction

from zoltenc_stream_test import StreamTest

CONTAINERS = ("mp4", "mov", "mkv", "flv", "ts")
WITH_ROTATION = ("mp4", "mov")
# These hold no size beside the stream's own, which is cropped by pairs of samples.
WITHOUT_SIZE = ("flv", "ts")
CLIPS = os.environ.get("ZOLT_TEST_CLIPS", "")


def even(side):
    return side + side % 2


@unittest.skipUnless(shutil.which("ffprobe"), "not run: ffprobe is not installed")
class AnyToAny(StreamTest):
    def probe(self, name, *what):
        result = subprocess.run(
            ["ffprobe", "-v", "warning", "-select_streams", "V:0", "-of", "json", *what, f"file:{name}"],
            cwd=self.folder, capture_output=True, text=True, check=True)
        return json.loads(result.stdout)

    def describe(self, name):
        """What players are told of a file; times and durations in seconds."""
        stream = self.probe(name, "-show_streams", "-show_format")
        video = stream["streams"][0]
        frames = self.probe(name, "-show_entries", "frame=best_effort_timestamp_time")["frames"]
        rotations = [data["rotation"] for data in video.get("side_data_list", [])
                     if "rotation" in data]
        return {
            "clock": Fraction(video["time_base"]),
            "times": [Fraction(frame["best_effort_timestamp_time"]) for frame in frames],
            "duration": Fraction(video.get("duration") or stream["format"]["duration"]),
            "size": (video["width"], video["height"]),
            "rotation": rotations[0] % 360 if rotations else 0,
            "shape": video.get("sample_aspect_ratio", "1:1").replace("N/A", "1:1"),
        }

    def assert_same(self, given, name, container):
        coded = self.describe(name)
        self.assertEqual(len(coded["times"]), len(given["times"]))
        # ffprobe writes six places, and a container with a coarser clock rounds.
        near = coded["clock"] / 2 + Fraction(1, 500000)
        for index, (time, expected) in enumerate(zip(coded["times"], given["times"])):
            self.assertLessEqual(abs(time - expected), near, f"picture {index}")
        near_end = given["clock"] + 2 * near
        if container == "ts":
            # It holds no durations, and readers guess that of the last picture.
            near_end += max(b - a for a, b in zip(given["times"], given["times"][1:]))
        self.assertLessEqual(abs(coded["duration"] - given["duration"]), near_end)
        size = given["size"]
        if container in WITHOUT_SIZE:
            size = tuple(even(side) for side in size)
        self.assertEqual(coded["size"], size)
        self.assertEqual(coded["shape"], given["shape"])
        self.assertEqual(coded["rotation"], given["rotation"] if container in WITH_ROTATION else 0)

    def assert_decodes(self, name, pictures):
        """Every stream, and the number of pictures; warnings count."""
        result = subprocess.run(
            ["ffmpeg", "-v", "warning", "-nostdin", "-i", f"file:{name}", "-map", "0", "-fps_mode",
             "passthrough", "-enc_time_base", "-1", "-f", "framecrc", "-"],
            cwd=self.folder, capture_output=True, text=True, timeout=120, check=False)
        self.assertEqual((result.returncode, result.stderr), (0, ""))
        self.assertEqual(sum(line.startswith("0,") for line in result.stdout.splitlines()), pictures)

    def check(self, source, *options):
        given = self.describe(source)
        for container in CONTAINERS:
            with self.subTest(source=pathlib.Path(source).name, container=container):
                name = f"out.{container}"
                self.encode(str(source), "-o", name, "-q", *options)
                self.assert_same(given, name, container)
                self.assert_decodes(name, len(given["times"]))


@unittest.skipUnless(CLIPS, "not run: ZOLT_TEST_CLIPS names no folder of clips")
class AnyClip(AnyToAny):
    def test_every_clip_into_every_container(self):
        clips = sorted(pathlib.Path(CLIPS).glob("*.mkv"))
        self.assertGreater(len(clips), 0)
        for clip in clips:
            self.check(clip, "-b", "1000")


class AnyFile(AnyToAny):
    def make(self, name, size="64x48", codec="ffv1", pixels="yuv420p", options=(), filters="null"):
        """A second of video; gives its name."""
        self.ffmpeg("-f", "lavfi", "-i", f"testsrc2=size={size}:rate=25", "-t", "1", "-vf", filters,
                    "-c:v", codec, "-pix_fmt", pixels, *options, "-y", name)
        return name

    def test_pixel_formats_and_sizes(self):
        for name, settings in (
            ("ten bits.mkv", {"pixels": "yuv422p10le"}),
            ("gray.mkv", {"pixels": "gray"}),
            ("palette.avi", {"codec": "rawvideo", "pixels": "pal8"}),
            ("rgb.mkv", {"pixels": "bgr0"}),
            ("jpeg.avi", {"codec": "mjpeg", "pixels": "yuvj422p"}),
            ("odd.mkv", {"size": "51x39", "pixels": "yuv444p"}),
            ("odd pairs.mkv", {"size": "51x39"}),
            ("wide samples.mkv", {"filters": "setsar=16/11"}),
            ("ntsc.mp4", {"codec": "mpeg4", "filters": "fps=30000/1001"}),
        ):
            self.check(self.make(name, **settings))

    def test_pictures_at_times_of_their_own(self):
        uneven = "setpts='(N*N+3*N)/90/TB'"
        for name, codec in (("uneven.mkv", "ffv1"), ("uneven.mp4", "mpeg4")):
            self.check(self.make(name, codec=codec, filters=f"settb=1/9000,{uneven}",
                                 options=("-fps_mode", "vfr", "-enc_time_base", "1/9000")))

    def test_rotation(self):
        self.make("upright.mp4", codec="mpeg4")
        self.ffmpeg("-i", "upright.mp4", "-c", "copy", "-metadata:s:v", "rotate=90", "turned.mp4")
        self.assertNotEqual(self.describe("turned.mp4")["rotation"], 0)
        self.check("turned.mp4")
        for container in set(CONTAINERS) - set(WITH_ROTATION):
            note = self.encode("turned.mp4", "-o", f"out.{container}").stderr
            self.assertIn("the rotation by", note)

    def test_sound(self):
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=25", "-f", "lavfi", "-i", "sine",
                    "-t", "2", "-c:v", "mpeg4", "-c:a", "aac", "in.mp4")
        self.check("in.mp4")

        def sound(name):
            return self.ffmpeg("-i", name, "-map", "0:a", "-c", "copy", "-f", "adts", "-")

        for container in CONTAINERS:
            with self.subTest(container=container):
                copied = sound(f"out.{container}")
                # What starts the decoder before time 0 is left out where no time is below 0.
                self.assertTrue(sound("in.mp4").endswith(copied))
                self.assertGreater(len(copied), 0.97 * len(sound("in.mp4")))

    def test_pictures_of_one_column_are_an_error(self):
        self.make("thin.mkv", filters="crop=1:48:0:0:exact=1", pixels="yuv444p")
        for container in CONTAINERS:
            result = self.zoltenc("thin.mkv", "-o", f"out.{container}", stub=False)
            self.assert_fails(result, 1, "thin.mkv", "1x48 is too small", "16x16")
        self.assertEqual(self.files(), ["thin.mkv"])


if __name__ == "__main__":
    unittest.main()
