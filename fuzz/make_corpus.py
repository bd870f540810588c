#!/usr/bin/env python3
"""Writes the seeds of seeds.txt, which says how they read, to fuzz/corpus/. Run it after changing
how a target reads its bytes."""
import pathlib
import re
import struct


def number(value):
    return bytes([value]) if 0 <= value < 255 else b"\xff" + struct.pack("<i", value)


def values(fields):
    """1,3*5;6 is 1 5 6 5 6 5 6."""
    parts = [part.rpartition("*") for part in fields.split(",") if part]
    return [value for times, _, group in parts for value in int(times or 1) * group.split(";")]


def encode(text):
    kind, _, fields = text.partition(":")
    if kind == "literal":
        samples = list(map(int, values(fields)))
        return struct.pack(f"<BB{len(samples)}h", 0, len(samples), *samples)
    if kind in ("constant", "noise", "voice"):
        samples, level, *period = map(int, fields.split(","))
        number_of_kind = ("constant", "noise", "voice").index(kind) + 1
        return struct.pack("<BBh", number_of_kind, samples // 40 - 1, level) + bytes(p - 1 for p in period)
    if kind == "runs":
        runs = values(fields)
        return bytes([len(runs)]) + bytes(64 * "osn".index(run[-1]) + int(run[:-1]) for run in runs)
    return number(int(text[1:])) if text[0] == "#" else bytes([int(text)])


def expand(text, names):
    text = re.sub(r"\$(\w+)", lambda m: names[m[1]], text)
    text = re.sub(r"{([^|]*)\|([^}]*)}",
                  lambda m: " ".join(m[1].replace("_", item) for item in m[2].split()), text)
    return re.sub(r"(\d+)\(([^)]*)\)", lambda m: int(m[1]) * (m[2] + " "), text)


here, names = pathlib.Path(__file__).parent, {}
for line in (here / "seeds.txt").read_text().splitlines():
    name, mark, text = re.match(r"([^ =:]*) ?([=:]?)(.*)", line).groups()
    if name.startswith("["):
        folder = here / "corpus" / name[1:-1]
        folder.mkdir(parents=True, exist_ok=True)
    elif mark == "=":
        names[name] = expand(text, names)
    elif mark and not name.startswith("#"):
        for index in "0123" if "@" in name else "0":
            words = expand(text.replace("@", index), names).split()
            (folder / name.replace("@", index)).write_bytes(b"".join(map(encode, words)))
