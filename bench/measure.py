"""What the comparisons of this folder share: films, encoders as commands, times, rates, quality.

Encoders are black boxes: programs that read a Y4M file and write a stream in Annex B format. Both
files are on a RAM disk. Each runs on one thread.
"""

import argparse
import contextlib
import math
import os
import pathlib
import re
import shutil
import statistics
import subprocess
import sys
import tempfile
import time
from dataclasses import dataclass
from typing import Callable

FRAME_RATE = 30
RAW_ENDING = ".yuv"
PREFIX = pathlib.Path(sys.argv[0]).name
# What x264 may use when the engine is held to a table of kernels.
RIVAL_TABLES = {
    "scalar": ["--no-asm"],
    "sse2": ["--asm", "SSE2Fast"],
    "avx2": ["--asm", "SSE2Fast,SSSE3,SSE4.2,AVX,FMA3,BMI2,AVX2"],
    "avx512": [],
}


def give_up(message):
    sys.exit(f"{PREFIX}: {message}")


# ---- Running ----

@dataclass
class Times:
    """Seconds of one process: processor (user and system, its children's too), and by the wall."""
    processor: float
    wall: float


def run(command):
    """Runs a command to its end; returns its Times and what it printed on either stream."""
    begin = time.perf_counter()
    with subprocess.Popen([str(word) for word in command], stdin=subprocess.DEVNULL,
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT) as process:
        printed = process.stdout.read().decode(errors="replace")
        _, status, usage = os.wait4(process.pid, 0)
        process.returncode = os.waitstatus_to_exitcode(status)
    wall = time.perf_counter() - begin
    if process.returncode != 0:
        give_up(f"{command[0]} failed with status {process.returncode}:\n{printed}")
    return Times(usage.ru_utime + usage.ru_stime, wall), printed


def need_programs(parser, programs):
    for program in programs:
        if shutil.which(program) is None:
            parser.error(f"{program}: cannot be run")


def need_element(parser, element):
    """Ends with an error where GStreamer lacks an element."""
    done = subprocess.run(["gst-inspect-1.0", "--exists", element], check=False)
    if done.returncode != 0:
        parser.error(f"GStreamer has no element {element}; install it or leave it out with "
                     "--encoders")


@contextlib.contextmanager
def ram_folder():
    """A folder for films and streams that is gone afterwards; in TMPDIR where that is set."""
    ram_disk = "/dev/shm" if os.access("/dev/shm", os.W_OK) else None
    parent = os.environ.get("TMPDIR", ram_disk)
    with tempfile.TemporaryDirectory(prefix="zolt-bench-", dir=parent) as name:
        yield pathlib.Path(name)


# ---- Films ----

@dataclass
class Film:
    """A Y4M file, and one of its first picture alone."""
    clip: str
    width: int
    height: int
    pictures: int
    path: pathlib.Path
    first: pathlib.Path

    @property
    def size(self):
        return f"{self.width}x{self.height}"

    @property
    def macroblocks(self):
        """Of a picture."""
        return self.width * self.height // 256

    def rate(self, stream):
        """kbit/s of a file that holds this film."""
        return stream.stat().st_size * 8 * FRAME_RATE / self.pictures / 1000

    def bits_per_macroblock(self, rate):
        return rate * 1000 / FRAME_RATE / self.macroblocks

    def add_raw(self):
        """Writes the samples of both files alone beside them, under RAW_ENDING."""
        for path in (self.path, self.first):
            run(["ffmpeg", "-v", "error", "-nostdin", "-y", "-i", path, "-f", "rawvideo",
                 path.with_suffix(RAW_ENDING)])

    def remove(self):
        for path in (self.path, self.first):
            path.unlink()
            path.with_suffix(RAW_ENDING).unlink(missing_ok=True)


def size_argument(text):
    match = re.fullmatch(r"(\d+)x(\d+)", text)
    if not match or any(int(side) % 16 or int(side) == 0 for side in match.groups()):
        raise argparse.ArgumentTypeError(f"{text}: not a size of multiples of 16, such as 352x288")
    return text


def width_of(size):
    return int(size.split("x")[0])


