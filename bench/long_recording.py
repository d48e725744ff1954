#!/usr/bin/env python3
"""One long recording by the daemon: whether sound and picture stay in step, and memory stays flat.

    bench/long_recording.py [BUILD_FOLDER] [--minutes 30]

A program lets the screen of 1080x1920 flash and beeps at the same instant, once a second. The movie is decoded afterwards.
Flashes for which the program or the sound server were late themselves, as they say, do not count. Needs Xvfb, pulseaudio,
ffmpeg, and the programs kelvod, kelvoctl and flash_program in the build folder.
"""
import array
import os
import statistics
import subprocess
import threading
import time

from recording import HEIGHT, WIDTH, command_line, running, stage

RATE = 44100
BLOCK = RATE // 1000  # samples: a millisecond
LOUD = 6500
PUNCTUAL = 0.003  # seconds
STEP = 0.020
END = 60  # seconds at the beginning and at the end that are looked at


def decoded(*command):
    return subprocess.run(["ffmpeg", "-nostdin", "-v", "error", *command, "-"], check=True, capture_output=True).stdout


def flashes_in(movie):
    """When the picture turns bright, in seconds of the movie."""
    times = subprocess.run(["ffprobe", "-v", "error", "-select_streams", "v:0", "-show_entries", "frame=pts_time", "-of",
                            "csv=p=0", movie], check=True, capture_output=True, text=True).stdout.split()
    pixels = decoded("-i", movie, "-map", "0:v:0", "-fps_mode", "passthrough", "-vf", "scale=1:1:flags=area", "-pix_fmt",
                     "gray", "-f", "rawvideo")
    bright = [pixel > 128 for pixel in pixels]
    return [float(times[i].strip(",")) for i in range(1, len(bright)) if bright[i] and not bright[i - 1]]


def beeps_in(movie, track):
    """When beeps begin in the movie's sound track, in seconds of the movie."""
    sound = array.array("h", decoded("-i", movie, "-map", f"0:a:{track}", "-af", "aresample=async=0:first_pts=0,pan=mono|c0=c0",
                                     "-ar", str(RATE), "-f", "s16le"))
    beeps, loud_until = [], -1
    for begin in range(0, len(sound), BLOCK):
        block = sound[begin:begin + BLOCK]
        if max(block) < LOUD and -min(block) < LOUD:
            continue
        first = begin + next(i for i, sample in enumerate(block) if abs(sample) >= LOUD)
        if first / RATE - loud_until > 0.05:
            beeps.append(first / RATE)
        loud_until = (begin + BLOCK) / RATE
    return beeps


def punctual_flashes(log):
    """The moments of the host's clock at which the program flashed in time with its beep."""
    beeps, flashes = {}, {}
    for line in log:
        words = line.split()
        if len(words) == 4:
            (beeps if words[0] == "beep" else flashes)[int(words[1])] = [int(word) / 1e9 for word in words[2:]]
    return [flashes[number][1] for number in sorted(beeps.keys() & flashes.keys())
            if abs(beeps[number][1] - beeps[number][0]) <= PUNCTUAL
            and flashes[number][1] - beeps[number][0] <= PUNCTUAL]


def nearest(moments, moment):
    return min(moments, key=lambda each: abs(each - moment), default=float("inf"))


def steps(movie, log, begin):
    """For each punctual flash: when it is in the movie, and by how much its beep comes later."""
    seen = flashes_in(movie)
    heard = max((beeps_in(movie, track) for track in (0, 1)), key=len)  # the other one is the microphone's
    found = []
    for flash in punctual_flashes(log):
        shown = nearest(seen, flash - begin)
        if abs(shown - (flash - begin)) < 0.3:
            found.append((shown, nearest(heard, shown) - shown))
    return found


def show(what, part):
    if not part:
        raise SystemExit(f"{what}: no flash was punctual")
    delays = [1000 * delay for _, delay in part]
    print(f"{what:28} {len(part):4d} beeps, {statistics.median(delays):+6.1f} ms after their flash in the median, "
          f"{max(delays, key=abs):+6.1f} ms at worst   bound {1000 * STEP:.0f} ms")


class MemoryWatch:
    """The daemon's resident memory every ten seconds, in MB."""

    def __init__(self, daemon):
        self.values, self.over = [], threading.Event()
        self.thread = threading.Thread(target=self.watch, args=(daemon,))
        self.thread.start()

    def watch(self, daemon):
        while not self.over.wait(10):
            self.values.append(daemon.kilobytes("VmRSS") / 1024)

    def end(self):
        self.over.set()
        self.thread.join()
        return self.values


def main():
    parser = command_line()
    parser.add_argument("--minutes", type=float, default=30)
    arguments = parser.parse_args()
    with stage(arguments.build) as (daemon, folder):
        with open(folder / "log", "w+") as log, running(daemon.build / "flash_program", os.environ["DISPLAY"], WIDTH,
                                                        HEIGHT, 1000, stderr=log):
            time.sleep(1)
            memory = MemoryWatch(daemon)
            daemon.record(60 * arguments.minutes, folder / "long.mp4")
            resident = memory.end()
            log.seek(0)
            told = log.readlines()
        begin = next(when for when, line in daemon.lines if "Screen sampled" in line)
        found = steps(folder / "long.mp4", told, begin)
        last = max(when for when, _ in found)
        print(f"{arguments.minutes:.0f} minutes in one piece, {(folder / 'long.mp4').stat().st_size / 1e6:.1f} MB")
        show("first minute", [each for each in found if each[0] < END])
        show("last minute", [each for each in found if each[0] > last - END])
        show("all", found)
        print(f"{'resident memory, MB':28} {resident[0]:.1f} after 10 s, {resident[-1]:.1f} at the end, "
              f"{max(resident):.1f} at most")


if __name__ == "__main__":
    main()
