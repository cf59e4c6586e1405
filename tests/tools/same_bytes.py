#!/usr/bin/env python3
"""same_bytes.py BUILD BUILD...

Whether builds give the same bytes for the clips in the folder that ZOLT_TEST_CLIPS names: zoltenc at
several bit rates, and the engine at several QPs and bit rates with every table of kernels. A BUILD is
a build directory; Windows programs in it are run with the command in EMULATOR (otherwise "wine").
Prints a line for every clip and setting; ends with status 1 when any two builds or tables differ.
"""

import hashlib
import os
import pathlib
import shlex
import subprocess
import sys
import tempfile

BIT_RATES = (0, 100, 500, 2000)  # kbit/s
SETTINGS = ("qp10", "qp28", "qp45", "100k", "2000k")
EMULATOR = shlex.split(os.environ.get("EMULATOR", "wine"))


def command(build, program):
    path = pathlib.Path(build, "bin", program).resolve()
    windows = path.with_suffix(".exe")
    return [*EMULATOR, windows] if windows.exists() else [path]


def output_of(*arguments):
    return subprocess.run(
        arguments, stdout=subprocess.PIPE, check=True, env={**os.environ, "LC_ALL": "C.UTF-8"}
    ).stdout


def report(clip, setting, results):
    """`results`: what every build or table gave, by its name."""
    same = len(set(results.values())) == 1
    print(f"{'same' if same else 'DIFFERENT'}  {clip}  {setting}  {next(iter(results.values()))}", flush=True)
    if not same:
        for name, result in results.items():
            print(f"    {result}  {name}")
    return same


def compare_streams(clip, file, builds):
    same = True
    for rate in BIT_RATES:
        results = {}
        for build in builds:
            zoltenc = command(build, "zoltenc")
            stream = output_of(*zoltenc, "-q", "-b", str(rate), file, "-o", "-")
            results[build] = f"{hashlib.sha256(stream).hexdigest()[:16]} {len(stream)} bytes"
        same &= report(clip, f"zoltenc -b {rate}", results)
    return same


def compare_tables(clip, file, builds):
    results = {setting: {} for setting in SETTINGS}
    for build in builds:
        for line in output_of(*command(build, "table_digests"), file, *SETTINGS).decode().splitlines():
            table, setting, digest = line.split()
            results[setting][f"{build} {table}"] = digest
    same = True
    for setting, digests in results.items():
        same &= report(clip, f"{len(digests)} builds and tables, {setting}", digests)
    return same


def main(builds):
    folder = pathlib.Path(os.environ["ZOLT_TEST_CLIPS"])
    clips = sorted(folder.glob("*.mkv"))
    if len(builds) < 2 or not clips:
        sys.exit(__doc__)
    same = True
    for clip in clips:
        with tempfile.TemporaryDirectory() as scratch:
            file = pathlib.Path(scratch, "clip.y4m")
            output_of("ffmpeg", "-v", "error", "-nostdin", "-i", clip, file)
            same &= compare_streams(clip.stem, file, builds)
            same &= compare_tables(clip.stem, file, builds)
    return 0 if same else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
