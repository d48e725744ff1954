#!/usr/bin/env python3
"""Whole recordings by the daemon: what they cost against ffmpeg, how soon they begin and end, and what they leave.

    bench/recording.py [BUILD_FOLDER] [--seconds 40] [--recordings 200] [--long 60]

Starts an X server of 1080x1920, a PulseAudio server with a microphone and an application that plays, and a program that
scrolls text. The peer is `ffmpeg -f x11grab` on the same screen and the same sound, in turn, with the encoder, preset,
bit rate and size that the daemon uses (x264 superfast, zerolatency, 5 Mb/s). Needs Xvfb, pulseaudio, ffmpeg.
"""
import argparse
import contextlib
import json
import os
import pathlib
import re
import statistics
import subprocess
import tempfile
import threading
import time

WIDTH, HEIGHT, RATE = 1080, 1920, 60
PICTURES = 50  # a second: fewer than frames, so that each one has its turn
THREADS = max(1, min(4, os.cpu_count()))
PEER_QUEUE = 16  # grabbed pictures: with its usual 8, ffmpeg leaves out a third of them and so encodes less
TURNS = 4  # of each, one after the other
COUNTER = (400, 250, 8, 5)  # pixels and blocks of the numbered picture in the screen's corner
QUIET = {"stdout": subprocess.DEVNULL, "stderr": subprocess.DEVNULL}


@contextlib.contextmanager
def running(*command, **options):
    process = subprocess.Popen([str(word) for word in command], **options)
    try:
        yield process
    finally:
        process.kill()
        process.wait()


class Daemon:
    """The daemon on a root of its own; its log lines with the times at which they came."""

    def __init__(self, build, folder, *options):
        self.build, self.root = build, folder / "root"
        self.socket = self.root / "run/kelvod/com.quillon.kelvod"
        preferences = self.root / "private/var/mobile/Library/Preferences/com.quillon.kelvod.json"
        preferences.parent.mkdir(parents=True)
        preferences.write_text(json.dumps({"KVBitRateOverride": 5_000_000}))
        self.lines = []
        self.answers = []
        self.process = subprocess.Popen([build / "kelvod", "--root", self.root, "--log", "stderr", *options],
                                        stderr=subprocess.PIPE, text=True, errors="replace")
        threading.Thread(target=self.read, daemon=True).start()
        while not self.socket.exists():
            time.sleep(0.01)

    def read(self):
        for line in self.process.stderr:
            self.lines.append((time.monotonic(), line))

    def record(self, seconds, output):
        """Also notes how long after the stop kelvoctl had its answer, had put the movie into place and had ended."""
        subprocess.run([self.build / "kelvoctl", "record", "--socket", self.socket, "--seconds", str(seconds),
                        "--size", f"{WIDTH}x{HEIGHT}", "--microphone", "--output", output], check=True, **QUIET)
        end = time.monotonic()
        stop = max(when for when, line in list(self.lines) if "ConnectionManager: stopRecordingWithHandler" in line)
        self.answers.append((end - stop) * 1000)

    def processor_seconds(self):
        fields = pathlib.Path(f"/proc/{self.process.pid}/stat").read_text().rsplit(")", 1)[1].split()
        return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")

    def kilobytes(self, key):
        status = pathlib.Path(f"/proc/{self.process.pid}/status").read_text()
        return int(re.search(rf"^{key}:\s*(\d+)", status, re.M).group(1))

    def reset_peak(self):
        pathlib.Path(f"/proc/{self.process.pid}/clear_refs").write_text("5")

    def entries(self, folder):
        return len(os.listdir(f"/proc/{self.process.pid}/{folder}"))

    def between(self, begin, end):
        """Milliseconds from each line with `begin` to the next one with `end`."""
        found, since = [], None
        for when, line in list(self.lines):
            if begin in line and since is None:
                since = when
            elif end in line and since is not None:
                found.append((when - since) * 1000)
                since = None
        return found


def numbers_in(movie):
    """The numbers that the movie's frames show, in order."""
    width, height, columns, rows = COUNTER
    pixels = subprocess.run(
        ["ffmpeg", "-nostdin", "-v", "error", "-i", movie, "-map", "0:v:0", "-fps_mode", "passthrough", "-vf",
         f"crop={width}:{height}:0:0,scale={columns * 10}:{rows * 10}:flags=area", "-pix_fmt", "gray", "-f",
         "rawvideo", "-"], check=True, capture_output=True).stdout
    numbers = []
    for frame in range(0, len(pixels), columns * rows * 100):
        bits = 0
        for i in range(columns * rows):
            x, y = i % columns * 10 + 5, i // columns * 10 + 5
            bits |= (pixels[frame + y * columns * 10 + x] > 127) << i
        number, check = bits & 0xffffffff, bits >> 32
        if check == (0xA5 ^ number ^ number >> 8 ^ number >> 16 ^ number >> 24) & 0xff:
            numbers.append(number)
    return numbers


