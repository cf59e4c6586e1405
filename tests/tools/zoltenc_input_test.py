"""zoltenc's input through FFmpeg's libraries: files that ffmpeg makes, and what the encoder is given of them."""

import json
import os
import random
import subprocess
import time
import unittest

from zoltenc_runner import FFMPEG, STUB_ENCODER, ZOLTENC, ToolTest, START_CODE, restore_sigpipe

FFPROBE = os.path.join(os.path.dirname(FFMPEG), "ffprobe")
WIDTH, HEIGHT, FRAMES = 64, 48, 5
TEST_PICTURE = f"testsrc2=size={WIDTH}x{HEIGHT}:rate=25:duration={FRAMES / 25}"


class InputTest(ToolTest):
    def ffmpeg(self, *arguments):
        result = subprocess.run(
            [FFMPEG, "-v", "error", "-nostdin", "-y", *arguments],
            cwd=self.folder,
            capture_output=True,
            timeout=120,
            check=False,
        )
        self.assertEqual(result.returncode, 0, result.stderr)
        return result.stdout

    def make(self, name, *arguments, source=TEST_PICTURE):
        self.ffmpeg("-f", "lavfi", "-i", source, *arguments, name)

    def frames(self, name):
        """Of the first video stream, as ffprobe sees them."""
        output = subprocess.run(
            [FFPROBE, "-v", "error", "-select_streams", "v:0", "-show_entries",
             "frame=pts,best_effort_timestamp:stream=time_base", "-of", "json", name],
            cwd=self.folder, capture_output=True, timeout=120, check=True,
        ).stdout
        return json.loads(output)

    def times(self, name):
        """In microseconds, rounded down."""
        probed = self.frames(name)
        numerator, denominator = map(int, probed["streams"][0]["time_base"].split("/"))
        return [
            frame["best_effort_timestamp"] * 1000000 * numerator // denominator
            for frame in probed["frames"]
        ]

    def given(self, *arguments, **settings):
        """What the encoder was told of the stream and of each picture."""
        result = self.assert_succeeds(self.zoltenc(*arguments, "-o", "-", **settings))
        stream, _, *pictures = self.told(result.stdout)
        return stream, pictures

    def samples(self, *arguments):
        """The bytes of each picture that the encoder was given."""
        result = self.assert_succeeds(self.zoltenc(*arguments, "-o", "-", stub_does="echo"))
        stream, pictures = result.stdout.split(START_CODE + b"\x48", 1)
        size = int(self.given(*arguments)[1][0]["size"])
        pictures = pictures[pictures.index(START_CODE):]
        step = len(START_CODE) + 1 + size
        self.assertEqual(len(pictures) % step, 0)
        return [pictures[i + step - size : i + step] for i in range(0, len(pictures), step)]

    def raw(self, name, pixel_format, *filters):
        """The pictures as ffmpeg decodes them."""
        return self.ffmpeg("-i", name, *filters, "-f", "rawvideo", "-pix_fmt", pixel_format, "-")


def mean_difference(one, other):
    return sum(abs(a - b) for a, b in zip(one, other)) / len(one)


