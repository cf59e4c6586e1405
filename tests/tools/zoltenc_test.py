"""zoltenc as a host: what it takes from its input, hands to the encoder library and leaves behind.
The stub encoder library writes down what it was given."""

import os
import pathlib
import resource
import signal
import subprocess
import time
import unittest

from zoltenc_runner import (
    EMULATOR,
    ENCODER_LIBRARY,
    ENVIRONMENT,
    NO_ENCODER,
    START_CODE,
    STUB_ENCODER,
    ZOLTENC,
    ZOLTENC_FILE,
    ToolTest,
    fnv1a,
    native_only,
    picture,
    restore_sigpipe,
    y4m,
)


class Usage(ToolTest):
    def test_wrong_command_lines_name_the_option_and_what_would_be_right(self):
        self.write("in.y4m", y4m())
        cases = [
            (["-b", "4001"], "--bitrate", "0 to 4000"),
            (["-b", "-1"], "--bitrate", "0 to 4000"),
            (["-b", "fast"], "--bitrate", "0 to 4000"),
            (["-b", "200.5"], "--bitrate", "0 to 4000"),
            (["-g", "0"], "--keyint", "from 1"),
            (["-t", "0"], "--threads", "1 to 256"),
            (["-t", "257"], "--threads", "1 to 256"),
            (["-g", "-30"], "--keyint", "from 1"),
            (["-g", "99999999999"], "--keyint", "from 1"),
            (["-n", "0"], "--frames", "from 1"),
            (["--skip", "-1"], "--skip", "from 0"),
            (["-r", "0"], "--fps", "30000/1001"),
            (["-r", "1001"], "--fps", "1000"),
            (["-r", "25fps"], "--fps", "30000/1001"),
            (["-s", "176"], "--size", "WIDTHxHEIGHT"),
            (["-s", "8x144"], "--size", "16x16"),
            (["-s", "176x144", "-f", "NV12"], "--format", "IYUV"),
            (["-f", "IYUV"], "-s WIDTHxHEIGHT"),
            (["-q", "-v"], "--verbose"),
            (["--no-such-option"], "--no-such-option"),
            (["another.y4m"], "another.y4m"),
            (["-b"], "--bitrate"),
            (["--stats", "out.264"], "out.264", "--stats"),
            (["--stats", "in.y4m"], "in.y4m", "input"),
            (["--stats", "-"], "--stats"),
            (["--report", "-"], "--report", "file"),
            (["--report", ""], "--report", "file name"),
            (["--report", "out.264"], "out.264", "--report"),
            (["--report", "in.y4m"], "in.y4m", "input"),
            (["--stats", "x", "--report", "x"], "x", "--stats", "--report"),
        ]
        for options, *texts in cases:
            with self.subTest(options=options):
                result = self.zoltenc("in.y4m", "-o", "out.264", *options)
                self.assert_fails(result, 2, *texts)
                self.assertEqual(self.files(), ["in.y4m"])

    def test_an_input_needs_an_output(self):
        self.write("in.y4m", y4m())
        self.assert_fails(self.zoltenc("in.y4m"), 2, "-o")
        self.assert_fails(self.zoltenc("in.y4m", "-o", ""), 2, "file name")
        self.assert_fails(self.zoltenc("synthetic:0x0", "-o", "out.264"), 2, "16x16")

    def test_sizes_beyond_every_level_are_refused_before_anything_is_written(self):
        limits = "too large", "16880 samples a side", "139264 macroblocks"
        for size in ("16x20000", "16881x16", "16x53687040", "16880x2128", "16880x16880",
                     "2147483647x2147483647"):
            for source in ([f"synthetic:{size}@25:1"], ["/dev/zero", "-s", size],
                           ["/dev/zero", "-s", size, "-f", "RGBA"]):
                with self.subTest(source=source):
                    result = self.zoltenc(*source, "-n", "1", "-o", "out.264", stub=False)
                    self.assert_fails(result, 2, size, *limits)
                    self.assertEqual(self.files(), [])
        for size in ("16x16880", "16880x2112"):
            self.assert_succeeds(self.zoltenc("/dev/zero", "-s", size, "-n", "1", "-o", "out.264"))


