"""scripts/encode-parallel: the same pictures as one run, whatever happens to its jobs."""

import os
import pathlib
import re
import shlex
import shutil
import signal
import subprocess
import time
import unittest

from zoltenc_runner import ENVIRONMENT, ZOLTENC_FILE
from zoltenc_stream_test import StreamTest

SCRIPT = pathlib.Path(__file__).parents[2] / "scripts" / "encode-parallel"
MISSING = [name for name in ("parallel", "ffprobe", "rsync") if not shutil.which(name)]


@unittest.skipIf(MISSING, f"not run: not installed: {' '.join(MISSING)}")
class ParallelTest(StreamTest):
    def program(self, name, text):
        """A shell script that the current folder gets."""
        path = self.folder / name
        path.parent.mkdir(exist_ok=True)
        path.write_text("#!/bin/bash\n" + text, encoding="utf-8")
        path.chmod(0o755)
        return str(path)

    def command(self, *arguments, zoltenc=ZOLTENC_FILE):
        return [str(SCRIPT), "--zoltenc", zoltenc, *arguments]

    def parallel(self, *arguments, zoltenc=ZOLTENC_FILE, path=""):
        result = subprocess.run(
            self.command(*arguments, zoltenc=zoltenc),
            cwd=self.folder,
            stdin=subprocess.DEVNULL,
            capture_output=True,
            text=True,
            env={**ENVIRONMENT, "PATH": path + os.environ["PATH"]},
            timeout=120,
            check=False,
        )
        return result


class ParallelPieces(ParallelTest):
    def test_pieces_hold_the_pictures_of_one_run(self):
        name = "a 'b\" $c [*] {}.y4m"
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=25:duration=5",
                    "-pix_fmt", "yuv420p", f"file:{name}")
        self.encode(name, "-o", "one.264", "-g", "8", "-b", "0")
        result = self.parallel(name, "-j4", "-o", "-x {} '.264", "--", "-g", "8", "-b", "0")
        self.assert_succeeds(result)
        self.assertEqual(self.files(), sorted([name, "one.264", "-x {} '.264"]))
        self.assertIn("125 pictures in 4 pieces", result.stderr)
        joined = self.decode("file:-x {} '.264", 64, 48)
        self.assertEqual(joined, self.decode("one.264", 64, 48))
        self.assertEqual(len(joined), 125)

    def test_pieces_begin_at_key_frames_of_one_run(self):
        for frames, interval, pieces, expected in (
            (100, 30, 4, [(0, 30), (30, 30), (60, 30), (90, 10)]),
            (100, 30, 3, [(0, 60), (60, 40)]),
            (61, 30, 100, [(0, 30), (30, 30), (60, 1)]),
            (5, 1, 9, [(0, 2), (2, 2), (4, 1)]),
            (7, 30, 4, [(0, 7)]),
        ):
            with self.subTest(frames=frames, interval=interval, pieces=pieces):
                result = self.assert_succeeds(self.parallel(
                    "synthetic", "--frames", str(frames), "--pieces", str(pieces), "--dry-run",
                    "-o", "out.264", "--", f"--keyint={interval}"))
                cuts = re.findall(r"--skip (\d+) -n (\d+)", result.stdout)
                self.assertEqual([tuple(map(int, cut)) for cut in cuts], expected)
        self.assertEqual(self.files(), [])

    def test_a_dry_run_prints_what_a_shell_can_run(self):
        arguments = ["synthetic:64x48", "--frames", "9", "--pieces=2", "-o", "o ut.264", "--", "-g5"]
        commands = self.assert_succeeds(self.parallel("--dry-run", *arguments)).stdout
        (self.folder / "o ut.264.parts").mkdir()
        subprocess.run(["sh", "-ec", commands], cwd=self.folder, capture_output=True, check=True)
        by_hand = self.read("o ut.264")
        (self.folder / "o ut.264").unlink()
        shutil.rmtree(self.folder / "o ut.264.parts")
        self.assert_succeeds(self.parallel(*arguments))
        self.assertEqual(self.read("o ut.264"), by_hand)

    def test_wrong_usage_and_files(self):
        self.write("in.y4m", b"no video")
        for arguments, status, *texts in (
            ([], 2, "INPUT", "--help"),
            (["in.y4m"], 2, "-o"),
            (["in.y4m", "-o"], 2, "-o", "value"),
            (["in.y4m", "-o", "out.avi"], 2, "out.avi", ".mkv"),
            (["in.y4m", "-o", "in.y4m.264", "-j", "0"], 2, "-j", "from 1"),
            (["in.y4m", "-o", "out.264", "--turbo"], 2, "--turbo"),
            (["in.y4m", "other", "-o", "out.264"], 2, "other"),
            (["in.y4m", "-o", "out.264", "--", "-n", "5"], 2, "-n"),
            (["in.y4m", "-o", "out.264", "--", "-g", "0"], 2, "--keyint", "from 1"),
            (["-", "-o", "out.264"], 2, "standard input"),
            (["in.y4m", "-o", "out.264"], 1, "in.y4m", "--frames"),
            (["none.y4m", "-o", "out.264"], 1, "none.y4m"),
            (["in.y4m", "-o", "none/out.264"], 1, "none/out.264"),
        ):
            with self.subTest(arguments=arguments):
                result = self.parallel(*arguments)
                self.assertEqual((result.returncode, result.stdout), (status, ""), result.stderr)
                self.assertEqual(result.stderr.count("\n"), 1, result.stderr)
                for text in ("encode-parallel: ", *texts):
                    self.assertIn(text, result.stderr)
                self.assertEqual(self.files(), ["in.y4m"])