class VideoFiles(InputTest):
    def test_pictures_in_a_format_of_the_encoder_are_not_changed(self):
        for pixel_format, fourcc in (
            ("yuv420p", b"IYUV"), ("yuvj420p", b"IYUV"), ("yuyv422", b"YUY2"), ("bgra", b"BGRA"),
            ("bgr0", b"BGRA"), ("rgba", b"RGBA"), ("argb", b"ARGB"), ("bgr24", b"BGR "),
            ("rgb24", b"RGB "),
        ):
            with self.subTest(pixel_format=pixel_format):
                codec = "mjpeg" if pixel_format == "yuvj420p" else "rawvideo"
                self.make("in.nut", "-c:v", codec, "-pix_fmt", pixel_format)
                stream, pictures = self.given("in.nut")
                self.assertEqual(bytes.fromhex(stream["format"]), fourcc)
                self.assertEqual(len(pictures), FRAMES)
                self.assertEqual(b"".join(self.samples("in.nut")), self.raw("in.nut", pixel_format))

    def test_other_formats_become_the_nearest_of_the_encoder(self):
        self.make("in.mkv", "-c:v", "ffv1", "-pix_fmt", "gray")
        luma = self.raw("in.mkv", "gray")
        size = WIDTH * HEIGHT
        for index, sample in enumerate(self.samples("in.mkv")):
            self.assertEqual(sample, luma[index * size : (index + 1) * size] + b"\x80" * (size // 2))

        for pixel_format, codec in (("gbrp", "utvideo"), ("gbrp10le", "ffv1"), ("pal8", "rawvideo"),
                                    ("rgb555le", "rawvideo"), ("monow", "rawvideo")):
            with self.subTest(pixel_format=pixel_format):
                self.make("in.nut", "-c:v", codec, "-pix_fmt", pixel_format)
                stream, _ = self.given("in.nut")
                self.assertEqual(bytes.fromhex(stream["format"]), b"RGB ")
                given = b"".join(self.samples("in.nut"))
                self.assertLess(mean_difference(given, self.raw("in.nut", "rgb24")), 1)

        for pixel_format, value_range in (
            ("yuv422p10le", "tv"), ("yuv444p", "pc"), ("nv12", "tv"), ("yuv444p16le", "pc"),
        ):
            with self.subTest(pixel_format=pixel_format, value_range=value_range):
                self.make("in.nut", "-c:v", "rawvideo", "-pix_fmt", pixel_format,
                          "-color_range", value_range)
                stream, _ = self.given("in.nut")
                self.assertEqual(bytes.fromhex(stream["format"]), b"IYUV")
                # The range that the file has, whatever is declared, stays.
                full = self.raw("in.nut", "yuv444p", "-vf", f"scale=in_range={value_range}:"
                                f"out_range={value_range}")
                for index, sample in enumerate(self.samples("in.nut")):
                    picture = full[index * 3 * size : (index + 1) * 3 * size]
                    self.assertLess(mean_difference(sample[:size], picture[:size]), 1)
                    for plane in (1, 2):
                        begin = size + (plane - 1) * size // 4
                        chroma = bytes(
                            sample[begin + y // 2 * (WIDTH // 2) + x // 2]
                            for y in range(HEIGHT) for x in range(WIDTH)
                        )
                        wanted = picture[plane * size : (plane + 1) * size]
                        self.assertLess(mean_difference(chroma, wanted), 8)

    def test_odd_sizes(self):
        source = "testsrc=size=51x39:rate=25:duration=0.2"
        self.make("in.mkv", "-c:v", "ffv1", "-pix_fmt", "yuv420p", source=source)
        stored = self.raw("in.mkv", "yuv420p")
        picture_bytes = 51 * 39 + 2 * 26 * 20
        for index, sample in enumerate(self.samples("in.mkv")):
            picture = stored[index * picture_bytes : (index + 1) * picture_bytes]
            expected = picture[: 51 * 39]
            for plane in (0, 1):
                begin = 51 * 39 + plane * 26 * 20
                expected += b"".join(picture[begin + y * 26 : begin + y * 26 + 25] for y in range(19))
            self.assertEqual(sample, expected)

    def test_times_are_the_inputs(self):
        self.make("a.mp4", "-c:v", "libx264", "-bf", "2", "-pix_fmt", "yuv420p",
                  source="testsrc2=size=64x48:rate=30000/1001:duration=2")
        uneven = "select='not(mod(n\\,3))+not(mod(n\\,7))'"
        cases = {
            "copy.mkv": ("-i", "a.mp4", "-c", "copy"),
            "copy.ts": ("-i", "a.mp4", "-c", "copy"),
            "uneven.mkv": ("-i", "a.mp4", "-vf", uneven, "-vsync", "vfr", "-c:v", "ffv1"),
            "uneven.mp4": ("-i", "a.mp4", "-vf", uneven, "-vsync", "vfr", "-c:v", "libx264"),
            "late.mkv": ("-itsoffset", "5", "-i", "a.mp4", "-c", "copy"),
            # With an edit list that begins within the pictures.
            "edited.mp4": ("-ss", "0.5", "-i", "a.mp4", "-c", "copy"),
        }
        for name, arguments in cases.items():
            self.ffmpeg(*arguments, name)
        for name in ("a.mp4", *cases):
            with self.subTest(name=name):
                expected = self.times(name)
                self.assertGreater(len(expected), 20)
                _, pictures = self.given(name)
                self.assertEqual([int(picture["time"]) for picture in pictures], expected)
        _, pictures = self.given("uneven.mkv", "--skip", "3", "-n", "4")
        first, *_ = times = self.times("uneven.mkv")[3:7]
        self.assertEqual([int(p["time"]) for p in pictures], [time - first for time in times])

    def test_elementary_streams_get_times_at_their_rate(self):
        self.make("in.h264", "-c:v", "libx264", "-bf", "0", "-pix_fmt", "yuv420p")
        result = self.assert_succeeds(self.zoltenc("in.h264", "-o", "out.264"))
        self.assertNotIn("note", result.stderr)
        stream, pictures = self.given("in.h264")
        self.assertEqual(stream["fps"], "25.000000")
        self.assertEqual([int(p["time"]) for p in pictures], [i * 40000 for i in range(FRAMES)])

    def test_pipes_devices_and_names_with_colons(self):
        self.make("in.mkv", "-c:v", "ffv1", "-pix_fmt", "yuv420p")
        expected = self.given("in.mkv")
        self.assertEqual(self.given("-", stdin=self.read("in.mkv")), expected)
        self.write("tcp:in.mkv", self.read("in.mkv"))
        self.assertEqual(self.given("tcp:in.mkv"), expected)
        self.assertEqual(self.given(f"file://{self.folder}/in.mkv"), expected)
        os.mkfifo(self.folder / "pipe")
        with subprocess.Popen(["cp", "in.mkv", "pipe"], cwd=self.folder):
            self.assertEqual(self.given("pipe"), expected)
        stream, pictures = self.given("lavfi:" + TEST_PICTURE)
        self.assertEqual((stream["width"], len(pictures)), (str(WIDTH), FRAMES))

    def test_what_is_left_out_is_said_in_one_line(self):
        self.ffmpeg("-f", "lavfi", "-i", TEST_PICTURE, "-f", "lavfi", "-i", "sine=duration=0.2",
                    "-f", "lavfi", "-i", "testsrc2=size=32x32:duration=0.2", "-map", "1", "-map", "0",
                    "-map", "1", "-map", "2", "-c:v", "ffv1", "-c:a", "pcm_s16le", "in.mkv")
        result = self.assert_succeeds(self.zoltenc("in.mkv", "-o", "out.264"))
        self.assertEqual(result.stderr.count("note"), 1)
        self.assertIn("in.mkv: left out beside the first video stream: 2 audio, 1 video\n",
                      result.stderr)
        self.assertEqual(self.told(self.read("out.264"))[0]["width"], str(WIDTH))

    def test_another_size_in_mid_stream_is_scaled_to_the_first(self):
        for name, size in (("1.ts", "64x48"), ("2.ts", "96x80")):
            self.make(name, "-c:v", "mpeg2video", "-g", "1", source=f"testsrc2=size={size}:duration=0.4")
        self.write("in.ts", self.read("1.ts") + self.read("2.ts"))
        result = self.assert_succeeds(self.zoltenc("in.ts", "-o", "out.264"))
        self.assertEqual(result.stderr.count("96x80"), 1, result.stderr)
        self.assertIn("scaled to the first one's 64x48", result.stderr)
        _, _, *pictures = self.told(self.read("out.264"))
        self.assertEqual(len(pictures), len(self.frames("in.ts")["frames"]))
        self.assertEqual({picture["size"] for picture in pictures}, {str(WIDTH * HEIGHT * 3 // 2)})
        # The second half's clock begins anew; its pictures follow the first half's.
        starts = [int(picture["time"]) for picture in pictures]
        steps = [later - earlier for earlier, later in zip(starts, starts[1:])]
        self.assertTrue(all(35000 <= step <= 85000 for step in steps), steps)


class Traits(InputTest):
    """What a container tells of the input's pictures."""

    def probed(self, name):
        output = subprocess.run(
            [FFPROBE, "-v", "error", "-select_streams", "v:0", "-show_entries",
             "stream=width,height,sample_aspect_ratio,color_range,color_space,color_transfer,"
             "color_primaries,nb_read_frames:stream_side_data=rotation:format=duration",
             "-count_frames", "-of", "json", name],
            cwd=self.folder, capture_output=True, timeout=120, check=True,
        ).stdout
        result = json.loads(output)
        stream = result["streams"][0]
        side_data = stream.pop("side_data_list", [])
        stream["rotation"] = [data["rotation"] for data in side_data if "rotation" in data]
        stream["duration"] = result["format"]["duration"]
        return stream

    def test_size_shape_colours_and_duration_are_the_inputs(self):
        odd = "testsrc=size=51x39:rate=60000/1001:duration=1,setsar=16/11"
        self.make("odd.mkv", "-c:v", "ffv1", "-pix_fmt", "yuv420p", "-color_range", "pc",
                  "-colorspace", "bt709", "-color_trc", "bt709", "-color_primaries", "bt709", source=odd)
        self.make("ten.mkv", "-c:v", "ffv1", "-pix_fmt", "yuv422p10le", "-color_range", "tv",
                  "-colorspace", "smpte170m", "-color_trc", "smpte170m", "-color_primaries",
                  "smpte170m")
        self.make("gray.mkv", "-c:v", "ffv1", "-pix_fmt", "gray", "-color_range", "pc")
        self.make("up.mp4", "-c:v", "mpeg4")
        for degrees in ("90", "180", "270"):
            self.ffmpeg("-i", "up.mp4", "-c", "copy", "-metadata:s:v", "rotate=" + degrees,
                        f"turned{degrees}.mp4")
        for name in ("odd.mkv", "ten.mkv", "gray.mkv", "turned90.mp4", "turned180.mp4", "turned270.mp4"):
            with self.subTest(name=name):
                self.assert_succeeds(self.zoltenc(name, "-o", "out.mp4", stub=False))
                self.assertEqual(self.probed("out.mp4"), self.probed(name))

    def test_what_goes_with_a_matrix_is_completed(self):
        """Players pass over a description that is not complete."""
        for colour_range, matrix, primaries, transfer in (
            ("tv", "bt709", "bt709", "bt709"),
            ("tv", "smpte170m", "smpte170m", "smpte170m"),
            ("tv", "bt470bg", "bt470bg", "smpte170m"),
            ("pc", "bt470bg", "bt709", "iec61966-2-1"),
        ):
            with self.subTest(matrix=matrix, range=colour_range):
                self.make("in.mkv", "-c:v", "ffv1", "-pix_fmt", "yuv420p", "-color_range",
                          colour_range, "-colorspace", matrix)
                self.assert_succeeds(self.zoltenc("in.mkv", "-o", "out.mp4", stub=False))
                stream = self.probed("out.mp4")
                self.assertEqual(
                    (stream["color_range"], stream["color_space"], stream["color_primaries"],
                     stream["color_transfer"]), (colour_range, matrix, primaries, transfer))
                (self.folder / "in.mkv").unlink()

    def test_scaled_pictures_are_shown_in_their_shape(self):
        self.make("in.mkv", "-c:v", "ffv1", source="testsrc=size=100x50:duration=0.2,setsar=2/1")
        self.assert_succeeds(self.zoltenc("in.mkv", "-o", "out.mp4", "--fit", "scale", stub=False))
        stream = self.probed("out.mp4")
        self.assertEqual((stream["width"], stream["height"]), (96, 48))
        # 100 x 2 to 50 are 4 to 1, and so are 96 x 2 to 48.
        self.assertEqual(stream["sample_aspect_ratio"], "2:1")
        self.assert_succeeds(self.zoltenc("synthetic:1920x1080@25:1", "-o", "out.mp4", "--fit", "scale",
                                          stub=False))
        self.assertEqual(self.probed("out.mp4")["sample_aspect_ratio"], "136:135")


class BadVideo(InputTest):
    def refused(self, name, *texts, options=()):
        with self.subTest(name=name):
            before = self.files()
            self.assert_fails(self.zoltenc(name, "-o", "out.264", *options), 1, name, *texts)
            self.assertEqual(self.files(), before)

    def test_what_holds_no_video_that_can_be_coded(self):
        self.make("sound.m4a", source="sine=duration=0.2")
        self.make("cover.png", "-frames:v", "1")
        self.ffmpeg("-i", "sound.m4a", "-i", "cover.png", "-map", "0:a", "-map", "1", "-c:a",
                    "libmp3lame", "-disposition:v", "attached_pic", "in.mp3")
        self.make("wide.mkv", "-c:v", "ffv1", source="testsrc2=size=64x8:duration=0.2")
        self.make("one.mkv", "-c:v", "ffv1", source="testsrc=duration=0.2,format=yuv444p,crop=1:48")
        self.make("in.mkv", "-c:v", "ffv1")
        # A name that no decoder has.
        self.write("codec.mkv", self.read("in.mkv").replace(b"FFV1", b"FFV0"))
        self.refused("sound.m4a", "no video, only 1 audio", "a video stream is needed")
        self.refused("in.mp3", "1 audio, 1 cover picture")
        self.refused("wide.mkv", "64x8", "16x16")
        self.refused("one.mkv", "1x48", "16x16")
        self.refused("codec.mkv", "no decoder", "--list-formats")
        self.refused("lavfi:nothing", "--list-formats")
        self.refused("no-such-scheme://x", "Protocol not found", "--list-formats")

    def test_a_pipe_that_must_be_read_from_its_end(self):
        self.make("in.mp4", "-c:v", "libx264", "-crf", "5", source="testsrc2=size=640x480:duration=2")
        result = self.zoltenc("-", "-o", "out.264", stdin=self.read("in.mp4"))
        self.assert_fails(result, 1, "standard input", "name it instead of piping it")
        self.assert_succeeds(self.zoltenc("in.mp4", "-o", "out.264"))

    def test_random_bytes(self):
        noise = random.Random(1).randbytes(50000)
        self.make("in.mp4", "-c:v", "libx264", "-movflags", "faststart")
        self.make("in.avi", "-c:v", "mpeg4")
        self.write("noise.bin", noise)
        self.refused("noise.bin", "not Y4M", "-s WIDTHxHEIGHT")
        self.write("header.mp4", self.read("in.mp4")[:1200] + noise)
        self.refused("header.mp4")
        self.write("header.avi", self.read("in.avi")[:5600] + noise)
        self.refused("header.avi")

    def test_pictures_before_a_cut_are_kept(self):
        self.make("whole.mkv", "-c:v", "ffv1", source="testsrc2=size=64x48:duration=2")
        self.make("whole.mp4", "-c:v", "mpeg4", "-g", "1", "-movflags", "faststart",
                  source="testsrc2=size=64x48:duration=2")
        for name in ("whole.mkv", "whole.mp4"):
            with self.subTest(name=name):
                data = self.read(name)
                self.write("cut", data[: len(data) // 2])
                result = self.zoltenc("cut", "-o", "out.264", "-q")
                self.assert_fails(result, 1, "cut: is cut off", "out.264")
                _, whole = self.given(name)
                _, _, *pictures = self.told(self.read("out.264"))
                self.assertTrue(10 < len(pictures) < 40)
                self.assertEqual(pictures, whole[: len(pictures)])

    def test_a_damaged_picture_is_left_out_and_counted(self):
        self.make("in.mov", "-c:v", "png", source="testsrc2=size=64x48:duration=1")
        pictures = self.read("in.mov").split(b"\x89PNG")
        pictures[4] = bytes(len(pictures[4]))
        self.write("in.mov", b"\x89PNG".join(pictures))
        result = self.assert_succeeds(self.zoltenc("in.mov", "-o", "out.264"))
        self.assertIn("in.mov: 1 picture could not be decoded", result.stderr)
        self.assertEqual(len(self.told(self.read("out.264"))), 2 + 24)

    def test_a_signal_ends_the_wait_for_more(self):
        self.make("in.mkv", "-c:v", "ffv1")
        command = [*ZOLTENC, "--plugin", STUB_ENCODER, "-", "-o", "out.264"]
        with subprocess.Popen(command, cwd=self.folder, stdin=subprocess.PIPE,
                              stderr=subprocess.PIPE, preexec_fn=restore_sigpipe) as process:
            process.stdin.write(self.read("in.mkv")[:-2000])
            process.stdin.flush()
            time.sleep(1)
            process.terminate()
            self.assertEqual(process.wait(timeout=60), 128 + 15)

    def test_an_early_end_does_not_wait_for_more(self):
        self.make("in.mkv", "-c:v", "ffv1")
        command = [*ZOLTENC, "--plugin", STUB_ENCODER, "-", "-n", "2", "-o", "out.264"]
        with subprocess.Popen(command, cwd=self.folder, stdin=subprocess.PIPE,
                              stderr=subprocess.PIPE, preexec_fn=restore_sigpipe) as process:
            process.stdin.write(self.read("in.mkv")[:-1000])
            process.stdin.flush()
            self.assertEqual(process.wait(timeout=30), 0)
        self.assertEqual(len(self.told(self.read("out.264"))), 2 + 2)


class Fitting(InputTest):
    def setUp(self):
        super().setUp()
        self.make("in.mkv", "-c:v", "ffv1", "-pix_fmt", "yuv420p",
                  source="testsrc=size=90x51:rate=25:duration=0.2")

    def test_sizes(self):
        for how, width, height in (("crop", 90, 51), ("pad", 96, 64), ("scale", 96, 48)):
            with self.subTest(fit=how):
                stream, pictures = self.given("in.mkv", "--fit", how)
                self.assertEqual((int(stream["width"]), int(stream["height"])), (width, height))
                self.assertEqual(len(pictures), 5)
        self.assertEqual(self.given("in.mkv"), self.given("in.mkv", "--fit", "crop"))
        self.assert_fails(self.zoltenc("in.mkv", "-o", "out.264", "--fit", "x"), 2, "--fit",
                          "crop, pad, scale")

    def test_scaled_pictures_look_like_those_that_ffmpeg_scales(self):
        size = 96 * 48
        for pixel_format, step in (("yuv420p", size * 3 // 2), ("yuyv422", size * 2),
                                   ("bgra", size * 4), ("rgb24", size * 3)):
            with self.subTest(pixel_format=pixel_format):
                self.ffmpeg("-i", "in.mkv", "-pix_fmt", pixel_format, "-c:v", "rawvideo", "in.nut")
                expected = self.raw("in.nut", pixel_format, "-vf", "scale=96:48")
                for index, sample in enumerate(self.samples("in.nut", "--fit", "scale")):
                    self.assertLess(
                        mean_difference(sample, expected[index * step : (index + 1) * step]), 4)


if __name__ == "__main__":
    unittest.main()
