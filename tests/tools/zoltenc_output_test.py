"""The outputs of zoltenc beside plain elementary streams: containers, live addresses, digests, and
parameter sets for players. The judges are ffmpeg and ffprobe."""

import contextlib
import hashlib
import json
import os
import re
import resource
import signal
import socket
import subprocess
import time

from zoltenc_runner import ENVIRONMENT, FFMPEG, START_CODE, STUB_ENCODER, ZOLTENC, restore_sigpipe, y4m
from zoltenc_stream_test import StreamTest, psnr

FFPROBE = os.path.join(os.path.dirname(FFMPEG), "ffprobe")
# The containers and the clocks in which they count times, ticks a second; none: that of the input.
CLOCKS = {"mp4": None, "mov": None, "mkv": 1000, "flv": 1000, "ts": 90000}


class OutputTest(StreamTest):
    def probe(self, name):
        """What ffprobe, which must have nothing to complain about, tells of a file."""
        result = subprocess.run(
            [FFPROBE, "-v", "warning", "-show_format", "-show_streams", "-show_packets", "-of", "json", name],
            cwd=self.folder, capture_output=True, timeout=60, check=False,
        )
        self.assertEqual((result.returncode, result.stderr), (0, b""))
        return json.loads(result.stdout)

    def stream(self, name, kind="video"):
        """The first stream of this kind, with its packets."""
        found = self.probe(name)
        stream = next(stream for stream in found["streams"] if stream["codec_type"] == kind)
        stream["packets"] = [p for p in found["packets"] if p["stream_index"] == stream["index"]]
        return stream

    def assert_decodes(self, name, frames):
        """ffmpeg decodes all pictures and warns of nothing."""
        result = subprocess.run(
            [FFMPEG, "-v", "warning", "-nostdin", "-i", name, "-map", "0:v", "-fps_mode", "passthrough",
             "-f", "framemd5", "-"],
            cwd=self.folder, capture_output=True, timeout=60, check=False,
        )
        self.assertEqual((result.returncode, result.stderr), (0, b""))
        lines = [line for line in result.stdout.splitlines() if not line.startswith(b"#")]
        self.assertEqual(len(lines), frames)

    def slices(self, name):
        """The slice NAL units of an elementary stream or of a container."""
        stream = self.ffmpeg("-i", name, "-map", "0:v", "-c", "copy", "-f", "h264", "-")
        units = [unit.rstrip(b"\0") for unit in re.split(b"\0\0\1", stream)[1:]]
        return [unit for unit in units if unit[0] & 31 in (1, 5)]


class Digests(OutputTest):
    def test_the_digest_is_that_of_the_elementary_stream(self):
        # Lengths around the digest's blocks of 64 bytes.
        for frames in range(1, 12):
            source = f"synthetic:16x16@25:{frames}"
            stream = self.encode(source, "-o", "-").stdout
            digest = hashlib.md5(stream).hexdigest()
            self.assertEqual(self.encode(source, "--container", "md5").stdout.decode(), digest + "\n")
            self.encode(source, "-o", "x.md5", "--verify", digest.upper())
            self.assertEqual(self.read("x.md5").decode(), digest + "\n")
        self.encode(source, "-o", "out.264", "--verify", digest)
        self.assertEqual(self.read("out.264"), stream)
        self.assertEqual(self.encode(source, "--container", "null").stdout, b"")

    def test_a_stream_of_another_digest_leaves_nothing(self):
        self.write("out.264", b"precious")
        digest = "0123456789abcdef" * 2
        result = self.zoltenc("synthetic:16x16@25:2", "-o", "out.264", "--verify", digest, stub=False)
        found = self.encode("synthetic:16x16@25:2", "--container", "md5").stdout.decode().strip()
        self.assert_fails(result, 1, "out.264", digest, found)
        self.assertEqual((self.files(), self.read("out.264")), (["out.264"], b"precious"))