class ParallelFailures(ParallelTest):
    arguments = ("synthetic:64x48", "--frames", "40", "--pieces", "4", "-j", "2", "-o", "out.264",
                 "--", "-g", "5")

    def logged_zoltenc(self, before=""):
        """zoltenc that notes the first picture of each of its runs in a file."""
        return self.program("bin/zoltenc", f"""
            folder={shlex.quote(str(self.folder))}
            skip=$(sed 's/.*--skip \\([0-9]*\\).*/\\1/' <<<"$*")
            echo "$skip" >>"$folder/bin/log"
            {before}
            exec {shlex.quote(ZOLTENC_FILE)} "$@"
            """)

    def runs(self):
        return sorted(int(line) for line in self.read("bin/log").split())

    def test_a_piece_that_fails_twice_is_repeated(self):
        zoltenc = self.logged_zoltenc(
            'if [ "$skip" = 10 ] && [ "$(grep -cx 10 "$folder/bin/log")" -lt 3 ]; then exit 1; fi')
        self.assert_succeeds(self.parallel(*self.arguments, zoltenc=zoltenc))
        self.assertEqual(self.runs(), [0, 10, 10, 10, 20, 30])
        self.assertEqual(len(self.decode("out.264", 64, 48)), 40)

    def test_a_piece_that_keeps_failing_is_an_error_and_the_others_are_kept(self):
        self.write("out.264", b"as it was")
        zoltenc = self.logged_zoltenc('[ "$skip" != 10 ] || { echo "zoltenc: why" >&2; exit 1; }')
        result = self.parallel(*self.arguments, zoltenc=zoltenc)
        self.assertEqual(result.returncode, 1)
        self.assertIn("zoltenc: why", result.stderr)
        self.assertIn("1 of 4 pieces could not be coded, piece 2", result.stderr)
        self.assertEqual(self.read("out.264"), b"as it was")
        self.logged_zoltenc()
        self.assert_succeeds(self.parallel(*self.arguments, zoltenc=zoltenc))
        self.assertEqual(self.runs(), [0, 10, 10, 10, 10, 20, 30])
        self.assertEqual(len(self.decode("out.264", 64, 48)), 40)

    def test_pieces_of_other_options_are_not_joined(self):
        zoltenc = self.logged_zoltenc('[ "$skip" != 10 ] || exit 1')
        self.parallel(*self.arguments, zoltenc=zoltenc)
        result = self.parallel(*self.arguments, "-b", "500", zoltenc=zoltenc)
        self.assertEqual(result.returncode, 1)
        self.assertIn("out.264.parts: holds pieces of another input or other options", result.stderr)

    def interrupted(self, end, expected_runs):
        """Starts a run whose last piece waits, ends it when the others are there, and starts it
        again; gives its status."""
        zoltenc = self.logged_zoltenc('[ "$skip" != 30 ] || [ -e "$folder/bin/go" ] || sleep 4')
        with subprocess.Popen(self.command(*self.arguments, zoltenc=zoltenc), cwd=self.folder,
                              stderr=subprocess.PIPE, start_new_session=True) as process:
            parts = [self.folder / "out.264.parts" / f"0000{piece}.264" for piece in range(3)]
            deadline = time.monotonic() + 60
            while not all(part.exists() for part in parts) or 30 not in self.runs():
                self.assertLess(time.monotonic(), deadline)
                time.sleep(0.02)
            end(process.pid)
            self.write("bin/go", b"")
            self.assert_succeeds(self.parallel(*self.arguments, zoltenc=zoltenc))
        self.assertEqual(self.runs(), expected_runs)
        self.assertEqual(len(self.decode("out.264", 64, 48)), 40)
        self.assertEqual(self.files(), ["bin", "out.264"])
        return process.returncode

    def test_a_run_that_was_killed_goes_on(self):
        def kill_session(leader):
            """Kills a script and all that it has started, as a power cut would."""
            for stat in pathlib.Path("/proc").glob("[0-9]*/stat"):
                try:
                    session = int(stat.read_text(encoding="utf-8").rpartition(")")[2].split()[3])
                    if session == leader:
                        os.kill(int(stat.parent.name), signal.SIGKILL)
                except (FileNotFoundError, ProcessLookupError):
                    pass  # it has ended

        status = self.interrupted(kill_session, [0, 10, 20, 30, 30])
        self.assertEqual(status, -signal.SIGKILL)

    def test_a_run_waits_for_the_jobs_of_one_whose_script_was_killed(self):
        status = self.interrupted(lambda script: os.kill(script, signal.SIGKILL), [0, 10, 20, 30])
        self.assertEqual(status, -signal.SIGKILL)

    def test_a_run_that_was_stopped_goes_on(self):
        status = self.interrupted(lambda script: os.kill(script, signal.SIGTERM),
                                  [0, 10, 20, 30, 30])
        self.assertEqual(status, 128 + signal.SIGTERM)