class Help(ToolTest):
    def test_help_and_version_go_to_standard_output(self):
        for option, text in (("--help", b"--keyint"), ("--version", b"zoltenc ")):
            result = self.assert_succeeds(self.zoltenc(option))
            self.assertIn(text, result.stdout)
            self.assertEqual(result.stderr, "")
        self.assertEqual(self.files(), [])


class BadInput(ToolTest):
    def refused(self, name, data, *texts, options=()):
        with self.subTest(name=name):
            self.write(name, data)
            self.assert_fails(self.zoltenc(name, "-o", "out.264", *options), 1, name, *texts)
            self.assertEqual(self.files(), [name])
            (self.folder / name).unlink()

    def test_inputs_that_cannot_be_coded(self):
        self.refused("empty", b"", "is empty")
        self.refused("cut.y4m", b"YUV4MPEG2 W32 H16", "header", "cut off")
        self.refused("magic.y4m", b"YUV4M", "header", "cut off")
        self.refused("none.y4m", y4m(frames=0), "no picture")
        self.refused("ten.y4m", y4m(parameters="C420p10 XYSCSS=420P10"), "420p10", "yuv420p")
        self.refused("full.y4m", y4m(parameters="C444"), "444", "8-bit 4:2:0")
        self.refused("low.y4m", y4m(width=32, height=8), "32x8", "16x16")
        self.refused("huge.y4m", y4m(width=20000, height=16, frames=0), "20000x16", "too large")
        self.refused("damaged.y4m", y4m(frame_line="FRAMED"), "FRAME")
        self.refused("short.y4m", y4m(frames=2), "no picture", "--skip", options=["--skip", "2"])
        self.refused("first.y4m", y4m(frames=1)[:-1], "picture 0", "cut off")
        self.refused("clip.mp4", b"\0\0\0\x20ftypisom" + bytes(500), "not Y4M", "-s")
        self.refused("short.yuv", bytes(100), "picture 0", "-s", options=["-s", "32x16"])

    def test_inputs_that_are_not_there(self):
        self.assert_fails(self.zoltenc("none.y4m", "-o", "out.264"), 1, "none.y4m", "No such file")
        self.assert_fails(self.zoltenc(".", "-o", "out.264"), 1, "directory")
        self.assert_fails(self.zoltenc("-", "-o", "out.264"), 1, "standard input", "empty")
        self.assertEqual(self.files(), [])

    def test_whole_pictures_before_a_cut_are_kept(self):
        self.write("in.y4m", y4m(frames=3)[:-1])
        result = self.zoltenc("in.y4m", "-o", "out.264", "-q")
        self.assert_fails(result, 1, "in.y4m", "picture 2", "cut off", "out.264")
        self.assertEqual(self.files(), ["in.y4m", "out.264"])
        self.assertEqual(len(self.told(self.read("out.264"))), 2 + 2)

    def test_damage_in_mid_stream_leaves_nothing_unless_asked(self):
        self.write("in.y4m", y4m(frames=2) + b"noise" + y4m(frames=1))
        self.assert_fails(self.zoltenc("in.y4m", "-o", "out.264"), 1, "picture 2", "FRAME")
        self.assertEqual(self.files(), ["in.y4m"])
        result = self.zoltenc("in.y4m", "-o", "out.264", "--keep-partial")
        self.assert_fails(result, 1, "picture 2", "FRAME")
        self.assertEqual(len(self.told(self.read("out.264"))), 2 + 2)