class Endings(OutputTest):
    def test_names_that_tell_no_format(self):
        known = ".264 .h264 .mp4 .mov .mkv .flv .ts"
        for arguments, *texts in (
            (["-o", "out.avi"], "out.avi", "'.avi'", known),
            (["-o", "out"], "out", "no ending", known),
            (["-o", "dir.mp4/out"], "no ending", known),
            (["-o", "out.mp4", "--container", "mp5"], "--container", "'mp5'", "h264 mp4 mov mkv flv ts"),
            (["-o", "udp://127.0.0.1:9", "--container", "mp4"], "udp://127.0.0.1:9", "ts, flv or mkv"),
            (["-o", "udp://127.0.0.1:9", "--container", "h264"], "udp://127.0.0.1:9", "ts, flv or mkv"),
            (["-o", "out.264", "--container", "null"], "out.264", "-o"),
            (["--container", "mp4"], "-o"),
            (["-o", "out.264", "--verify", "abc"], "--verify", "'abc'", "32"),
            (["-o", "out.mp4", "--plain-headers", "--rewrite-headers"], "--rewrite-headers"),
        ):
            with self.subTest(arguments=arguments):
                self.assert_fails(self.zoltenc("synthetic:16x16@25:1", *arguments), 2, *texts)
                self.assertEqual(self.files(), [])

    def test_the_ending_or_the_option_chooses(self):
        for arguments in (["-o", "OUT.H264"], ["-o", "out.h264"], ["-o", "out", "--container", "h264"],
                          ["-o", "out.mp4", "--container", "h264"]):
            self.encode("synthetic:16x16@25:1", *arguments)
            self.assertEqual(self.read(arguments[1])[:4], START_CODE)


