"""Pipelines into containers: the pictures, their times, their size and the duration are the source's,
and neither a decoder nor a browser has anything to complain about."""

import unittest

import any_to_any_test
import browser_test
from gst_runner import PipelineTest, encoder, file, y4m

CONTAINERS = (
    ("mp4", "mp4mux faststart=true"),
    ("mp4", "h264parse ! mp4mux"),
    ("mkv", "matroskamux"),
    ("ts", "mpegtsmux"),
    ("ts", "h264parse config-interval=-1 ! mpegtsmux"),
)


class Containers(PipelineTest, any_to_any_test.AnyToAny):
    elements = ("y4mdec", "h264parse", "mp4mux", "matroskamux", "mpegtsmux")

    def describe(self, name):
        """Times from the first one on: MPEG-TS begins where the multiplexer likes."""
        described = super().describe(name)
        first = described["times"][0]
        described["times"] = [time - first for time in described["times"]]
        if first:
            # The difference of two times that the container's clock has rounded.
            described["clock"] *= 2
        return described

    def test_containers_have_the_pictures_of_the_source(self):
        frames = 50
        for size, rate in (("320x240", "25"), ("318x234", "30000/1001"), ("51x39", "10")):
            given = self.describe(self.make("in.y4m", size, rate, frames))
            # A stream is cropped by pairs of samples, and the containers' sizes are the stream's.
            given["size"] = tuple(any_to_any_test.even(side) for side in given["size"])
            for container, multiplexer in CONTAINERS:
                with self.subTest(size=size, multiplexer=multiplexer):
                    name = f"out.{container}"
                    self.launch(y4m("in.y4m"), "!", encoder("bitrate=1000"), "!", multiplexer, "!",
                                file(name))
                    self.assert_same(given, name, container)
                    self.assert_decodes(name, frames)

    def test_players_need_not_fetch_the_end_of_a_fast_file(self):
        self.make("in.y4m")
        self.launch(y4m("in.y4m"), "!", encoder(), "!", "mp4mux faststart=true", "!", file("out.mp4"))
        data = self.read("out.mp4")
        self.assertLess(data.index(b"moov"), data.index(b"mdat"))

    def test_key_frames_are_marked(self):
        self.make("in.y4m", frames=50)
        self.launch(y4m("in.y4m"), "!", encoder("key-int-max=20"), "!", "mp4mux", "!",
                    file("out.mp4"))
        packets = self.probe("out.mp4", "-show_entries", "packet=flags")["packets"]
        keys = [index for index, packet in enumerate(packets) if packet["flags"].startswith("K")]
        self.assertEqual(keys, [0, 20, 40])

    def test_shape_and_colours_reach_the_container(self):
        self.launch("videotestsrc num-buffers=5 ! video/x-raw,format=I420,width=320,height=240,"
                    "framerate=25/1,pixel-aspect-ratio=16/11,colorimetry=bt709 !", encoder(), "!",
                    "mp4mux !", file("out.mp4"))
        stream = self.probe("out.mp4", "-show_streams")["streams"][0]
        self.assertEqual(
            {name: stream.get(name) for name in ("sample_aspect_ratio", "color_range", "color_space",
                                                 "color_transfer", "color_primaries")},
            {"sample_aspect_ratio": "16:11", "color_range": "tv", "color_space": "bt709",
             "color_transfer": "bt709", "color_primaries": "bt709"})


class Browser(PipelineTest, browser_test.BrowserPlayer):
    elements = ("y4mdec", "mp4mux")

    def test_the_browser_shows_what_the_decoder_shows(self):
        frames, rate = 75, 25
        for width, height in ((320, 240), (318, 234)):
            with self.subTest(size=(width, height)):
                name = f"{width}.mp4"
                self.make("in.y4m", f"{width}x{height}", rate, frames)
                self.launch(y4m("in.y4m"), "!", encoder("bitrate=2000"), "!",
                            "mp4mux faststart=true", "!", file(name))
                self.assert_shown(name, width, height, frames, rate)


if __name__ == "__main__":
    unittest.main()