def clip_widths():
    """The clips of ZOLT_TEST_CLIPS with their widths; empty where it is not set."""
    folder = os.environ.get("ZOLT_TEST_CLIPS")
    if not folder:
        return {}
    clips = {}
    for clip in sorted(pathlib.Path(folder).glob("*.mkv")):
        _, printed = run(["ffprobe", "-v", "error", "-select_streams", "v:0", "-show_entries",
                          "stream=width", "-of", "csv=p=0", clip])
        clips[clip] = int(printed)
    if not clips:
        give_up(f"{folder}: holds no *.mkv; ZOLT_TEST_CLIPS has to name a folder of clips")
    return clips


def nearest_clip(clips, size):
    """The clip whose width is nearest to that of a size; None without clips."""
    return min(clips, key=lambda clip: abs(clips[clip] - width_of(size)), default=None)


def pictures_of(size, frames):
    """How many pictures of a size are about as many macroblocks as `frames` of 1280x720, so that
    runs of every size take about as long; at most ten times as many."""
    width, height = map(int, size.split("x"))
    return max(2, min(round(frames * 1280 * 720 / (width * height)), 10 * frames))


def make_film(folder, size, clip, pictures):
    """Writes a Film: the clip scaled and repeated forwards; without a clip generated pictures."""
    width, height = map(int, size.split("x"))
    if clip:
        source, name = ["-stream_loop", "-1", "-i", str(clip)], clip.stem.split("_")[0]
    else:
        source = ["-f", "lavfi", "-i", f"testsrc2=size={size}:rate={FRAME_RATE}"]
        name = "generated"
    film = Film(name, width, height, pictures, folder / f"{name}-{size}.y4m",
                folder / f"{name}-{size}-first.y4m")
    for path, count in ((film.path, pictures), (film.first, 1)):
        run(["ffmpeg", "-v", "error", "-nostdin", "-y", *source, "-vf",
             f"setpts=N/{FRAME_RATE}/TB,scale={width}:{height}:flags=bicubic,format=yuv420p",
             "-r", FRAME_RATE, "-frames:v", count, "-f", "yuv4mpegpipe", path])
    return film


# ---- Encoders ----

@dataclass
class Encoder:
    """`command(source, target)` are the words that code one file into the other."""
    name: str
    command: Callable[[pathlib.Path, pathlib.Path], list]


def zoltenc(program, rate, key_interval):
    """rate: kbit/s."""
    return Encoder("zoltenc", lambda source, target: [
        program, source, "-o", target, "-b", rate, "-g", key_interval, "-t", 1, "-q"])


def engine(program, setting, key_interval, table=None):
    """bench_stream; setting: a QP as "qp28" or kbit/s as "200k"."""
    return Encoder("zolt", lambda source, target: [
        program, source, target, setting, key_interval, *([table] if table else [])])


def x264(preset, control, key_interval, options=()):
    """control: the options that set rate or quality."""
    return Encoder(preset, lambda source, target: [
        "x264", "--preset", preset, "--threads", 1, "--lookahead-threads", 1,
        "--no-sliced-threads", "--keyint", key_interval, "--min-keyint", key_interval,
        "--no-scenecut", *control, *options, "--no-progress", "-o", target, source])


def openh264(complexity, rate, key_interval, film):
    """openh264enc in a GStreamer pipeline, for a film with raw files: GStreamer's own Y4M reader
    refuses some of the headers that ffmpeg writes. rate: kbit/s."""
    return Encoder(f"openh264 {complexity}", lambda source, target: [
        "gst-launch-1.0", "-q", "filesrc", f"location={source.with_suffix(RAW_ENDING)}",
        "blocksize=65536", "!", "rawvideoparse", "format=i420", f"width={film.width}",
        f"height={film.height}", f"framerate={FRAME_RATE}/1", "!", "openh264enc",
        f"complexity={complexity}", "rate-control=bitrate", f"bitrate={1000 * rate}",
        f"gop-size={key_interval}", "multi-thread=1", "scene-change-detection=false", "!",
        "filesink", f"location={target}"])


# ---- Speed ----

@dataclass
class Speed:
    """Pictures a second of one run, without the start of the process; `run` are the seconds of the
    run and `start` those of a run of one picture, which are taken off."""
    processor: float
    wall: float
    run: Times
    start: Times