class BadLibrary(ToolTest):
    def setUp(self):
        super().setUp()
        self.write("in.y4m", y4m())

    def refused(self, plugin, *texts, stub_does=""):
        result = self.zoltenc(
            "in.y4m", "-o", "out.264", "--plugin", plugin, stub=False, stub_does=stub_does
        )
        self.assert_fails(result, 1, *texts)
        self.assertEqual(result.stdout, b"")
        self.assertNotIn("out.264", self.files())

    def test_libraries_that_are_no_encoder(self):
        self.write("text.so", b"no library")
        self.refused("none.so", "none.so", "cannot be loaded")
        self.refused("text.so", "text.so", "cannot be loaded")
        self.refused(NO_ENCODER, NO_ENCODER, "GetEncoderType")
        self.refused(STUB_ENCODER, STUB_ENCODER, "Video JPEG", "Video AVC", stub_does="type")
        self.refused(STUB_ENCODER, STUB_ENCODER, "no encoder object", stub_does="null")

    def test_encoders_that_fail(self):
        self.refused(STUB_ENCODER, "refuses the input: reason 42", stub_does="refuse")
        self.refused(STUB_ENCODER, "dropped picture 2", stub_does="drop at 2")

    def test_the_error_text_is_that_of_the_programs_own_error_manager(self):
        result = self.zoltenc(
            "in.y4m",
            "-o",
            "-",
            stub_does="refuse",
            environment={"STREAMING_ENGINE_LIB": str(self.folder)},
        )
        self.assert_fails(result, 1, "refuses the input")
        self.assertNotIn("42", result.stderr)
        self.assertEqual(result.stdout, b"")

    def test_an_encoder_that_ends_the_process_leaves_no_file(self):
        result = self.zoltenc("in.y4m", "-o", "out.264", stub_does="exit at 2")
        self.assertEqual(result.returncode, 109)
        self.assertEqual(self.files(), ["in.y4m"])

    def test_the_library_beside_the_program_is_the_default(self):
        copy = self.folder / "copy"
        copy.mkdir()
        program = copy / pathlib.Path(ZOLTENC_FILE).name
        program.write_bytes(pathlib.Path(ZOLTENC_FILE).read_bytes())
        program.chmod(0o755)
        command = [*EMULATOR, program, "in.y4m", "-o", "out.264"]
        alone = subprocess.run(command, cwd=self.folder, capture_output=True, check=False)
        self.assertEqual(alone.returncode, 1)
        self.assertIn(ENCODER_LIBRARY.encode(), alone.stderr)
        (copy / ENCODER_LIBRARY).symlink_to(STUB_ENCODER)
        subprocess.run(command, cwd=self.folder, capture_output=True, check=True)
        self.assertEqual(len(self.told(self.read("out.264"))), 2 + 3)


