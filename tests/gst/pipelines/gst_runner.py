"""Runs GStreamer's programs with the encoder element for the tests."""

import os
import shutil
import subprocess
import unittest

from zoltenc_stream_test import StreamTest

# As in gst-launch-1.0, properties included: another encoder's element runs through the same pipelines.
ENCODER = os.environ.get("ZOLT_GST_ENCODER", "zolth264enc")
ENVIRONMENT = {**os.environ, "GST_DEBUG_NO_COLOR": "1"}


def missing_elements(names):
    """Those that this machine's GStreamer does not have; all of them without its programs."""
    if not shutil.which("gst-launch-1.0"):
        return ["gst-launch-1.0"]
    return [name for name in names
            if subprocess.run(["gst-inspect-1.0", "--exists", name], check=False).returncode]


class PipelineTest(StreamTest):
    """Cases that run pipelines in an empty folder."""

    # Beside the encoder and GStreamer's core.
    elements = ()

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        missing = missing_elements(cls.elements)
        if missing:
            raise unittest.SkipTest(f"not run: GStreamer has no {', '.join(missing)}")

    def start(self, *pipeline, **environment):
        """Starts a pipeline, told as in gst-launch-1.0, in parts."""
        return subprocess.Popen(
            ["gst-launch-1.0", "--quiet", "--eos-on-shutdown", *" ".join(pipeline).split()],
            cwd=self.folder, env={**ENVIRONMENT, **environment}, stdin=subprocess.DEVNULL,
            stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)

    def finish(self, process):
        """Waits for the end; it succeeded and printed nothing to standard output. Gives its standard
        error."""
        try:
            output, errors = process.communicate(timeout=50)
        except subprocess.TimeoutExpired:
            process.kill()
            output, errors = process.communicate()
            self.fail("a pipeline did not end: " + output + errors)
        self.assertEqual((process.returncode, output), (0, ""), errors)
        return errors

    def launch(self, *pipeline, **environment):
        """Runs a pipeline to its end; it has nothing to complain about."""
        self.assertEqual(self.finish(self.start(*pipeline, **environment)), "")

    def make(self, name, size="320x240", rate="25", frames=50):
        """A Y4M file of moving pictures."""
        # The source rounds odd sizes down where it makes 4:2:0 pictures itself, and GStreamer reads
        # short headers only.
        source = (f"testsrc2=size={size}:rate={rate},format=yuv444p,format=yuv420p,"
                  "setparams=range=unknown")
        self.ffmpeg("-f", "lavfi", "-i", source, "-frames:v", str(frames), "-y", name)
        return name

    def slices(self, name):
        """The slices of an elementary stream, without other NAL units."""
        return [unit for unit in self.units(name) if unit[0] & 31 in (1, 5)]


def encoder(properties=""):
    return f"{ENCODER} {properties}"


def y4m(name):
    """A source of a Y4M file's pictures."""
    return f"filesrc location={name} ! y4mdec"


def file(name):
    return f"filesink location={name}"