def pictures(movies):
    """How many pictures are in the movies, and how many in per cent were on the screen meanwhile and are not."""
    kept, shown = 0, 0
    for movie in movies:
        numbers = set(numbers_in(movie))
        kept += len(numbers)
        shown += max(numbers) - min(numbers) + 1
    return kept, 100 * (shown - kept) / shown


def kelvod(daemon, seconds, output):
    """Processor seconds and peak kilobytes of the daemon while it records."""
    daemon.reset_peak()
    before = daemon.processor_seconds()
    daemon.record(seconds, output)
    return daemon.processor_seconds() - before, daemon.kilobytes("VmHWM")


def ffmpeg(seconds, output):
    """Processor seconds and peak kilobytes of the peer."""
    process = subprocess.Popen(
        ["ffmpeg", "-nostdin", "-v", "error", "-y", "-thread_queue_size", str(PEER_QUEUE), "-f", "x11grab",
         "-framerate", str(RATE), "-video_size", f"{WIDTH}x{HEIGHT}", "-i", os.environ["DISPLAY"], "-f", "pulse",
         "-i", "mic", "-f", "pulse", "-i", "speaker.monitor", "-map", "0:v", "-map", "1:a", "-map", "2:a", "-t",
         str(seconds), "-c:v", "libx264", "-preset", "superfast", "-tune", "zerolatency", "-profile:v", "high",
         "-pix_fmt", "yuv420p", "-b:v", "5000000", "-g", "60", "-threads", str(THREADS), "-c:a", "aac", "-ac", "2",
         "-b:a", "128k", output])
    _, status, usage = os.wait4(process.pid, 0)
    if status != 0:
        raise SystemExit("ffmpeg failed")
    return usage.ru_utime + usage.ru_stime, usage.ru_maxrss


def take_turns(daemon, folder, share, seconds):
    """What each turn cost, ours and theirs; who goes first changes, as machines change their speed meanwhile."""
    costs = {"ours": [], "theirs": []}
    with running(daemon.build / "moving_screen", os.environ["DISPLAY"], PICTURES, share, stdout=subprocess.PIPE,
                 text=True) as screen:
        screen.stdout.readline()
        pulse_client = dict(os.environ, PULSE_PROP=f"application.process.id={screen.pid}")
        with running("sh", "-c", "exec pacat --playback --raw --rate=44100 --channels=1 --format=s16le "
                     f"--device=speaker {folder}/tone", env=pulse_client, **QUIET):
            daemon.record(1, folder / "warm.mp4")
            (folder / "warm.mp4").unlink()
            time.sleep(1)
            for turn in range(TURNS):
                for side in sorted(costs, reverse=turn % 2 == 1):
                    movie = folder / f"{side}{turn}.mp4"
                    costs[side].append(kelvod(daemon, seconds / TURNS, movie) if side == "ours"
                                       else ffmpeg(seconds / TURNS, movie))
    return costs


def compare(daemon, folder, name, share, bound, seconds):
    costs = take_turns(daemon, folder, share, seconds)
    (ours, memory), (theirs, peak) = ((sum(used for used, _ in costs[side]), max(peak for _, peak in costs[side]))
                                      for side in ("ours", "theirs"))
    ratios = [mine / other for (mine, _), (other, _) in zip(costs["ours"], costs["theirs"])]
    print(f"{name + ': processor seconds':44} {ours:9.2f} {theirs:9.2f} {ours / theirs:7.3f}   bound {bound}   "
          f"({min(ratios):.3f} to {max(ratios):.3f} in {TURNS} turns)")
    print(f"{'  peak memory, MB':44} {memory / 1024:9.1f} {peak / 1024:9.1f} {memory / peak:7.2f}   bound 0.50")
    movies = {side: [folder / f"{side}{turn}.mp4" for turn in range(TURNS)] for side in costs}
    if share > 0:
        (our_pictures, ours_missed), (their_pictures, theirs_missed) = map(pictures, movies.values())
        print(f"{'  pictures missed, %':44} {ours_missed:9.2f} {theirs_missed:9.2f}           bound 0.1")
        # Who leaves out pictures has less to encode.
        cost, peer_cost = 1000 * ours / our_pictures, 1000 * theirs / their_pictures
        print(f"{'  processor ms for each picture that is kept':44} {cost:9.2f} {peer_cost:9.2f} {cost / peer_cost:7.2f}")
    for movie in movies["ours"] + movies["theirs"]:
        movie.unlink()


def percentile(values, share):
    return sorted(values)[min(len(values) - 1, int(share * len(values)))]


def show_times(what, values, bound):
    print(f"{what:44} median {statistics.median(values):6.1f} ms, 95 % {percentile(values, 0.95):6.1f} ms   "
          f"bound {bound} ms  ({len(values)})")