class Inputs(ToolTest):
    def coded(self, *arguments, **settings):
        result = self.assert_succeeds(self.zoltenc(*arguments, "-o", "-", **settings))
        return self.told(result.stdout)

    def test_the_encoder_gets_settings_and_pictures(self):
        self.write("in.y4m", y4m(frames=3))
        size = 32 * 16 * 3 // 2
        sps, pps, *pictures = self.coded("in.y4m", "-b", "321", "-g", "2")
        self.assertEqual(
            sps, {"width": "32", "height": "16", "format": b"IYUV".hex(), "fps": "25.000000"}
        )
        self.assertEqual(pps, {"bitrate": "321", "keyint": "2"})
        self.assertEqual([int(p["time"]) for p in pictures], [0, 40000, 80000])
        self.assertEqual([int(p["size"]) for p in pictures], [size] * 3)
        self.assertEqual([p["digest"] for p in pictures], [fnv1a(picture(i, size)) for i in range(3)])

    def test_settings_without_options(self):
        self.write("in.yuv", bytes(768))
        sps, pps, _ = self.coded("in.yuv", "-s", "32x16")
        self.assertEqual(sps["fps"], "30.000000")
        self.assertEqual(pps, {"bitrate": "200", "keyint": "30"})

    def test_parameter_sets_come_again_when_the_encoder_announces_them_again(self):
        self.write("in.y4m", y4m(frames=4))
        sps, pps, *rest = self.coded("in.y4m", stub_does="announce at 2")
        self.assertEqual(rest[2:4], [sps, pps])
        self.assertEqual([unit["index"] for unit in rest[:2] + rest[4:]], ["0", "1", "2", "3"])

    def test_y4m_oddities_change_nothing(self):
        plain = y4m(parameters="F25:1")
        self.write("in.y4m", plain)
        expected = self.coded("in.y4m")
        for parameters in (
            "F25:1 Ip A1:1 C420",
            "F50:2 I? A0:0 C420jpeg XYSCSS=420JPEG XCOLORRANGE=FULL",
            " F25:1  It C420mpeg2 ",
            "Ib F25:1 C420paldv Xcomment=YUV4MPEG2_W64_H64",
        ):
            with self.subTest(parameters=parameters):
                self.write("odd.y4m", y4m(parameters=parameters, frame_line="FRAME Ip Xa=b"))
                self.assertEqual(self.coded("odd.y4m"), expected)

    def test_frame_rates_give_exact_sample_times(self):
        for parameters, options, times, fps in (
            ("F30000:1001", [], [0, 33366, 66733, 100100], "29.970030"),
            ("F30:1", ["-r", "10"], [0, 33333, 66666, 100000], "30.000000"),
            ("F0:0", ["-r", "12.5"], [0, 80000, 160000, 240000], "12.500000"),
            ("Ip", ["-r", "24000/1001"], [0, 41708, 83416, 125125], "23.976024"),
            ("Ip", [], [0, 33333, 66666, 100000], "30.000000"),
        ):
            with self.subTest(parameters=parameters, options=options):
                self.write("in.y4m", y4m(frames=4, parameters=parameters))
                sps, _, *pictures = self.coded("in.y4m", *options)
                self.assertEqual(sps["fps"], fps)
                self.assertEqual([int(p["time"]) for p in pictures], times)

    def test_raw_pictures_of_every_format(self):
        for name, size in (
            ("IYUV", 18 * 20 * 3 // 2),
            ("YUY2", 18 * 20 * 2),
            ("AYUV", 18 * 20 * 4),
            ("BGRA", 18 * 20 * 4),
            ("RGBA", 18 * 20 * 4),
            ("ARGB", 18 * 20 * 4),
            ("BGR ", 18 * 20 * 3),
            ("RGB ", 18 * 20 * 3),
        ):
            with self.subTest(format=name):
                self.write("in.raw", picture(1, size) + picture(2, size))
                sps, _, *pictures = self.coded("in.raw", "-s", "18x20", "-f", name)
                self.assertEqual(sps["format"], name.encode().hex())
                self.assertEqual(
                    [p["digest"] for p in pictures], [fnv1a(picture(i, size)) for i in (1, 2)]
                )

    def test_odd_sizes_are_brought_to_the_encoders_layout(self):
        size = 17 * 19 + 2 * 9 * 10
        stored = picture(1, size)
        luma, planes = stored[: 17 * 19], (stored[17 * 19 : 17 * 19 + 90], stored[17 * 19 + 90 :])
        chroma = b"".join(plane[y * 9 : y * 9 + 8] for plane in planes for y in range(9))
        self.write("in.yuv", stored)
        _, _, coded = self.coded("in.yuv", "-s", "17x19")
        self.assertEqual(coded["digest"], fnv1a(luma + chroma))

    def test_frames_and_skip_choose_the_pictures(self):
        self.write("in.y4m", y4m(frames=6))
        _, _, *everything = self.coded("in.y4m")
        digests = [p["digest"] for p in everything]
        for options, expected in (
            (["-n", "2"], digests[:2]),
            (["-n", "60"], digests),
            (["--skip", "4"], digests[4:]),
            (["--skip", "1", "-n", "3"], digests[1:4]),
        ):
            with self.subTest(options=options):
                _, _, *pictures = self.coded("in.y4m", *options)
                self.assertEqual([p["digest"] for p in pictures], expected)
                self.assertEqual([p["time"] for p in pictures],
                                 [p["time"] for p in everything[: len(expected)]])

    def test_standard_input_is_read_as_a_file_is(self):
        self.write("in.y4m", y4m())
        self.assertEqual(self.coded("-", stdin=y4m()), self.coded("in.y4m"))
        raw = picture(1, 768)
        self.write("in.yuv", raw)
        self.assertEqual(
            self.coded("-", "-s", "32x16", stdin=raw), self.coded("in.yuv", "-s", "32x16")
        )

    def test_the_built_in_picture(self):
        sps, _, *pictures = self.coded("synthetic:48x32@24:5")
        self.assertEqual((sps["width"], sps["height"], sps["fps"]), ("48", "32", "24.000000"))
        self.assertEqual(len({p["digest"] for p in pictures}), 5)
        again = self.coded("synthetic:48x32@24:5", "--skip", "2", "-n", "2")[2:]
        self.assertEqual([p["digest"] for p in again], [p["digest"] for p in pictures[2:4]])
        self.assertEqual(self.coded("synthetic:48x32", "-r", "12", "-n", "1")[0]["fps"], "12.000000")

    def test_names_in_any_script(self):
        name, output = "\u00e4 \u65e5\u672c.y4m", "\u00f6\u672c.264"
        self.write(name, y4m())
        result = self.assert_succeeds(self.zoltenc(name, "-o", output, "--stats", "\u65e5.csv"))
        self.assertTrue(result.stderr.startswith(output + ": 3 frames"), result.stderr)
        self.assertEqual(self.files(), sorted([name, output, "\u65e5.csv"]))
        self.assert_fails(self.zoltenc("\u672c.y4m", "-o", "-"), 1, "\u672c.y4m", "No such file")

    def test_bytes_are_not_text(self):
        """Line ends, and the character that ends texts on some systems, in pictures and streams."""
        size = 32 * 16 * 3 // 2
        frames = [(bytes([0x1A, 0x0D, 0x0A, 0x0A, 0x0D, 0xFF]) * size)[i : i + size] for i in range(6)]
        raw = b"".join(frames)
        self.write("in.yuv", raw)
        for source, stdin in (("in.yuv", b""), ("-", raw)):
            _, _, *pictures = self.coded(source, "-s", "32x16", stdin=stdin)
            self.assertEqual([p["digest"] for p in pictures], [fnv1a(f) for f in frames])
        # The real encoder's stream has every byte.
        noise = ["synthetic:352x288@25:30", "-b", "4000"]
        stream = self.assert_succeeds(self.zoltenc(*noise, "-o", "-", stub=False)).stdout
        for byte in b"\x1a\r\n":
            self.assertIn(byte, stream)
        self.assert_succeeds(self.zoltenc(*noise, "-o", "out.264", stub=False))
        self.assertEqual(self.read("out.264"), stream)

    def test_files_beyond_two_gibibytes(self):
        with open(self.folder / "large.yuv", "wb") as large:
            large.truncate(3 << 30)
        self.coded("large.yuv", "-s", "32x16", "-n", "1")
        self.write("in.y4m", y4m())
        self.assert_succeeds(self.zoltenc("in.y4m", "-o", "large.yuv", "--container", "h264"))
        self.assertEqual(len(self.told(self.read("large.yuv"))), 2 + 3)

    def test_notes_say_what_is_not_used(self):
        self.write("in.y4m", y4m(width=40, parameters="F25:1 It"))
        result = self.zoltenc("in.y4m", "-o", "out.264", "-r", "10", "-s", "64x64")
        for text in ("--fps", "--size", "interlaced", "32x16"):
            self.assertIn(text, result.stderr)
        quiet = self.zoltenc("in.y4m", "-o", "out.264", "-r", "10", "-s", "64x64", "-q")
        self.assertEqual(quiet.stderr, "")


class Outputs(ToolTest):
    def setUp(self):
        super().setUp()
        self.write("in.y4m", y4m())

    def test_a_failed_run_leaves_an_existing_file_alone(self):
        self.write("out.264", b"precious")
        self.write("out.csv", b"too")
        result = self.zoltenc("in.y4m", "-o", "out.264", "--stats", "out.csv", stub_does="drop at 2")
        self.assertEqual(result.returncode, 1)
        self.assertEqual(self.read("out.264"), b"precious")
        self.assertEqual(self.read("out.csv"), b"too")
        self.assertEqual(self.files(), ["in.y4m", "out.264", "out.csv"])

    @native_only
    def test_a_new_file_takes_the_place_and_the_mode_of_an_old_one(self):
        self.write("old.264", b"x" * 100000)
        (self.folder / "old.264").chmod(0o640)
        (self.folder / "link.264").symlink_to("old.264")
        self.assert_succeeds(self.zoltenc("in.y4m", "-o", "link.264"))
        self.assertTrue((self.folder / "link.264").is_symlink())
        self.assertEqual(len(self.told(self.read("old.264"))), 2 + 3)
        self.assertEqual((self.folder / "old.264").stat().st_mode & 0o777, 0o640)
        self.assertEqual(self.files(), ["in.y4m", "link.264", "old.264"])

    def test_outputs_that_cannot_be_written(self):
        self.assert_fails(self.zoltenc("in.y4m", "-o", "none/out.264"), 1, "none/out.264", "written")
        self.assert_fails(self.zoltenc("in.y4m", "-o", "."), 1, "directory")
        self.assert_fails(
            self.zoltenc("in.y4m", "-o", "out.264", "--stats", "none/s.csv"), 1, "none/s.csv"
        )
        self.assertEqual(self.files(), ["in.y4m"])

    @native_only
    def test_a_write_that_fails_leaves_nothing(self):
        def limit_file_size():
            signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
            resource.setrlimit(resource.RLIMIT_FSIZE, (200, 200))

        command = [*ZOLTENC, "--plugin", STUB_ENCODER, "in.y4m", "-o", "out.264"]
        result = subprocess.run(
            command,
            cwd=self.folder,
            capture_output=True,
            text=True,
            preexec_fn=limit_file_size,
            check=False,
        )
        self.assert_fails(result, 1, "out.264", "File too large")
        self.assertEqual(self.files(), ["in.y4m"])

    def test_the_input_is_never_overwritten(self):
        (self.folder / "same.y4m").symlink_to("in.y4m")
        os.link(self.folder / "in.y4m", self.folder / "hard.y4m")
        for name in ("in.y4m", "./in.y4m", "same.y4m", "hard.y4m"):
            with self.subTest(output=name):
                result = self.zoltenc("in.y4m", "-o", name, "--container", "h264")
                self.assert_fails(result, 2, "input")
        self.assertEqual(self.read("in.y4m"), y4m())

    @native_only  # Wine does not tell which file a standard stream is.
    def test_standard_input_is_never_overwritten(self):
        with open(self.folder / "in.y4m", "rb") as stdin:
            command = [*ZOLTENC, "--plugin", STUB_ENCODER, "-", "-o", "in.y4m",
                       "--container", "h264"]
            result = subprocess.run(
                command, cwd=self.folder, stdin=stdin, capture_output=True, check=False
            )
        self.assertEqual(result.returncode, 2)
        self.assertEqual(self.read("in.y4m"), y4m())

    # Only with things of the test's own: a program that replaced a device would replace the machine's.
    @native_only
    def test_what_is_no_regular_file_is_written_in_place(self):
        os.mkfifo(self.folder / "pipe")
        with subprocess.Popen(
            ["cat", "pipe"], cwd=self.folder, stdout=subprocess.PIPE
        ) as reader:
            self.assert_succeeds(self.zoltenc("in.y4m", "-o", "pipe"))
            self.assertEqual(len(self.told(reader.stdout.read())), 2 + 3)
        self.assertTrue((self.folder / "pipe").is_fifo())

        (self.folder / "stdout").symlink_to("/proc/self/fd/1")
        result = self.assert_succeeds(self.zoltenc("in.y4m", "-o", "stdout"))
        self.assertEqual(len(self.told(result.stdout)), 2 + 3)
        self.assertTrue((self.folder / "stdout").is_symlink())

    def test_standard_output_holds_the_stream_alone(self):
        plain = self.zoltenc("in.y4m", "-o", "-").stdout
        result = self.assert_succeeds(
            self.zoltenc("in.y4m", "-o", "-", "-v", stub_does="chatter")
        )
        self.assertEqual(result.stdout, plain)
        self.assertIn("chatter", result.stderr)
        self.assertNotIn(
            "chatter", self.zoltenc("in.y4m", "-o", "out.264", stub_does="chatter").stderr
        )

    @native_only
    def test_a_closed_standard_output_is_an_error_and_not_a_file(self):
        command = f"'{ZOLTENC_FILE}' --plugin '{STUB_ENCODER}' in.y4m -o"
        closed = subprocess.run(
            f"{command} - >&-", shell=True, cwd=self.folder, capture_output=True, check=False
        )
        self.assertEqual(closed.returncode, 1)
        self.assertIn(b"standard output", closed.stderr)
        subprocess.run(f"{command} out.264 >&- <&-", shell=True, cwd=self.folder, check=True)
        self.assertEqual(len(self.told(self.read("out.264"))), 2 + 3)

    def test_a_pipe_that_closes_is_reported(self):
        command = [*ZOLTENC, "--plugin", STUB_ENCODER, "synthetic:64x64@25:100000", "-o", "-"]
        with subprocess.Popen(
            command, stdout=subprocess.PIPE, stderr=subprocess.PIPE, preexec_fn=restore_sigpipe
        ) as process:
            process.stdout.read(100)
            process.stdout.close()
            message = process.stderr.read().decode()
            self.assertEqual(process.wait(timeout=60), 1)
        self.assertEqual(message.count("\n"), 1, message)
        self.assertIn("standard output", message)
        self.assertIn("closed", message)

    def test_the_summary_and_quiet(self):
        result = self.assert_succeeds(self.zoltenc("in.y4m", "-o", "out.264"))
        size = (self.folder / "out.264").stat().st_size
        # The rate is that of the pictures' units, without parameter sets and start codes.
        pictures = self.read("out.264").split(START_CODE)[3:]
        rate = sum(map(len, pictures)) * 8 * 25 / 3 / 1000
        off = 100 * (rate / 200 - 1)
        self.assertRegex(
            result.stderr,
            rf"^out\.264: 3 frames in [\d.]+ s \([\d.]+ frames/s, [\d.]+x\), {size} bytes, "
            rf"{rate:.1f} kbit/s of 200 \({off:+.1f} %\)\n$",
        )
        self.assertEqual(self.zoltenc("in.y4m", "-o", "out.264", "-q").stderr, "")

    def test_without_arguments_the_test_picture_goes_to_a_file(self):
        result = self.assert_succeeds(self.zoltenc())
        self.assertEqual(self.files(), ["in.y4m", "out.264"])
        self.assertIn("ffplay out.264", result.stderr)


class Signals(ToolTest):
    def start(self, *arguments, **streams):
        command = [*ZOLTENC, "--plugin", STUB_ENCODER, *arguments]
        return subprocess.Popen(
            command, cwd=self.folder, stderr=subprocess.PIPE, preexec_fn=restore_sigpipe, **streams
        )

    def wait_for_growth(self):
        """Until the unfinished file beside the output has bytes."""
        deadline = time.monotonic() + 60
        while time.monotonic() < deadline:
            if any(entry.stat().st_size > 1000 for entry in self.folder.iterdir()):
                return
            time.sleep(0.01)
        self.fail("nothing was written")

    def test_a_signal_finishes_the_file(self):
        # An emulator hands on the first as Ctrl-C and has nothing for the other.
        for number in (signal.SIGINT,) if EMULATOR else (signal.SIGINT, signal.SIGTERM):
            with self.subTest(signal=number):
                with self.start("synthetic:64x64@25:100000000", "-o", "out.264") as process:
                    self.wait_for_growth()
                    process.send_signal(number)
                    message = process.stderr.read().decode()
                    self.assertEqual(process.wait(timeout=60), 128 + number)
                self.assertIn("stopped", message)
                self.assertEqual(self.files(), ["out.264"])
                _, _, *pictures = self.told(self.read("out.264"))
                self.assertIn(f"{len(pictures)} frames", message)
                (self.folder / "out.264").unlink()

    @native_only  # Wine cannot cancel a read from a pipe of the system below it.
    def test_a_signal_ends_the_wait_for_input(self):
        with self.start("-", "-o", "out.264", stdin=subprocess.PIPE) as process:
            process.stdin.write(y4m(frames=20) + b"FRAME\npart of a picture")
            process.stdin.flush()
            self.wait_for_growth()
            time.sleep(0.3)
            process.send_signal(signal.SIGINT)
            self.assertEqual(process.wait(timeout=60), 128 + signal.SIGINT)
            self.assertNotIn(b"cut off", process.stderr.read())
        self.assertEqual(len(self.told(self.read("out.264"))), 2 + 20)

    @native_only  # Wine cannot cancel a read from a pipe of the system below it.
    def test_a_signal_before_the_first_picture_leaves_nothing(self):
        with self.start("-", "-o", "out.264", stdin=subprocess.PIPE) as process:
            time.sleep(0.5)
            process.send_signal(signal.SIGINT)
            self.assertEqual(process.wait(timeout=60), 128 + signal.SIGINT)
        self.assertEqual(self.files(), [])


if __name__ == "__main__":
    unittest.main()
