"""avcdump as a program: its command line, and its listings of whole streams beside those of two
programs that nobody here wrote."""

import csv
import io
import json
import os
import pathlib
import re
import shlex
import shutil
import subprocess
import tempfile
import unittest

# The command that runs programs of another system than this one.
EMULATOR = shlex.split(os.environ.get("EMULATOR", ""))
AVCDUMP = os.environ["AVCDUMP"]
ZOLTENC = os.environ.get("ZOLTENC", "")
FFMPEG = shutil.which("ffmpeg")
FFPROBE = shutil.which("ffprobe")

SLICE_TYPES = ["P", "B", "I", "SP", "SI"]
COLUMNS = ("type", "first_mb", "slice_type", "frame_num", "idr_pic_id", "pic_order_cnt_lsb", "qp")

# Two parameter sets and an IDR slice of a 176x144 picture.
SMALL_STREAM = bytes.fromhex(
    "00000001674d4016f4162740" "0000000168ce3880" "00000165b804000a1480"
)


def run(*command, **options):
    emulator = EMULATOR if command[0] in (AVCDUMP, ZOLTENC) else []
    return subprocess.run([*emulator, *map(str, command)], capture_output=True, **options)


def avcdump(*arguments, **options):
    return run(AVCDUMP, *arguments, **options)


class InFolder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def write(self, name, data):
        path = self.folder / name
        path.write_bytes(data)
        return path


class CommandLine(InFolder):
    def assert_fails(self, result, status, *texts):
        message = result.stderr.decode()
        self.assertEqual(result.returncode, status, message)
        self.assertRegex(message, r"\Aavcdump: [^\n]*\n\Z")
        for text in texts:
            self.assertIn(text, message)
        self.assertEqual(result.stdout, b"")

    def test_wrong_command_lines(self):
        path = self.write("a.264", SMALL_STREAM)
        for arguments, text in [
            ([], "FILE"),
            ([path, "--fps", "0"], "30000/1001"),
            ([path, "--fps", "nan"], "30000/1001"),
            ([path, "--fps"], "--fps"),
            ([path, "--json", "--csv"], "--json"),
            ([path, "-v", "--json"], "--json"),
            ([path, path], "a.264"),
            ([path, "--no-such-option"], "--no-such-option"),
        ]:
            with self.subTest(arguments=arguments):
                self.assert_fails(avcdump(*arguments), 2, text)

    def test_files_that_cannot_be_listed(self):
        missing = self.folder / "missing.264"
        self.assert_fails(avcdump(missing), 1, str(missing), "No such file")
        self.assert_fails(avcdump(self.folder), 1, str(self.folder), "directory")
        for data, text in [
            (b"", "empty"),
            (b"\x00\x00\x00\x18ftypmp42\x00\x00\x00\x01", "start code"),
            (b"\x00" * 100, "start code"),
            (b"\x01", "start code"),
            (b"\x00\x01\x67\x00\x00\x01", "start code"),
        ]:
            with self.subTest(data=data):
                path = self.write("bad.264", data)
                for format_option in [[], ["--json"], ["--csv"]]:
                    self.assert_fails(avcdump(path, *format_option), 1, str(path), text, "Annex B")

    def test_standard_input_and_formats(self):
        path = self.write("a.264", SMALL_STREAM)
        table = avcdump(path, "--fps", "25")
        self.assertEqual(table.returncode, 0)
        self.assertEqual(table.stderr, b"")
        self.assertEqual(avcdump("-", "--fps", "25", input=SMALL_STREAM).stdout, table.stdout)
        self.assertEqual(
            table.stdout.decode().splitlines()[-1],
            "3 units, 1 pictures (1 IDR), 30 bytes, 6.00 kbit/s at 25 frames/s",
        )
        listing = json.loads(avcdump(path, "--json").stdout)
        self.assertEqual(
            listing["summary"],
            {
                "units": 3,
                "pictures": 1,
                "idr_pictures": 1,
                "bytes": 30,
                "fps": "30",
                "kbits_per_second": 7.2,
            },
        )
        rows = list(csv.DictReader(io.StringIO(avcdump(path, "--csv").stdout.decode())))
        self.assertEqual(len(rows), len(listing["units"]))
        for row, unit in zip(rows, listing["units"]):
            self.assertEqual(list(row), list(unit))
            for name, value in unit.items():
                text = "" if value is None else str(int(value)) if name == "sync" else str(value)
                self.assertEqual(row[name], text, name)

    def test_verbose_adds_the_lines_of_the_parser(self):
        # The last unit is not parsed, so a second slice shows the lines of the first.
        path = self.write("a.264", SMALL_STREAM + SMALL_STREAM[-10:])
        plain = avcdump(path).stdout.decode().splitlines()
        verbose = avcdump(path, "-v").stdout.decode().splitlines()
        added = ["Number of bits = 56", "Last byte = 1000.0000", "Number of trailing bits = 8",
                 "nal_ref_idc       = 3", "nal_unit_type     = 5", "frame_num         = 0"]
        self.assertEqual(verbose, plain[:4] + added + plain[4:])

    def test_a_closed_pipe_ends_quietly(self):
        path = self.write("long.264", SMALL_STREAM * 20000)
        for options in [[], ["--json"], ["-v"]]:
            process = subprocess.Popen(
                [*EMULATOR, AVCDUMP, str(path), *options], stdout=subprocess.PIPE, stderr=subprocess.PIPE
            )
            process.stdout.readline()
            process.stdout.close()
            self.assertEqual(process.stderr.read(), b"")
            process.stderr.close()
            self.assertEqual(process.wait(), 1)

    @unittest.skipUnless(os.path.exists("/dev/full"), "no full device")
    def test_a_full_device_is_reported(self):
        path = self.write("a.264", SMALL_STREAM)
        with open("/dev/full", "wb") as full:
            result = subprocess.run([*EMULATOR, AVCDUMP, str(path)], stdout=full, stderr=subprocess.PIPE)
        self.assertEqual(result.returncode, 1)
        self.assertRegex(result.stderr, rb"\Aavcdump: standard output: [^\n]*\n\Z")