def many(daemon, folder, count):
    def state():
        return daemon.entries("fd"), daemon.entries("task"), daemon.kilobytes("VmRSS")

    with running(daemon.build / "moving_screen", os.environ["DISPLAY"], PICTURES, 1, **QUIET):
        for _ in range(5):
            daemon.record(0.2, folder / "short.mp4")
            (folder / "short.mp4").unlink()
        time.sleep(1)
        before = state()
        daemon.lines.clear()
        daemon.answers.clear()
        for _ in range(count):
            daemon.record(0.2, folder / "short.mp4")
            (folder / "short.mp4").unlink()
        time.sleep(1)
        after = state()
    show_times("request to first frame", daemon.between("ConnectionManager: startRecordingWindow", "Screen sampled"),
               100)
    show_times("stop to the client's end, short recordings", daemon.answers, 150)
    for name, old, new in zip(("descriptors", "threads", "resident kB"), before, after):
        print(f"{name + f' before and after {count} recordings':44} {old:9d} {new:9d}")


def long(daemon, folder, seconds):
    with running(daemon.build / "moving_screen", os.environ["DISPLAY"], PICTURES, 1, **QUIET):
        daemon.answers.clear()
        daemon.record(seconds, folder / "long.mp4")
    show_times(f"stop to the client's end after {seconds:.0f} s", daemon.answers, 150)
    (folder / "long.mp4").unlink()


def start_sound(stack, folder):
    socket = folder / "sound"
    os.environ["PULSE_SERVER"] = f"unix:{socket}"
    stack.enter_context(running(
        "pulseaudio", "-n", "--daemonize=no", "--exit-idle-time=-1", "--use-pid-file=no", "-L",
        f"module-native-protocol-unix socket={socket} auth-anonymous=1", "-L",
        "module-null-sink sink_name=speaker rate=44100 norewinds=1", "-L",
        "module-null-sink sink_name=micfeed rate=44100 norewinds=1", "-L",
        "module-remap-source source_name=mic master=micfeed.monitor", **QUIET))
    while subprocess.run(["pactl", "info"], **QUIET).returncode != 0:
        time.sleep(0.05)
    for command in ("set-default-source mic", "set-default-sink speaker"):
        subprocess.run(["pactl", *command.split()], check=True)
    subprocess.run(["ffmpeg", "-nostdin", "-v", "error", "-f", "lavfi", "-i", "sine=frequency=880:r=44100:d=600", "-f",
                    "s16le", folder / "tone"], check=True)
    stack.enter_context(running("pacat", "--playback", "--raw", "--rate=44100", "--channels=1", "--format=s16le",
                                "--device=micfeed", folder / "tone", **QUIET))


def start_display(stack):
    reading, writing = os.pipe()
    stack.enter_context(running("Xvfb", "-displayfd", writing, "-screen", "0", f"{WIDTH}x{HEIGHT}x24", "-nolisten",
                                "tcp", "-noreset", pass_fds=[writing], **QUIET))
    os.environ["DISPLAY"] = ":" + os.read(reading, 100).decode().strip()


def command_line():
    parser = argparse.ArgumentParser()
    parser.add_argument("build", nargs="?", type=pathlib.Path,
                        default=pathlib.Path(__file__).resolve().parents[1] / "build/release")
    return parser


@contextlib.contextmanager
def stage(build, *options):
    """A daemon with a screen and sound to record, and a folder for movies; all gone afterwards."""
    os.environ["DBUS_SYSTEM_BUS_ADDRESS"] = "unix:path=/nonexistent"
    with tempfile.TemporaryDirectory() as name, contextlib.ExitStack() as stack:
        folder = pathlib.Path(name)
        os.environ["XDG_RUNTIME_DIR"] = name
        start_display(stack)
        start_sound(stack, folder)
        daemon = Daemon(build.resolve(), folder, *options)
        stack.callback(lambda: (daemon.process.terminate(), daemon.process.wait()))
        yield daemon, folder


def main():
    parser = command_line()
    parser.add_argument("--seconds", type=float, default=40)
    parser.add_argument("--recordings", type=int, default=200)
    parser.add_argument("--long", type=float, default=60)
    arguments = parser.parse_args()
    with stage(arguments.build, "--no-sample-log") as (daemon, folder):  # as the user's service runs
        print(f"{'':44} {'kelvod':>9} {'ffmpeg':>9} {'ratio':>7}")
        compare(daemon, folder, "moving screen", 1, 0.70, arguments.seconds)
        compare(daemon, folder, "screen that moves a quarter of the time", 0.25, 0.35, arguments.seconds)
        compare(daemon, folder, "still screen", 0, 0.05, arguments.seconds)
    with stage(arguments.build) as (daemon, folder):
        many(daemon, folder, arguments.recordings)
        long(daemon, folder, arguments.long)


if __name__ == "__main__":
    main()
