#!/usr/bin/env python3
"""Makes the system's own sounds, resources/Sounds/*.wav. Run once; the files are kept with the sources.

Two soft notes each: upwards where a recording begins, downwards where it ends.
"""
import math
import pathlib
import struct
import wave

RATE = 22050
NOTE = 0.11  # seconds
FADE = 0.2  # seconds in which a note dies away
LEVEL = 9000
SOUNDS = {1117: (880.0, 1320.0), 1118: (1320.0, 880.0)}


def sample(time, notes):
    """The sum of the notes that sound at `time`, each beginning softly and dying away."""
    total = 0.0
    for index, frequency in enumerate(notes):
        age = time - index * NOTE
        if 0 <= age < FADE:
            envelope = min(age / 0.005, 1.0) * (1 - age / FADE) ** 2
            total += envelope * math.sin(2 * math.pi * frequency * age)
    return round(LEVEL * total)


def main():
    folder = pathlib.Path(__file__).resolve().parents[4] / "resources" / "Sounds"
    for number, notes in SOUNDS.items():
        count = round(RATE * (NOTE * (len(notes) - 1) + FADE))
        with wave.open(str(folder / f"{number}.wav"), "wb") as file:
            file.setnchannels(1)
            file.setsampwidth(2)
            file.setframerate(RATE)
            file.writeframes(b"".join(struct.pack("<h", sample(i / RATE, notes)) for i in range(count)))


if __name__ == "__main__":
    main()
