"""Pipelines to decoders, to the network and to several encoders at once. Streams are those of zoltenc
for the same pictures and settings."""

import os
import pathlib
import re
import signal
import socket
import subprocess
import time
import unittest

from gst_runner import ENVIRONMENT, PipelineTest, encoder, file, y4m

PAGE = pathlib.Path(__file__).parents[3] / "docs" / "gstreamer.md"
PIPELINES_TEST = os.environ["PIPELINES_TEST"]
BYTE_STREAM = "video/x-h264,stream-format=byte-stream"
AVC = "video/x-h264,stream-format=avc"


class Inspect(PipelineTest):
    def test_the_element_describes_itself_without_a_warning(self):
        for _ in range(2):  # the first call may look for all plug-ins there are
            result = subprocess.run(["gst-inspect-1.0", encoder().split()[0]], capture_output=True,
                                    text=True, check=True, env={**ENVIRONMENT, "GST_DEBUG": "2"})
        self.assertEqual(result.stderr, "")
        properties = re.findall(r"^  ([a-z-]+) *: ", result.stdout, re.M)
        for name in ("bitrate", "fit", "key-int-max", "plugin-path", "stats", "threads"):
            self.assertIn(name, properties)
        for caps in ("profile: main", "alignment: au",
                     "stream-format: { (string)avc, (string)byte-stream }",
                     *(f"(string){name}" for name in FORMATS)):
            self.assertIn(caps, result.stdout)


class Decoders(PipelineTest):
    elements = ("y4mdec", "h264parse", "avdec_h264", "openh264dec")

    def test_decoders_agree_and_the_stream_is_that_of_zoltenc(self):
        # The element does not show its reconstruction. The engine's equals what ffmpeg decodes, as its
        # own tests say, and so does what each decoder gives here.
        frames = 60
        for width, height, caps, settings in (
            (320, 240, BYTE_STREAM, {"bitrate": 600, "key-int-max": 25}),
            (352, 288, AVC, {"bitrate": 0, "key-int-max": 7}),
            (328, 232, BYTE_STREAM, {"bitrate": 1500, "key-int-max": 1000}),
        ):
            with self.subTest(size=(width, height), settings=settings):
                self.make("in.y4m", f"{width}x{height}", 25, frames)
                self.launch(
                    y4m("in.y4m"), "!",
                    encoder(" ".join(f"{name}={value}" for name, value in settings.items())),
                    "!", caps, "! tee name=coded",
                    f"coded. ! queue ! h264parse ! {BYTE_STREAM} !", file("out.264"),
                    "coded. ! queue ! avdec_h264 !", file("avdec.yuv"),
                    f"coded. ! queue ! h264parse ! {BYTE_STREAM} ! openh264dec !", file("open.yuv"))
                pictures = self.decode("out.264", width, height)
                self.assertEqual(len(pictures), frames)
                self.assertEqual(self.read("avdec.yuv"), b"".join(pictures))
                self.assertEqual(self.read("open.yuv"), b"".join(pictures))
                self.encode("in.y4m", "-o", "zoltenc.264", "--fit", "pad", "-b",
                            str(settings["bitrate"]), "-g", str(settings["key-int-max"]))
                self.assertEqual(self.slices("out.264"), self.slices("zoltenc.264"))


# GStreamer's formats by zoltenc's.
FORMATS = {"I420": "IYUV", "YUY2": "YUY2", "AYUV": "AYUV", "BGRA": "BGRA", "RGBA": "RGBA",
           "ARGB": "ARGB", "BGRx": "BGRA", "RGBx": "RGBA", "xRGB": "ARGB", "BGR": "BGR ",
           "RGB": "RGB "}


class Formats(PipelineTest):
    elements = ("videotestsrc",)

    def test_streams_of_every_format_are_those_of_zoltenc(self):
        width, height = 168, 104
        for name, fourcc in FORMATS.items():
            for fit in ("pad", "crop"):
                with self.subTest(format=name, fit=fit):
                    self.launch(
                        f"videotestsrc num-buffers=12 pattern=smpte ! video/x-raw,format={name},"
                        f"width={width},height={height},framerate=30/1 ! tee name=pictures",
                        "pictures. ! queue !", file("in.raw"),
                        "pictures. ! queue !", encoder(f"bitrate=800 key-int-max=5 fit={fit}"),
                        "!", BYTE_STREAM, "!", file("out.264"))
                    self.encode("in.raw", "-s", f"{width}x{height}", "-f", fourcc, "-r", "30",
                                "-b", "800", "-g", "5", "--fit", fit, "-o", "zoltenc.264")
                    self.assertEqual(len(self.slices("out.264")), 12)
                    self.assertEqual(self.slices("out.264"), self.slices("zoltenc.264"))


class Tees(PipelineTest):
    elements = ("y4mdec", "tee")

    def test_encoders_side_by_side_do_not_know_of_each_other(self):
        self.make("in.y4m", frames=60)
        settings = ("bitrate=300 key-int-max=60 threads=1", "bitrate=2000 key-int-max=7")
        for index, properties in enumerate(settings):
            self.launch(y4m("in.y4m"), "!", encoder(properties), "!", BYTE_STREAM, "!",
                        file(f"alone{index}.264"))
        self.launch(y4m("in.y4m"), "! tee name=pictures", *(
            f"pictures. ! queue ! {encoder(properties)} ! {BYTE_STREAM} ! {file(f'both{index}.264')}"
            for index, properties in enumerate(settings)))
        for index in range(len(settings)):
            self.assertEqual(self.read(f"both{index}.264"), self.read(f"alone{index}.264"))
        self.assertNotEqual(self.read("both0.264"), self.read("both1.264"))