def slices_by_trace(path):
    """The slice headers that ffmpeg's trace_headers reads, as tuples of COLUMNS."""
    result = run(FFMPEG, "-hide_banner", "-nostats", "-i", path, "-c", "copy",
                 "-bsf:v", "trace_headers", "-f", "null", "-")
    init_qp = {}
    slices = []
    unit = {}

    def end_unit():
        if "pic_init_qp_minus26" in unit:
            init_qp[unit["pic_parameter_set_id"]] = 26 + unit["pic_init_qp_minus26"]
        elif "slice_type" in unit:
            slices.append((
                unit["nal_unit_type"],
                unit["first_mb_in_slice"],
                SLICE_TYPES[unit["slice_type"] % 5],
                unit["frame_num"],
                unit.get("idr_pic_id"),
                unit.get("pic_order_cnt_lsb"),
                init_qp[unit["pic_parameter_set_id"]] + unit["slice_qp_delta"],
            ))
        unit.clear()

    for line in result.stderr.decode(errors="replace").splitlines():
        match = re.search(r"\[trace_headers @ \w+\] \d+ +(\S+) +[01]+ = (-?\d+)$", line)
        if match and match[1] == "forbidden_zero_bit":
            end_unit()
        elif match:
            unit[match[1]] = int(match[2])
    end_unit()
    return slices


def packets_by_probe(path):
    """Sizes and key flags of the access units that ffprobe sees."""
    result = run(FFPROBE, "-v", "error", "-f", "h264", "-show_packets", "-of", "json", path)
    packets = json.loads(result.stdout)["packets"]
    return [(int(packet["size"]), packet["flags"].startswith("K")) for packet in packets]


@unittest.skipUnless(FFMPEG and FFPROBE, "ffmpeg and ffprobe are not there")
class Agreement(InFolder):
    def assert_agrees(self, path):
        listing = json.loads(avcdump(path, "--json").stdout)
        units = listing["units"]
        slices = [
            tuple(unit[column] for column in COLUMNS)
            for unit in units
            if unit["slice_type"] is not None
        ]
        self.assertGreater(len(slices), 20)
        self.assertEqual(slices, slices_by_trace(path))

        pictures = [[0, False] for _ in range(listing["summary"]["pictures"])]
        for unit in units:
            pictures[unit["picture"]][0] += unit["size"]
            pictures[unit["picture"]][1] |= unit["sync"]
        self.assertEqual([tuple(picture) for picture in pictures], packets_by_probe(path))
        self.assertEqual(listing["summary"]["bytes"], path.stat().st_size)
        self.assertEqual(sum(key for _, key in pictures), listing["summary"]["idr_pictures"])

    def coded(self, name, options, source="testsrc2=s=176x144:r=25:d=3"):
        """A stream of another maker's encoder; the test is skipped where there is none."""
        path = self.folder / name
        result = run(FFMPEG, "-v", "error", "-y", "-f", "lavfi", "-i", source,
                     "-c:v", "libx264", *options, "-f", "h264", path)
        if result.returncode != 0:
            self.skipTest("no encoder for this: " + result.stderr.decode().strip())
        return path

    def test_streams_of_another_maker(self):
        fade = "testsrc2=s=176x144:r=25:d=3,fade=out:10:30"
        for name, options, *source in [
            ("high", ["-x264-params", "slices=4:keyint=20"]),
            ("weighted", ["-x264-params", "weightp=2:bframes=3:ref=5:b-pyramid=normal"], fade),
            ("baseline", ["-profile:v", "baseline", "-x264-params", "slices=3:ref=4:aud=1"]),
            ("all IDR", ["-x264-params", "keyint=1"]),
            ("long GOP", ["-x264-params", "keyint=infinite:cabac=0:bframes=0"]),
            ("interlaced", ["-x264-params", "tff=1:slices=2"]),
            ("4:4:4", ["-pix_fmt", "yuv444p", "-x264-params", "cqm=jvt"]),
            ("10 bit", ["-pix_fmt", "yuv422p10le", "-x264-params", "keyint=15"]),
        ]:
            with self.subTest(name):
                self.assert_agrees(self.coded("a.264", options, *source))

    def test_streams_with_several_parameter_sets(self):
        pieces = b""
        for number, options in enumerate(["sps-id=0:slices=2", "sps-id=5:cabac=0:qp=40", "sps-id=31"]):
            options = ["-x264-params", options + ":keyint=12"]
            pieces += self.coded(f"{number}.264", options).read_bytes()
        self.assert_agrees(self.write("joined.264", pieces))

    @unittest.skipUnless(ZOLTENC, "zoltenc is not built")
    def test_own_streams(self):
        for name, options in [
            ("fixed QP", ["-b", "0", "-g", "10"]),
            ("rate control", ["-b", "150", "-g", "25"]),
            ("all IDR", ["-b", "0", "-g", "1"]),
        ]:
            with self.subTest(name):
                path = self.folder / "own.264"
                result = run(ZOLTENC, "-q", *options, "-o", path, "synthetic:176x144@25:60")
                self.assertEqual(result.returncode, 0, result.stderr.decode())
                self.assert_agrees(path)


if __name__ == "__main__":
    unittest.main(verbosity=2)
