"""Runs zoltenc for the tests: in a folder of its own, with the stub or the real encoder library."""

import os
import pathlib
import shlex
import signal
import subprocess
import tempfile
import unittest

# The command that runs programs of another system than this one, and what those need of it.
EMULATOR = shlex.split(os.environ.get("EMULATOR", ""))
ENVIRONMENT = {**os.environ, **({"LC_ALL": "C.UTF-8"} if EMULATOR else {})}
ZOLTENC_FILE = os.environ["ZOLTENC"]
ZOLTENC = [*EMULATOR, ZOLTENC_FILE]
STUB_ENCODER = os.environ["STUB_ENCODER"]
NO_ENCODER = os.environ["NO_ENCODER"]
FFMPEG = os.environ["FFMPEG"]
ENCODER_LIBRARY = "VideoH264ZoltEnc.dll" if EMULATOR else "libVideoH264ZoltEnc.so"
START_CODE = b"\0\0\0\1"

native_only = unittest.skipIf(EMULATOR, "not for programs of another system")


def restore_sigpipe():
    """Python ignores SIGPIPE; programs that it starts are to begin as from a shell."""
    signal.signal(signal.SIGPIPE, signal.SIG_DFL)


def picture(seed, size):
    """`size` bytes that differ from those of other seeds."""
    return bytes((i * 7 + i // 251 + seed * 31) & 255 for i in range(size))


def y4m(width=32, height=16, frames=3, parameters="F25:1", frame_line="FRAME"):
    """A Y4M file of 4:2:0 pictures."""
    size = width * height + 2 * ((width + 1) // 2) * ((height + 1) // 2)
    data = f"YUV4MPEG2 W{width} H{height} {parameters}\n".encode()
    for frame in range(frames):
        data += frame_line.encode() + b"\n" + picture(frame, size)
    return data


def fnv1a(data):
    value = 14695981039346656037
    for byte in data:
        value = (value ^ byte) * 1099511628211 % 2**64
    return f"{value:016x}"


class ToolTest(unittest.TestCase):
    """Cases that start with an empty folder, which is the current one of the programs they run."""

    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def write(self, name, data):
        (self.folder / name).write_bytes(data)

    def read(self, name):
        return (self.folder / name).read_bytes()

    def files(self):
        return sorted(entry.name for entry in self.folder.iterdir())

    def zoltenc(self, *arguments, stub=True, stub_does="", stdin=b"", environment=None,
                stdout=subprocess.PIPE, before=restore_sigpipe):
        """Runs to the end; the result has returncode, stdout (bytes) and stderr (text). `before` is
        called in the new process."""
        command = [*ZOLTENC, *(["--plugin", STUB_ENCODER] if stub else []), *arguments]
        result = subprocess.run(
            command,
            cwd=self.folder,
            input=stdin,
            stdout=stdout,
            stderr=subprocess.PIPE,
            env={**ENVIRONMENT, "ZOLT_STUB": stub_does, **(environment or {})},
            preexec_fn=before,
            timeout=120,
            check=False,
        )
        result.stderr = result.stderr.decode()
        return result

    def assert_fails(self, result, status, *texts):
        """The run failed with this status and one line that holds all the texts."""
        self.assertEqual(result.returncode, status, result.stderr)
        lines = [line for line in result.stderr.splitlines() if not line.startswith("zoltenc: note:")]
        self.assertEqual(len(lines), 1, result.stderr)
        self.assertTrue(lines[0].startswith("zoltenc: "), lines[0])
        for text in texts:
            self.assertIn(text, lines[0])

    def assert_succeeds(self, result):
        self.assertEqual(result.returncode, 0, result.stderr)
        return result

    def told(self, stream):
        """What the stub encoder was told: one dictionary per unit, parameter sets first."""
        self.assertTrue(stream.startswith(START_CODE))
        units = [unit[1:].decode() for unit in stream.split(START_CODE)[1:]]
        return [dict(item.split("=") for item in unit.split()) for unit in units]