class ParallelTimes(ParallelTest):
    def packets(self, name, stream, fields="pts_time,flags"):
        text = subprocess.run(
            ["ffprobe", "-v", "error", "-select_streams", stream, "-show_entries", f"packet={fields}",
             "-of", "compact=p=0:nk=1", name],
            cwd=self.folder, capture_output=True, text=True, check=True).stdout
        return [line for line in text.splitlines() if line]

    def test_joined_files_are_as_those_of_one_run(self):
        """Pictures at uneven times that do not begin with 0, and sound."""
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=30000/1001", "-f", "lavfi", "-i",
                    "sine", "-t", "4", "-vf", "select='mod(n,7)-3*mod(n,2)',setpts=PTS+0.1/TB",
                    "-fps_mode", "vfr", "-c:v", "mpeg4", "-c:a", "aac", "in.mp4")
        self.ffmpeg("-i", "in.mp4", "-c", "copy", "in.mkv")
        options = ("-g", "5", "-b", "0")
        for source in ("in.mp4", "in.mkv"):
            for ending in ("mp4", "mov", "mkv", "flv", "ts"):
                with self.subTest(source=source, ending=ending):
                    one, joined = f"one.{ending}", f"joined.{ending}"
                    self.encode(source, "-o", one, *options)
                    self.assert_succeeds(
                        self.parallel(source, "-o", joined, "-j", "4", "--", *options))
                    expected = self.packets(one, "v")
                    self.assertEqual(self.packets(joined, "v"), expected)
                    self.assertGreater(len(expected), 80)
                    self.assertAlmostEqual(len(self.packets(joined, "a", "pts")),
                                           len(self.packets(one, "a", "pts")), delta=1)
                    self.assertEqual(self.pictures(joined), self.pictures(one))

    def pictures(self, name):
        """The digests of the decoded pictures."""
        lines = self.ffmpeg("-i", name, "-map", "0:v", "-fps_mode", "passthrough", "-enc_time_base",
                            "-1", "-f", "framemd5", "-")
        return [line.split()[-1] for line in lines.splitlines() if not line.startswith(b"#")]

    def test_times_without_an_input_that_states_any(self):
        source = ["synthetic:64x48@30000/1001:95"]
        self.encode(*source, "-o", "one.mp4", "-g", "5")
        self.assert_succeeds(self.parallel(*source, "--frames", "95", "--pieces", "19", "-o",
                                           "joined.mp4", "--", "-g", "5"))
        self.assertEqual(self.packets("joined.mp4", "v", "pts,duration,flags"),
                         self.packets("one.mp4", "v", "pts,duration,flags"))

    def test_sound_can_be_left_out(self):
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=25", "-f", "lavfi", "-i", "sine",
                    "-t", "1", "-c:v", "mpeg4", "-c:a", "aac", "in.mkv")
        self.assert_succeeds(self.parallel("in.mkv", "--no-copy", "-o", "out.mp4", "--", "-g", "5"))
        self.assertEqual(self.packets("out.mp4", "a"), [])


class ParallelMachines(ParallelTest):
    def test_pieces_are_coded_elsewhere(self):
        """The other machines are folders, reached by a program that stands in for ssh."""
        self.program("bin/ssh", f"""
            while [ "${{1#-}}" != "$1" ]; do shift; done
            machine={shlex.quote(str(self.folder))}/machines/$1
            shift
            [ "${{1-}}" != -- ] || shift
            mkdir -p "$machine"
            cd "$machine"
            echo "$*" >>../log
            HOME=$machine exec bash -c "$*"
            """)
        (self.folder / "bin" / "zoltenc").symlink_to(ZOLTENC_FILE)
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=64x48:rate=25:duration=2",
                    "-pix_fmt", "yuv420p", "file:in 'put.y4m")
        self.encode("in 'put.y4m", "-o", "one.264", "-b", "0", "-g", "10")
        command = ["in 'put.y4m", "-o", "out.264", "-j", "1", "--pieces", "4",
                   "--sshlogin", "1/one,1/two,1/:", "--", "-b", "0", "-g", "10"]
        self.assert_succeeds(
            self.parallel(*command, zoltenc="zoltenc", path=f"{self.folder}/bin:"))
        self.assertEqual(self.decode("out.264", 64, 48), self.decode("one.264", 64, 48))
        for machine in ("one", "two"):
            self.assertEqual(list((self.folder / "machines" / machine).iterdir()), [])
        self.assertIn("rsync", self.read("machines/log").decode())


if __name__ == "__main__":
    unittest.main()