class Headers(OutputTest):
    """--rewrite-headers: what a player learns from an elementary stream."""

    def facts(self, *arguments):
        self.encode(*arguments, "--rewrite-headers", "-o", "out.264")
        return self.stream("out.264")

    def assert_facts(self, stream, **expected):
        self.assertEqual({key: stream.get(key) for key in expected}, expected)

    def test_the_level_is_the_lowest_that_does(self):
        for size, rate, bit_rate, level in (
            ("176x144", "15", "64", 10), ("176x144", "15", "100", 11), ("352x288", "30", "700", 13),
            ("720x576", "25", "0", 30), ("1280x720", "30", "4000", 31), ("1920x1088", "30", "4000", 40),
        ):
            stream = self.facts(f"synthetic:{size}@{rate}:1", "-b", bit_rate)
            self.assert_facts(stream, level=level, has_b_frames=0, r_frame_rate=f"{rate}/1")

    def test_colours_are_those_of_the_conversion_or_of_the_input(self):
        self.write("in.rgb", bytes(32 * 32 * 3))
        self.assert_facts(
            self.facts("in.rgb", "-s", "32x32", "-f", "RGB"), color_range="pc", color_space="smpte170m",
            color_primaries="bt709", color_transfer="iec61966-2-1",
        )
        self.write("in.yuv", bytes(32 * 32 * 3 // 2))
        self.assert_facts(self.facts("in.yuv", "-s", "32x32"), color_range=None, color_space=None)

    def test_slices_stay_as_they_are(self):
        source = "synthetic:100x70@25:12"
        plain = self.encode(source, "-o", "-").stdout.split(START_CODE)
        rewritten = self.encode(source, "-o", "-", "--rewrite-headers").stdout.split(START_CODE)
        self.assertNotEqual(rewritten[1], plain[1])
        self.assertEqual(rewritten[2:], plain[2:])
        self.encode(source, "-o", "padded.264", "--fit", "pad", "--rewrite-headers")
        self.assertEqual(self.probe("padded.264")["streams"][0]["width"], 100)


class Containers(OutputTest):
    source = ["synthetic:100x70@30000/1001:25", "-g", "10"]

    def test_pictures_times_and_headers(self):
        self.encode(*self.source, "-o", "plain.264", "--fit", "pad")
        self.encode(*self.source, "-o", "told.264", "--fit", "pad", "--rewrite-headers")
        told = self.units("told.264")
        for name, clock in CLOCKS.items():
            with self.subTest(container=name):
                file = f"out.{name}"
                self.encode(*self.source, "-o", file)
                self.assert_decodes(file, 25)
                stream = self.stream(file)
                self.assertEqual((stream["width"], stream["height"]), (100, 70))
                self.assertEqual((stream["has_b_frames"], stream["level"]), (0, 12))
                for index, packet in enumerate(stream["packets"]):
                    # Rounded half up to the container's clock.
                    ticks = (2 * index * 1001 * (clock or 0) + 30000) // 60000
                    time_of = ticks / clock if clock else index * 1001 / 30000
                    self.assertEqual(float(packet["pts_time"]), round(time_of, 6), index)
                    self.assertEqual(packet["pts_time"], packet["dts_time"])
                    self.assertEqual("K" in packet["flags"], index % 10 == 0)
                self.assertAlmostEqual(float(self.probe(file)["format"]["duration"]), 25 * 1001 / 30000,
                                       delta=0.0006)
                self.assertEqual(self.slices(file), self.slices("plain.264"))
                # Parameter sets, with their lengths in front of them but for transport streams.
                for unit in told[:2]:
                    before = START_CODE if name == "ts" else len(unit).to_bytes(2, "big")
                    self.assertIn(before + unit, self.read(file))

    def test_the_index_comes_first(self):
        for name in ("mp4", "mov"):
            self.encode(*self.source, "-o", f"out.{name}")
            data = self.read(f"out.{name}")
            self.assertLess(data.index(b"moov"), data.index(b"mdat"))

    def test_equal_runs_give_equal_files(self):
        for name in CLOCKS:
            self.encode(*self.source, "-o", f"a.{name}")
            self.encode(*self.source, "-o", f"b.{name}")
            self.assertEqual(self.read(f"a.{name}"), self.read(f"b.{name}"))

    def test_plain_headers_are_the_encoders(self):
        self.encode(*self.source, "-o", "plain.264")
        self.encode(*self.source, "-o", "out.mp4", "--plain-headers", "--fit", "crop")
        self.assertIn(self.units("plain.264")[0], self.read("out.mp4"))
        self.assertEqual(self.stream("out.mp4")["level"], 22)
        digest = hashlib.md5(self.read("plain.264")).hexdigest()
        self.encode(*self.source, "-o", "out.mp4", "--fit", "crop", "--verify", digest)
        self.assertEqual(self.stream("out.mp4")["level"], 12)

    def test_what_the_input_says_of_its_pictures_is_kept(self):
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=96x64:rate=25:duration=2", "-vf",
                    "select='not(mod(n,3))+not(mod(n,7))',setsar=4/3", "-fps_mode", "vfr", "-c:v", "mpeg4",
                    "-color_range", "tv", "-colorspace", "bt709", "-color_primaries", "bt709", "-color_trc",
                    "bt709", "plain.mp4")
        self.ffmpeg("-i", "plain.mp4", "-c", "copy", "-metadata:s:v", "rotate=90", "in.mp4")
        source = self.stream("in.mp4")
        rotation = source["side_data_list"][0]["rotation"]
        for name, clock in CLOCKS.items():
            with self.subTest(container=name):
                result = self.encode("in.mp4", "-o", f"out.{name}")
                stream = self.stream(f"out.{name}")
                self.assertEqual(stream["sample_aspect_ratio"], "4:3")
                self.assertEqual([stream.get(key) for key in ("color_range", "color_space", "color_primaries",
                                                              "color_transfer")], ["tv"] + ["bt709"] * 3)
                times = [float(packet["pts_time"]) for packet in stream["packets"]]
                self.assertEqual(len(times), len(source["packets"]))
                for time_of, packet in zip(times, source["packets"]):
                    self.assertAlmostEqual(time_of, float(packet["pts_time"]), delta=0.000501)
                if clock is None:
                    self.assertEqual(stream["side_data_list"][0]["rotation"], rotation)
                    self.assertEqual(stream["duration"], source["duration"])
                else:
                    self.assertRegex(result.stderr, "note: .*left out.*rotation")

    def test_odd_sizes_are_shown_as_they_are(self):
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x64:rate=25:duration=0.2", "-vf",
                    "format=rgb24,crop=51:39:0:0:exact=1", "-c:v", "ffv1", "in.mkv")
        for name in CLOCKS:
            self.encode("in.mkv", "-b", "4000", "-o", f"out.{name}")
            stream = self.stream(f"out.{name}")
            # A cropping rectangle counts pairs of samples; these containers have sizes of their own.
            whole = name in ("mp4", "mov", "mkv")
            self.assertEqual((stream["width"], stream["height"]), (51, 39) if whole else (52, 40), name)
        gray = [self.ffmpeg("-i", file, "-frames:v", "1", "-vf", f"scale=out_range={given}", "-pix_fmt", "gray",
                            "-f", "rawvideo", "-") for file, given in (("in.mkv", "pc"), ("out.mp4", "pc"))]
        self.assertGreater(psnr(*gray), 30)

    def test_a_container_on_standard_output(self):
        for name in ("ts", "mkv", "flv"):
            piped = self.encode(*self.source, "-o", "-", "--container", name).stdout
            self.write(f"piped.{name}", piped)
            self.assert_decodes(f"piped.{name}", 25)