class Rtp(PipelineTest):
    elements = ("y4mdec", "tee", "rtph264pay", "rtph264depay", "udpsink", "udpsrc", "avdec_h264")

    def test_pictures_go_through_the_network_to_another_process(self):
        width, height, frames, rate = 320, 240, 60, 60
        self.make("in.y4m", f"{width}x{height}", rate, frames)
        for caps in (BYTE_STREAM, AVC):
            with self.subTest(caps=caps):
                port = free_port()
                receiver = self.start(
                    f"udpsrc address=127.0.0.1 port={port} buffer-size=4000000 caps=application/"
                    "x-rtp,media=video,clock-rate=90000,encoding-name=H264,payload=96",
                    f"! rtph264depay ! {BYTE_STREAM},alignment=au ! tee name=units",
                    "units. ! queue ! filesink buffer-mode=unbuffered location=received.264",
                    "units. ! queue ! avdec_h264 !", file("received.yuv"))
                try:
                    self.wait(lambda: is_bound(port))
                    self.launch(y4m("in.y4m"), "!", encoder("bitrate=1000 key-int-max=20"), "!", caps,
                                "! tee name=units",
                                f"units. ! queue ! h264parse ! {BYTE_STREAM} !", file("sent.264"),
                                "units. ! queue ! rtph264pay config-interval=-1 !",
                                f"udpsink host=127.0.0.1 port={port}")
                    sent = self.slices("sent.264")
                    self.assertEqual(len(sent), frames)
                    self.wait(lambda: len(self.slices("received.264")) == frames)
                finally:
                    receiver.send_signal(signal.SIGINT)
                    self.finish(receiver)
                self.assertEqual(self.slices("received.264"), sent)
                self.assertEqual(self.read("received.yuv"),
                                 b"".join(self.decode("sent.264", width, height)))

    def wait(self, done):
        end = time.monotonic() + 20
        while not done():
            self.assertLess(time.monotonic(), end, "nothing came")
            time.sleep(0.05)


def free_port():
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as taken:
        taken.bind(("127.0.0.1", 0))
        return taken.getsockname()[1]


def is_bound(port):
    """Whether a process listens for datagrams at a port of this machine."""
    with open("/proc/net/udp", encoding="ascii") as table:
        return any(line.split()[1].endswith(f":{port:04X}") for line in list(table)[1:])


class Documentation(PipelineTest):
    elements = ("decodebin", "videoconvert", "mp4mux", "rtph264pay", "udpsink", "udpsrc",
                "rtpjitterbuffer", "rtph264depay", "avdec_h264")

    def test_the_pipelines_of_the_page_run(self):
        self.make("in.mkv")
        text = PAGE.read_text(encoding="utf-8").replace("\\\n", " ")
        pipelines = re.findall(r"^    (?:gst-launch-1.0 -e|./run --gst) (.*)", text, re.M)
        self.assertGreaterEqual(len(pipelines), 4)
        for pipeline in pipelines:
            with self.subTest(pipeline=pipeline):
                here = pipeline.replace("port=5000", f"port={free_port()}")
                process = self.start(here.replace("autovideosink", "fakesink"))
                try:
                    process.wait(timeout=2)
                except subprocess.TimeoutExpired:
                    process.send_signal(signal.SIGINT)
                self.assertEqual(self.finish(process), "")
        self.assertEqual(len(self.decode("out.mp4", 320, 240)), 50)


class Leaks(PipelineTest):
    elements = ("videotestsrc", "h264parse", "mp4mux")

    # The tracer announces what it may write, then writes a line for every leak.
    tracer = {"GST_TRACERS": "leaks", "GST_DEBUG": "GST_TRACER:7"}

    def assert_no_leaks(self, messages):
        self.assertIn("object-alive.class", messages)
        self.assertEqual(re.findall(r"object-alive, type-name=\(string\)[^%].*", messages), [])

    def test_the_leaks_tracer_finds_nothing(self):
        for source, rest in (
            ("format=I420,width=320,height=240", f"{AVC} ! mp4mux ! fakesink"),
            ("format=BGRA,width=314,height=230", f"{BYTE_STREAM} ! h264parse ! fakesink"),
        ):
            with self.subTest(source=source):
                self.assert_no_leaks(self.finish(self.start(
                    f"videotestsrc num-buffers=40 ! video/x-raw,{source},framerate=30/1 !",
                    encoder("key-int-max=10"), "!", rest, **self.tracer)))

    def test_nothing_is_left_of_a_pipeline_that_changed(self):
        result = subprocess.run([PIPELINES_TEST, "--gtest_filter=*Renegotiation*"], check=True,
                                capture_output=True, text=True, env={**ENVIRONMENT, **self.tracer})
        self.assert_no_leaks(result.stderr)


if __name__ == "__main__":
    unittest.main()
