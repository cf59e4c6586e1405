"""What zoltenc writes, in a browser: the colours of its MP4 files, and the page of a report."""

import os
import pathlib
import unittest

from chromium import MISSING, Chromium, FileServer
from zoltenc_stream_test import StreamTest

# The largest difference of a colour component from what it should be, of 255.
TOLERANCE = 6

PAGE = b"""<!doctype html>
<title>Player</title>
<video muted preload="auto"></video>
"""

# Shows a file at a time; gives the size and the duration that the player states, and the picture.
DRAW = """
const [file, time] = arguments;
const video = document.querySelector("video");
const event = name => new Promise((done, failed) => {
    video.addEventListener(name, done, {once: true});
    video.onerror = () => failed(video.error.message);
});
if (!video.src.endsWith(file)) {
    video.src = file;
    await event("loadeddata");
}
const seeked = event("seeked");
video.currentTime = time;
await seeked;
const canvas = document.createElement("canvas");
canvas.width = video.videoWidth;
canvas.height = video.videoHeight;
const context = canvas.getContext("2d");
context.drawImage(video, 0, 0);
const pixels = context.getImageData(0, 0, canvas.width, canvas.height).data;
let text = "";
for (let i = 0; i < pixels.length; i += 4096) {
    text += String.fromCharCode(...pixels.subarray(i, i + 4096));
}
return {width: canvas.width, height: canvas.height, duration: video.duration, pixels: text};
"""


@unittest.skipIf(MISSING, MISSING)
class BrowserTest(StreamTest):
    def setUp(self):
        super().setUp()
        self.browser = self.enterContext(Chromium())


class BrowserPlayer(BrowserTest):
    """Cases that have the browser play files of theirs."""

    def setUp(self):
        super().setUp()
        self.write("player.html", PAGE)
        server = self.enterContext(FileServer(self.folder))
        self.browser.open(server.address + "player.html")

    def drawn(self, name, time, width, height):
        """R, G and B of each pixel that the browser shows of a file at a time in seconds."""
        shown = self.browser.run(DRAW, name, time)
        self.assertEqual((shown["width"], shown["height"]), (width, height))
        rgba = shown["pixels"].encode("latin-1")
        self.assertEqual(len(rgba), 4 * width * height)
        rgb = bytearray(3 * width * height)
        for component in range(3):
            rgb[component::3] = rgba[component::4]
        return bytes(rgb), shown["duration"]

    def assert_shown(self, name, width, height, frames, rate):
        """The browser shows the pictures of a file as the decoder does, at their times."""
        pixels = self.ffmpeg("-i", name, "-f", "rawvideo", "-pix_fmt", "rgb24", "-")
        size = 3 * width * height
        self.assertEqual(len(pixels), frames * size)
        for frame in (7, frames // 2, frames - 6):
            shown, duration = self.drawn(name, (frame + 0.5) / rate, width, height)
            self.assertAlmostEqual(duration, frames / rate, places=2)
            decoded = pixels[frame * size : (frame + 1) * size]
            other = pixels[(frame - 5) * size : (frame - 4) * size]
            self.assertLess(mean_difference(shown, decoded), TOLERANCE)
            # Pictures of other times differ by more than what is let pass.
            self.assertGreater(mean_difference(shown, other), TOLERANCE)


class BrowserVideo(BrowserPlayer):
    def test_the_browser_shows_what_the_decoder_shows(self):
        frames, rate = 75, 25
        for width, height, colours in (
            (320, 240, []),
            (318, 234, []),
            (320, 240, ["-colorspace", "bt709", "-color_primaries", "bt709", "-color_trc", "bt709",
                        "-color_range", "tv"]),
            (320, 240, ["-colorspace", "bt470bg", "-color_range", "pc"]),
            (320, 240, ["-colorspace", "bt709"]),
            (320, 240, ["-color_range", "pc"]),
        ):
            with self.subTest(size=(width, height), colours=colours):
                name = f"{width}{''.join(colours)}.mp4"
                self.ffmpeg("-f", "lavfi", "-i", f"testsrc2=size={width}x{height}:rate={rate}",
                            "-frames:v", str(frames), "-c:v", "ffv1", "-pix_fmt", "yuv420p",
                            *colours, "-y", "in.mkv")
                self.encode("in.mkv", "-o", name, "-b", "2000")
                self.assert_shown(name, width, height, frames, rate)

    def test_rgb_input_has_its_colours(self):
        width, height = 320, 240
        colours = [(255, 255, 255), (255, 255, 0), (0, 255, 255), (0, 255, 0), (255, 0, 255),
                   (255, 0, 0), (0, 0, 255), (0, 0, 0), (128, 128, 128), (200, 120, 60)]
        bar = width // len(colours)
        row = b"".join(bytes((blue, green, red, 255)) * bar for red, green, blue in colours)
        self.write("card.bgra", row * height * 30)
        self.encode("card.bgra", "-s", f"{width}x{height}", "-f", "BGRA", "-b", "2000", "-o",
                    "card.mp4")
        shown, _ = self.drawn("card.mp4", 0.5, width, height)
        for index, colour in enumerate(colours):
            at = 3 * (height // 2 * width + index * bar + bar // 2)
            for component, expected in zip(shown[at : at + 3], colour):
                self.assertLessEqual(abs(component - expected), TOLERANCE, (colour, shown[at : at + 3]))


def mean_difference(a, b):
    return sum(abs(x - y) for x, y in zip(a, b)) / len(a)


class BrowserReport(BrowserTest):
    max_bytes = 3_000_000

    def test_the_page_of_a_report(self):
        """Screenshots go to the folder that ZOLT_SCREENSHOTS names, if any."""
        self.ffmpeg("-f", "lavfi", "-i", "testsrc2=size=640x360:rate=25", "-frames:v", "120",
                    "-pix_fmt", "yuv420p", "in.y4m")
        self.encode("in.y4m", "-o", "out.mp4", "--report", "report.html", "--psnr")
        self.assertLess(len(self.read("report.html")), self.max_bytes)
        for width, height, dark in ((1280, 900, False), (1280, 900, True), (390, 844, False),
                                    (390, 844, True)):
            with self.subTest(width=width, dark=dark):
                self.browser.show_as(width, height, dark)
                self.browser.open((self.folder / "report.html").as_uri())
                self.browser.run("document.querySelectorAll('input').forEach(input => input.click())")
                self.assertEqual(self.browser.messages(), [])
                page = self.browser.run("""
                    const style = getComputedStyle(document.body);
                    const loaded = performance.getEntriesByType("resource").map(entry => entry.name);
                    const broken = Array.from(document.images).filter(image => !image.naturalWidth);
                    return {width: document.documentElement.scrollWidth, broken: broken.length,
                            loaded: loaded.filter(name => !name.startsWith("data:")),
                            background: style.backgroundColor, text: document.body.innerText};
                    """)
                self.assertLessEqual(page["width"], width)
                self.assertEqual((page["loaded"], page["broken"]), ([], 0))
                self.assertIn("120", page["text"])
                folder = os.environ.get("ZOLT_SCREENSHOTS")
                if folder:
                    name = f"report-{width}-{'dark' if dark else 'light'}.png"
                    (pathlib.Path(folder) / name).write_bytes(self.browser.screenshot())


if __name__ == "__main__":
    unittest.main()
