#!/usr/bin/env python3
"""Movie writing, trimming and mixing against the ffmpeg program with the same input, encoder, preset, rate and threads.

movies.py [BUILD_FOLDER]   (build/release by default; needs some 6 GB below $TMPDIR)
"""
import json
import math
import os
import pathlib
import subprocess
import sys
import tempfile
import time

BUILD = pathlib.Path(sys.argv[1] if len(sys.argv) > 1 else pathlib.Path(__file__).parents[1] / "build/release")
WIDTH, HEIGHT, RATE, FRAMES = 1080, 1920, 60, 600
BIT_RATE = 5_000_000
THREADS = max(1, min(4, os.cpu_count()))


def ours(*arguments):
    return json.loads(subprocess.run([str(a) for a in arguments], check=True, capture_output=True).stdout)


def peer(*arguments):
    """Runs ffmpeg; its processor seconds, elapsed seconds and peak memory in kilobytes."""
    begin = time.monotonic()
    process = subprocess.Popen(["ffmpeg", "-nostdin", "-v", "error", "-y", *[str(a) for a in arguments]])
    _, status, usage = os.wait4(process.pid, 0)
    if status != 0:
        sys.exit("ffmpeg failed")
    return {"processor": usage.ru_utime + usage.ru_stime, "seconds": time.monotonic() - begin,
            "kilobytes": usage.ru_maxrss}


def show(what, mine, theirs, bound):
    print(f"{what:42} {mine:12.3f} {theirs:12.3f} {mine / theirs:8.2f}   bound {bound}")


def make_raw(folder):
    """Scrolling text-like pictures and a tone, as raw files."""
    subprocess.run(["ffmpeg", "-nostdin", "-v", "error", "-f", "lavfi", "-i",
                    f"testsrc2=s={WIDTH}x{HEIGHT}:r={RATE}", "-frames:v", str(FRAMES), "-pix_fmt", "bgr0",
                    "-f", "rawvideo", folder / "video.raw"], check=True)
    subprocess.run(["ffmpeg", "-nostdin", "-v", "error", "-f", "lavfi", "-i", f"sine=r=44100:d={FRAMES / RATE}",
                    "-ac", "2", "-f", "s16le", folder / "audio.raw"], check=True)


def write_movie(folder):
    mine = ours(BUILD / "movie_writer_bench", folder / "video.raw", folder / "audio.raw", WIDTH, HEIGHT, FRAMES,
                BIT_RATE, folder / "ours.mp4")
    sound = ["-f", "s16le", "-ar", "44100", "-ac", "2", "-i", folder / "audio.raw"]
    theirs = peer("-f", "rawvideo", "-pix_fmt", "bgr0", "-s", f"{WIDTH}x{HEIGHT}", "-r", RATE, "-i",
                  folder / "video.raw", *sound, *sound, "-map", 0, "-map", 1, "-map", 2, "-c:v", "libx264",
                  "-preset", "superfast", "-tune", "zerolatency", "-profile:v", "high", "-pix_fmt", "yuv420p",
                  "-b:v", BIT_RATE, "-g", 60, "-threads", THREADS, "-c:a", "aac", "-b:a", "128k",
                  "-movflags", "frag_keyframe+empty_moov+default_base_moof", folder / "theirs.mp4")
    show("writer: processor seconds", mine["processor"], theirs["processor"], 0.80)
    show("writer: peak memory, MB", mine["kilobytes"] / 1024, theirs["kilobytes"] / 1024, 0.50)
    work = mine["conversion"] + mine["encoding"] + mine["own"]
    print(f"writer: conversion {mine['conversion']:.3f} s, encoding {mine['encoding']:.3f} s, all else "
          f"{mine['own']:.3f} s of processor: {mine['own'] / work:.1%} of the total   bound 3 %")


def trim_ours(source, output):
    return ours(BUILD / "movie_export_bench", "trim", source, output, 5, 590)


def trim_theirs(source, output):
    return peer("-ss", 5, "-i", source, "-t", 590, "-map", 0, "-c", "copy", output)


def mix_ours(source, output):
    return ours(BUILD / "movie_export_bench", "mix", source, output)


def mix_theirs(source, output):
    return peer("-i", source, "-filter_complex", "[0:a:0][0:a:1]amix=inputs=2:normalize=0[a]", "-map", "0:v", "-map",
                "[a]", "-c:v", "libx264", "-preset", "superfast", "-crf", 18, "-bf", 0, "-c:a", "aac", "-b:a",
                "192k", output)


def by_turns(turns, mine, theirs, source, output):
    """The best of each figure of both, from the same state of the cache and the disk; the first turn warms up."""
    best = [{}, {}]
    for _ in range(turns):
        for figures, run in zip(best, (mine, theirs)):
            os.sync()
            for name, figure in run(source, output).items():
                figures[name] = min(figure, figures.get(name, figure))
            output.unlink()
    return best


def export_movies(folder):
    source = folder / "long.mp4"
    subprocess.run(["ffmpeg", "-nostdin", "-v", "error", "-stream_loop", str(math.ceil(600 * RATE / FRAMES) - 1),
                    "-i", folder / "ours.mp4", "-map", "0", "-c", "copy", source], check=True)
    mine, theirs = by_turns(4, trim_ours, trim_theirs, source, folder / "trim.mp4")
    show("trim of 10 minutes: seconds", mine["seconds"], theirs["seconds"], 1.2)
    mine, theirs = by_turns(5, mix_ours, mix_theirs, folder / "ours.mp4", folder / "mix.mp4")
    show("mix of 10 seconds: seconds", mine["seconds"], theirs["seconds"], 1.0)
    show("mix of 10 seconds: processor seconds", mine["processor"], theirs["processor"], 1.0)


def finish_movies(folder):
    for minutes in (10, 60):
        path = folder / f"finish{minutes}.mp4"
        mine = ours(BUILD / "movie_export_bench", "finish", path, minutes * 60)
        path.unlink()
        print(f"finish of {minutes} minutes: {mine['seconds']:.3f} s, {mine['kilobytes']} kB more memory"
              + ("   bound 0.2 s" if minutes == 10 else ""))


if __name__ == "__main__":
    with tempfile.TemporaryDirectory() as name:
        place = pathlib.Path(name)
        make_raw(place)
        print(f"{'':42} {'ours':>12} {'ffmpeg':>12} {'ratio':>8}")
        write_movie(place)
        export_movies(place)
        finish_movies(place)
