"""Runs of zoltenc that a signal ends at a random moment leave a file that plays to its end, or none.

ZOLT_KILLED_RUNS says how many runs (10), ZOLT_SEED repeats those of an earlier test.
"""

import os
import random
import signal
import subprocess
import sys
import time
import unittest

from zoltenc_runner import ENVIRONMENT, ZOLTENC
from zoltenc_stream_test import StreamTest

RUNS = int(os.environ.get("ZOLT_KILLED_RUNS", "10"))
SEED = int(os.environ.get("ZOLT_SEED", random.randrange(2**32)))
SOURCES = ("in.mkv", "synthetic:176x144@25:1000000")


class KilledRuns(StreamTest):
    def kill_one(self, source, output, number, delay):
        """Gives the run's status and what it said."""
        command = [*ZOLTENC, source, "-o", output, "-b", "500"]
        with subprocess.Popen(command, cwd=self.folder, stderr=subprocess.PIPE, env=ENVIRONMENT) as process:
            time.sleep(delay)
            process.send_signal(number)
            message = process.stderr.read().decode()
            return process.wait(timeout=60), message

    def start_time(self):
        """Seconds that the program takes to begin and to end."""
        begin = time.monotonic()
        for source in SOURCES:
            self.encode(source, "-n", "1", "-o", "one.mp4")
            (self.folder / "one.mp4").unlink()
        return (time.monotonic() - begin) / len(SOURCES)

    def test_files_of_runs_that_were_ended_play(self):
        print(f"seed {SEED}, {RUNS} runs", file=sys.stderr)
        chance = random.Random(SEED)
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=176x144:rate=25", "-f", "lavfi", "-i", "sine",
                    "-t", "200", "-c:v", "mpeg4", "-c:a", "aac", "in.mkv")
        # The earliest signals come while the program is being loaded, the latest ones when many
        # pictures are coded and many are left.
        longest = 0.3 + 3 * self.start_time()
        files = 0
        for run in range(RUNS):
            output = f"out{run}.{('mp4', 'mkv', 'ts')[run % 3]}"
            source = chance.choice(SOURCES)
            number = chance.choice((signal.SIGINT, signal.SIGTERM))
            delay = chance.uniform(0, longest)
            with self.subTest(seed=SEED, output=output, source=source, signal=number, delay=delay):
                status, message = self.kill_one(source, output, number, delay)
                # Before the program is ready for it, the signal ends it as any other.
                self.assertIn(status, (128 + number, -number), message)
                left = [name for name in self.files() if name not in ("in.mkv", output)]
                self.assertEqual(left, [], message)
                if output in self.files():
                    files += 1
                    self.assertIn("stopped", message)
                    pictures = self.ffmpeg("-i", output, "-map", "0", "-f", "framemd5", "-")
                    video = [line for line in pictures.splitlines() if line.startswith(b"0,")]
                    self.assertIn(f" {len(video)} frames", message)
                    (self.folder / output).unlink()
                else:
                    self.assertNotIn(" frames", message)
        self.assertGreater(files, RUNS // 5)


if __name__ == "__main__":
    unittest.main()
