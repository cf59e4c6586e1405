#!/usr/bin/env python3
"""Lets the foreign host use the library, and compares the streams that it gets with those that the
native zoltenc makes of the same pictures.

Without a command that runs programs of the width, the host cannot be run: this says so, and ends
with status 77.
"""

import argparse
import os
import pathlib
import re
import shutil
import subprocess
import sys

SKIPPED = 77


def main():
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("--host", required=True, type=pathlib.Path)
    parser.add_argument("--plugin", required=True, type=pathlib.Path)
    parser.add_argument("--zoltenc", required=True, type=pathlib.Path)
    parser.add_argument("--directory", required=True, type=pathlib.Path)
    parser.add_argument("emulator", nargs="*")
    arguments = parser.parse_args()
    if not arguments.emulator:
        print(f"{arguments.host.name} is built only: nothing here runs programs of its width")
        return SKIPPED
    if not arguments.zoltenc.exists():
        print(f"{arguments.zoltenc} is not there: build the release preset first")
        return 1

    shutil.rmtree(arguments.directory, ignore_errors=True)
    services = arguments.directory / "services"
    services.mkdir(parents=True)
    shutil.copy(arguments.plugin, arguments.directory)
    shutil.copy(arguments.host.with_name("services_msabi.dll"), services)
    host = subprocess.run(
        [*arguments.emulator, arguments.host], cwd=arguments.directory, text=True,
        stdout=subprocess.PIPE, env=os.environ | {"STREAMING_ENGINE_LIB": services.name})
    print(host.stdout, end="")
    if host.returncode != 0:
        print(f"The host ended with status {host.returncode}")
        return 1

    streams = re.findall(r"^stream (\S+) (\S+) (\S+) (\S+) (\S+) (....)$", host.stdout, re.M)
    differing = 0
    for name, size, fps, kbps, keyint, picture_format in streams:
        native = arguments.directory / f"{name}.native.h264"
        subprocess.run(
            [arguments.zoltenc, "-q", "-s", size, "-r", fps, "-b", kbps, "-g", keyint, "-f",
             picture_format, arguments.directory / f"{name}.raw", "-o", native], check=True)
        if native.read_bytes() != (arguments.directory / f"{name}.h264").read_bytes():
            print(f"{name}: the library's stream is not that of the native zoltenc")
            differing += 1
    print(f"{len(streams)} streams compared with the native zoltenc, {differing} differ")
    return 1 if differing or not streams else 0


if __name__ == "__main__":
    sys.exit(main())