def speed(encoder, film, stream):
    start, _ = run(encoder.command(film.first, stream))
    whole, _ = run(encoder.command(film.path, stream))
    if whole.processor <= start.processor or whole.wall <= start.wall:
        give_up(f"{encoder.name}: {film.pictures} pictures of {film.size} take no longer than "
                "one; give more --frames")
    others = film.pictures - 1
    return Speed(others / (whole.processor - start.processor), others / (whole.wall - start.wall),
                 whole, start)


def in_turn(encoders, film, folder, rounds):
    """Runs each encoder in every round, forwards and backwards in turn, so that a slow drift of the
    machine meets all alike. Returns the speeds by encoder, and leaves the streams at
    stream_of(folder, encoder)."""
    speeds = [[] for _ in encoders]
    for index in range(rounds):
        order = range(len(encoders))
        for place in order if index % 2 == 0 else reversed(order):
            speeds[place].append(speed(encoders[place], film, stream_of(folder, encoders[place])))
    return speeds


def stream_of(folder, encoder):
    return folder / f"{encoder.name.replace(' ', '-')}.264"


def ratios(ours, theirs, clock):
    """Of the speeds of the same rounds; clock: "processor" or "wall"."""
    return [getattr(a, clock) / getattr(b, clock) for a, b in zip(ours, theirs)]


def median_speed(speeds):
    return statistics.median(entry.processor for entry in speeds)


def run_lengths(speeds):
    """Says how long runs took, and how much of that was the start of the process."""
    lengths = sorted(entry.run.processor for entry in speeds)
    starts = sorted(entry.start.processor for entry in speeds)
    return (f"runs of {lengths[0]:.2f} to {lengths[-1]:.2f} s of processor time, of which "
            f"{starts[0]:.3f} to {starts[-1]:.3f} s were taken off as the start of the process")


# ---- Rate and quality ----

def at_rate(target, rate_of, guess, slope, limits, tolerance=0.01, tries=12):
    """Looks for the x of `limits` (lowest, highest) where rate_of(x) is `target`, within a share of
    `tolerance`. `slope` is about what the logarithm of the rate gains where x gains 1; only its
    sign has to be right. Returns the best x that was tried and its rate.

    Steps outwards, ever further, until the target lies between two tries, then inwards by what the
    logarithms of their rates say (the Illinois rule: where one side is tried again, the other
    counts half), by a tenth of the distance at least.
    """
    tried = []
    reach = 1.3
    sides = {}  # the last try whose rate was too low (False) and too high (True), with its error
    side = None
    x = guess
    for _ in range(tries):
        rate = rate_of(x)
        error = math.log(rate / target)
        tried.append((abs(error), x, rate))
        if abs(error) <= math.log1p(tolerance):
            break
        if side == (error > 0) and len(sides) == 2:
            sides[not side] = (sides[not side][0], sides[not side][1] / 2)
        side = error > 0
        sides[side] = (x, error)
        if len(sides) == 2:
            (low, low_error), (high, high_error) = sides[False], sides[True]
            share = low_error / (low_error - high_error)
            following = low + (high - low) * min(max(share, 0.1), 0.9)
        else:
            following = min(max(x - reach * error / slope, limits[0]), limits[1])
            reach *= 2
        if following == x:
            break
        x = following
    _, best, rate = min(tried)
    return best, rate


def quality(stream, film):
    """PSNR-Y and SSIM-Y of a stream, both in decibels: of the mean squared error of all pictures
    (100 where there is none), and of 1 - SSIM (likewise)."""
    _, printed = run(["ffmpeg", "-v", "info", "-nostdin", "-r", FRAME_RATE, "-i", stream, "-r",
                      FRAME_RATE, "-i", film.path, "-filter_complex",
                      "[0:v][1:v]psnr[compared];[compared][1:v]ssim", "-f", "null", "-"])
    psnr = re.search(r"PSNR y:(\S+)", printed)
    ssim = re.search(r"SSIM Y:\S+ \((\S+)\)", printed)
    counted = re.findall(r"frame= *(\d+)", printed)
    if not psnr or not ssim or not counted:
        give_up(f"ffmpeg says no PSNR or SSIM of {stream}:\n{printed}")
    if int(counted[-1]) != film.pictures:
        give_up(f"{stream}: holds {counted[-1]} pictures, not the {film.pictures} of the film")
    return tuple(min(float(found.group(1)), 100.0) for found in (psnr, ssim))
