"""Invocations of zoltenc that must fail: each with one line that names what is at fault and what would
be right, the status that is documented, nothing left behind, and an existing file as it was."""

import os
import random
import resource
import signal
import struct
import unittest

from zoltenc_stream_test import StreamTest

AS_IT_WAS = b"as it was"
TEST_PICTURE = ("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=25")

USAGE = 2
FAILURE = 1


class BadInvocations(StreamTest):
    # Arguments, status, and what the line must hold.
    inputs = (
        (["none.mp4"], FAILURE, "none.mp4: cannot be read: No such file"),
        (["."], FAILURE, ".: cannot be read: Is a directory"),
        (["empty.mp4"], FAILURE, "empty.mp4: is empty"),
        (["headless.mp4"], FAILURE, "headless.mp4", "nor can it be read as another video"),
        (["header.mkv"], FAILURE, "header.mkv", "nor can it be read as another video"),
        (["noise.mp4"], FAILURE, "noise.mp4", "nor can it be read as another video"),
        (["noise"], FAILURE, "noise", "nor can it be read as another video", "-s WIDTHxHEIGHT"),
        (["hostile.mp4"], FAILURE, "hostile.mp4", "nor can it be read as another video"),
        (["sound.mp4"], FAILURE, "sound.mp4", "holds no video", "1 audio"),
        (["cover.m4a"], FAILURE, "cover.m4a", "holds no video", "1 cover picture"),
        (["codec.avi"], FAILURE, "codec.avi", "no decoder", "--list-formats"),
        (["tiny.mkv"], FAILURE, "tiny.mkv", "8x8 is too small", "16x16"),
        (["thin.mkv"], FAILURE, "thin.mkv", "1x64 is too small", "16x16"),
        (["video.mp4", "--skip", "50"], FAILURE, "video.mp4", "no picture", "--skip"),
        (["short.raw", "-s", "64x48"], FAILURE, "short.raw", "picture 0"),
        (["http://127.0.0.1:1/x.mp4"], FAILURE, "http://127.0.0.1:1/x.mp4", "Connection refused"),
        (["v4l2:/dev/none"], FAILURE, "v4l2:/dev/none", "No such file", "--list-formats"),
        (["-"], FAILURE, "standard input", "is empty"),
        (["synthetic:9x9"], USAGE, "synthetic:9x9", "9x9 is too small", "16x16"),
        (["synthetic:64x64@0"], USAGE, "synthetic:64x64@0", "frame rate", "30000/1001"),
        (["video.mp4", "video.mkv"], USAGE, "not expected", "video.mkv"),
    )
    options = (
        (["--bitrate", "4001"], USAGE, "--bitrate", "'4001'", "0 to 4000"),
        (["--keyint", "0"], USAGE, "--keyint", "from 1"),
        (["--frames", "many"], USAGE, "--frames", "from 1"),
        (["--fps", "0"], USAGE, "--fps", "30000/1001"),
        (["--size", "64"], USAGE, "--size", "WIDTHxHEIGHT"),
        (["--format", "IYUV"], USAGE, "--format", "-s WIDTHxHEIGHT"),
        (["--fit", "stretch"], USAGE, "--fit", "'stretch'", "crop, pad, scale"),
        (["--verify", "123"], USAGE, "--verify", "32 hexadecimal digits"),
        (["--verify", 32 * "0"], FAILURE, "out.mp4", 32 * "0", "--verify"),
        (["--container", "avi"], USAGE, "--container", "'avi'", "mkv"),
        (["--container", "null"], USAGE, "--container null", "leave out -o out.mp4"),
        (["--plain-headers", "--rewrite-headers"], USAGE, "--plain-headers excludes --rewrite-headers"),
        (["--quiet", "--verbose"], USAGE, "--quiet excludes --verbose"),
        (["--bitrate", "0", "--match-rate"], USAGE, "--match-rate", "1 to 4000"),
        (["--plugin", "none.so"], FAILURE, "none.so", "cannot be loaded"),
        (["--stats", "out.mp4"], USAGE, "out.mp4", "name different files"),
        (["--stats", "video.mp4"], USAGE, "video.mp4", "is the input too"),
        (["--stats", "/dev/full"], FAILURE, "/dev/full", "No space left"),
        (["--report", "none/report.html"], FAILURE, "none/report.html", "No such file"),
        (["--report", "-"], USAGE, "--report", "name a file"),
        (["--turbo"], USAGE, "--turbo", "--help"),
    )
    outputs = (
        ([], USAGE, "-o is missing"),
        (["-o", ""], USAGE, "an output needs a file name"),
        (["-o", "out"], USAGE, "out: has no ending", ".mp4"),
        (["-o", "out.avi"], USAGE, "'.avi'", ".mp4", "--container"),
        (["-o", "none/out.mp4"], FAILURE, "none/out.mp4", "No such file"),
        (["-o", "folder.mp4"], FAILURE, "folder.mp4", "Is a directory"),
        (["-o", "/dev/full", "--container", "ts"], FAILURE, "/dev/full", "No space left"),
        (["-o", "-", "--container", "mp4"], FAILURE, "standard output", "mp4", "--container ts"),
        (["-o", "video.mp4"], USAGE, "video.mp4: is the input too"),
        (["-o", "link.mp4"], USAGE, "link.mp4: is the input too"),
        (["-o", "rtmp://127.0.0.1:1/x"], FAILURE, "rtmp://127.0.0.1:1/x", "Connection refused"),
        (["-o", "http://127.0.0.1:1/x.mp4"], USAGE, "http://127.0.0.1:1/x.mp4", "udp:"),
        (["-o", "udp://127.0.0.1:9", "--match-rate"], USAGE, "--match-rate", "udp://127.0.0.1:9"),
    )

    def setUp(self):
        super().setUp()
        self.make_good_files()
        self.make_bad_files()
        self.before = self.contents()

    def make_good_files(self):
        video = (*TEST_PICTURE, "-frames:v", "50")
        self.ffmpeg(*video, "-c:v", "mpeg4", "video.mp4")
        self.ffmpeg(*video, "-c:v", "ffv1", "video.mkv")
        self.ffmpeg(*video, "-c:v", "mpeg4", "video.avi")
        self.ffmpeg("-f", "lavfi", "-i", "sine", "-t", "1", "-c:a", "aac", "sound.mp4")
        self.ffmpeg("-i", "sound.mp4", "-t", "1", *TEST_PICTURE, "-map", "0", "-map", "1", "-frames:v", "1",
                    "-c:a", "copy", "-c:v", "png", "-disposition:v", "attached_pic", "cover.m4a")
        for name, size in (("tiny", "8:8"), ("thin", "1:64")):
            self.ffmpeg("-f", "lavfi", "-i", f"testsrc2=size=64x64,crop={size}:0:0:exact=1",
                        "-frames:v", "3", "-pix_fmt", "yuv444p", "-c:v", "ffv1", f"{name}.mkv")
        self.write("out.mp4", AS_IT_WAS)
        (self.folder / "folder.mp4").mkdir()
        (self.folder / "link.mp4").symlink_to("video.mp4")

    def make_bad_files(self):
        noise = random.Random(1).randbytes(5000)
        mp4 = self.read("video.mp4")
        avi = self.read("video.avi")
        self.write("empty.mp4", b"")
        self.write("headless.mp4", mp4[: mp4.index(b"moov")])
        self.write("header.mkv", self.read("video.mkv")[:300])
        self.write("noise.mp4", mp4[:48] + noise)
        self.write("noise", noise)
        self.write("short.raw", bytes(100))
        self.write("codec.avi", avi.replace(b"FMP4", b"ZQ9X"))
        # A table of samples with an entry count beyond the file.
        count = mp4.index(b"stsz") + 12
        self.write("hostile.mp4", mp4[:count] + struct.pack(">I", 2**32 - 16) + mp4[count + 4 :])

    def contents(self):
        return {name: self.read(name) if (self.folder / name).is_file() else None
                for name in self.files()}

    def refused(self, arguments, status, *texts):
        with self.subTest(arguments=arguments):
            result = self.zoltenc(*arguments, stub=False)
            self.assert_fails(result, status, *texts)
            self.assertEqual(result.stdout, b"")
            self.assertEqual(self.contents(), self.before)

    def test_inputs(self):
        for arguments, *expected in self.inputs:
            self.refused([*arguments, "-o", "out.mp4"], *expected)

    def test_options(self):
        for arguments, *expected in self.options:
            self.refused(["video.mp4", "-o", "out.mp4", *arguments], *expected)
        self.refused(["-", "-o", "out.mp4", "--match-rate"], USAGE, "--match-rate", "name a file")

    def test_outputs(self):
        for arguments, *expected in self.outputs:
            self.refused(["video.mp4", *arguments], *expected)

    def test_a_full_disk(self):
        def limit():
            """The system refuses to make files any longer than this."""
            signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
            resource.setrlimit(resource.RLIMIT_FSIZE, (20000, 20000))

        for name in ("out.mp4", "out.mkv", "out.ts", "out.264"):
            with self.subTest(name=name):
                result = self.zoltenc("synthetic:320x240@25:100", "-o", name, stub=False,
                                      before=limit)
                self.assert_fails(result, FAILURE, name, "File too large")
                self.assertEqual(self.contents(), self.before)

    def test_a_reader_that_is_gone(self):
        for container in ("h264", "ts", "mkv"):
            with self.subTest(container=container):
                reading, writing = os.pipe()
                os.close(reading)
                result = self.zoltenc("video.mp4", "-o", "-", "--container", container, stub=False,
                                      stdout=writing)
                os.close(writing)
                self.assert_fails(result, FAILURE, "standard output", "closed")


if __name__ == "__main__":
    unittest.main()