class Copies(OutputTest):
    """Audio and subtitles beside the pictures."""

    def setUp(self):
        super().setUp()
        # Two of one time.
        self.write("in.srt", b"1\n00:00:00,500 --> 00:00:01,500\nhello\n\n"
                             b"2\n00:00:00,500 --> 00:00:01,000\nthere\n\n")
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=25:duration=2", "-f", "lavfi", "-i",
                    "sine=sample_rate=48000:duration=3", "-i", "in.srt", "-c:v", "mpeg4", "-c:a", "aac",
                    "-c:s", "srt", "-metadata:s:a", "language=fin", "in.mkv")

    def data(self, name, kind):
        """What the packets of a stream hold."""
        return self.ffmpeg("-i", name, "-map", f"0:{kind}", "-c", "copy", "-f", "data", "-")

    def test_what_the_container_holds_is_copied(self):
        for name, held in (("mp4", "a"), ("mov", "a"), ("mkv", "as"), ("flv", "a")):
            with self.subTest(container=name):
                result = self.encode("in.mkv", "-o", f"out.{name}")
                self.assertEqual("left out" in result.stderr and "subrip" in result.stderr, "s" not in held)
                self.assertEqual(len(self.probe(f"out.{name}")["streams"]), 1 + len(held))
                for kind in held:
                    self.assertEqual(self.data(f"out.{name}", kind), self.data("in.mkv", kind))
                source, copy = self.stream("in.mkv", "audio"), self.stream(f"out.{name}", "audio")
                self.assertEqual([p["pts_time"] for p in copy["packets"]],
                                 [p["pts_time"] for p in source["packets"]])
                if name != "flv":
                    self.assertEqual(copy["tags"]["language"], "fin")
        self.encode("in.mkv", "-o", "out.ts")
        self.assertEqual(len(self.stream("out.ts", "audio")["packets"]),
                         len(self.stream("in.mkv", "audio")["packets"]))
        for arguments in (["-o", "out.mkv", "--no-copy"], ["-o", "out.264"]):
            self.encode("in.mkv", *arguments)
            self.assertEqual(len(self.probe(arguments[1])["streams"]), 1)

    def test_a_part_of_the_input_takes_its_part_of_the_audio(self):
        self.encode("in.mkv", "-o", "out.mkv", "--skip", "10", "-n", "20")
        pictures = self.stream("out.mkv")["packets"]
        self.assertEqual([float(p["pts_time"]) for p in pictures], [i / 25 for i in range(20)])
        audio = [float(p["pts_time"]) for p in self.stream("out.mkv", "audio")["packets"]]
        expected = [float(p["pts_time"]) - 0.4 for p in self.stream("in.mkv", "audio")["packets"]]
        inside = [t for t in expected if -0.0005 <= t < 0.7995]
        self.assertEqual(len(audio), len(inside))
        for time_of, wanted in zip(audio, inside):
            # ffprobe derives these times from the ones before, a millisecond off at times.
            self.assertAlmostEqual(time_of, wanted, delta=0.0011)
        self.assertIn(self.data("out.mkv", "a"), self.data("in.mkv", "a"))


class Failures(OutputTest):
    def test_a_full_disk_leaves_things_as_they_were(self):
        def limit_file_size():
            signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
            resource.setrlimit(resource.RLIMIT_FSIZE, (20000, 20000))

        for name in CLOCKS:
            # Full in mid-stream, and, for an index at the front, only once it is to move there.
            for frames in (200, 18):
                self.write(f"out.{name}", b"precious")
                result = subprocess.run(
                    [*ZOLTENC, f"synthetic:176x144@25:{frames}", "-b", "200", "-o", f"out.{name}"],
                    cwd=self.folder, capture_output=True, text=True, preexec_fn=limit_file_size, check=False,
                )
                if result.returncode == 0:
                    self.assertEqual(frames, 18)
                    continue
                self.assert_fails(result, 1, f"out.{name}", "File too large")
                self.assertEqual(self.read(f"out.{name}"), b"precious")
            self.assertEqual(self.files(), [f"out.{name}"])
            (self.folder / f"out.{name}").unlink()

    def test_outputs_that_cannot_be_written(self):
        self.write("in.y4m", y4m())
        os.link(self.folder / "in.y4m", self.folder / "hard.mkv")
        for arguments, status, *texts in (
            (["-o", "-", "--container", "mp4"], 1, "standard output", "mp4", "--container ts"),
            (["-o", "none/out.mp4"], 1, "none/out.mp4", "No such file"),
            (["-o", "hard.mkv"], 2, "hard.mkv", "input"),
            (["-o", "udp://no.such.host.invalid:9"], 1, "udp://no.such.host.invalid:9", "cannot be written"),
        ):
            with self.subTest(arguments=arguments):
                result = self.zoltenc("in.y4m", *arguments, stub=False)
                self.assert_fails(result, status, *texts)
                self.assertEqual(result.stdout, b"")
        self.assertEqual(self.files(), ["hard.mkv", "in.y4m"])

    def test_a_pipe_that_closes_is_reported(self):
        for name in ("ts", "mkv", "flv"):
            command = [*ZOLTENC, "synthetic:64x64@25:100000", "-o", "-", "--container", name]
            with subprocess.Popen(command, stdout=subprocess.PIPE, stderr=subprocess.PIPE,
                                  preexec_fn=restore_sigpipe, cwd=self.folder) as process:
                process.stdout.read(100)
                process.stdout.close()
                message = process.stderr.read().decode()
                self.assertEqual(process.wait(timeout=60), 1)
            self.assertEqual(message.count("\n"), 1, message)
            self.assertIn("closed", message)


class Live(OutputTest):
    def test_a_live_address_gets_a_stream_that_plays(self):
        with contextlib.closing(socket.socket(socket.AF_INET, socket.SOCK_DGRAM)) as receiver:
            receiver.bind(("127.0.0.1", 0))
            receiver.settimeout(20)
            address = f"udp://127.0.0.1:{receiver.getsockname()[1]}?pkt_size=1316"
            command = [*ZOLTENC, "synthetic:64x48@25:20", "--realtime", "-q", "-o", address]
            with subprocess.Popen(command, cwd=self.folder, stderr=subprocess.PIPE) as process:
                start = time.monotonic()
                received = receiver.recv(2000)
                # At once, not when a buffer is full.
                self.assertLess(time.monotonic() - start, 5)
                self.assertEqual((process.wait(timeout=60), process.stderr.read()), (0, b""))
            receiver.setblocking(False)
            with contextlib.suppress(BlockingIOError):
                while True:
                    received += receiver.recv(2000)
        self.write("got.ts", received)
        self.assert_decodes("got.ts", 20)

    def test_realtime_takes_the_time_of_the_pictures(self):
        start = time.monotonic()
        self.encode("synthetic:64x48@25:21", "--realtime", "--container", "null")
        taken = time.monotonic() - start
        self.assertGreater(taken, 0.8)
        self.assertLess(taken, 5)

    def test_a_signal_wakes_and_finishes_the_file(self):
        for number in (signal.SIGINT, signal.SIGTERM):
            # The next picture would come in 1000 s.
            command = [*ZOLTENC, "--plugin", STUB_ENCODER, "synthetic:64x48@1/1000:9", "--realtime", "-o", "out.264"]
            with subprocess.Popen(command, cwd=self.folder, stderr=subprocess.PIPE, env=ENVIRONMENT) as process:
                time.sleep(0.5)
                process.send_signal(number)
                self.assertEqual(process.wait(timeout=10), 128 + number)
                process.stderr.read()


if __name__ == "__main__":
    import unittest

    unittest.main()
