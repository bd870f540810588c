#!/usr/bin/env python3
"""Writes the seed corpus of every fuzz target into fuzz/corpus/. Run it after changing how a target
reads its bytes. The seeds are in seeds.txt, which says how; only files of audio are made here."""
import pathlib
import re
import struct


def word(value):
    return struct.pack("<h", value)


def number(value):
    return bytes([value]) if 0 <= value < 255 else b"\xff" + struct.pack("<i", value)


def values(fields):
    """1,3*5;6 is 1 5 6 5 6 5 6."""
    parts = [part.rpartition("*") for part in fields.split(",") if part]
    return [value for times, _, group in parts for value in int(times or 1) * group.split(";")]


def encode(text):
    kind, _, fields = text.partition(":")
    if kind == "literal":
        samples = values(fields)
        return bytes([0, len(samples)]) + b"".join(word(int(sample)) for sample in samples)
    if kind in ("constant", "noise", "voice"):
        samples, level, *period = map(int, fields.split(","))
        head = bytes([("constant", "noise", "voice").index(kind) + 1, samples // 40 - 1])
        return head + word(level) + bytes(p - 1 for p in period)
    if kind == "runs":
        runs = values(fields)
        return bytes([len(runs)]) + bytes(64 * "osn".index(run[-1]) + int(run[:-1]) for run in runs)
    return number(int(text[1:])) if text[0] == "#" else bytes([int(text)])


def expand(text, names):
    text = re.sub(r"\$(\w+)", lambda m: names[m[1]], text)
    text = re.sub(r"{([^|]*)\|([^}]*)}",
                  lambda m: " ".join(m[1].replace("_", item) for item in m[2].split()), text)
    return re.sub(r"(\d+)\(([^)]*)\)", lambda m: int(m[1]) * (m[2] + " "), text)


def seeds(path):
    names = {}
    for line in path.read_text().splitlines():
        name, mark, text = re.match(r"([^ =:]*) ?([=:]?)(.*)", line).groups()
        if name.startswith("["):
            target = name[1:-1]
        elif mark == "=":
            names[name] = expand(text, names)
        elif mark and not name.startswith("#"):
            for index in range(4) if "@" in name else [0]:
                at = lambda given: given.replace("@", str(index))
                words = expand(at(text), names).split()
                yield target, at(name), b"".join(map(encode, words))


def wav(data, code=1, channels=1, rate=16000, bits=16, promised=None):
    block = channels * bits // 8
    form = struct.pack("<HHIIHH", code, channels, rate, rate * block % (1 << 32), block, bits)
    size = len(data) if promised is None else promised
    body = b"WAVEfmt " + struct.pack("<I", 16) + form + b"data" + struct.pack("<I", size) + data
    return b"RIFF" + struct.pack("<I", min(size + 36, 0xffffffff)) + body


def chunk(name, body):
    return name + struct.pack("<I", len(body)) + body


def audio_source():
    """How it is read, pieces of 8 bytes in a pipe, and a file."""
    ramp = b"".join(word(step * 100 % 30000) for step in range(400))
    floats = struct.pack("<8f", 0, 0.5, -1, 1, 7, float("inf"), float("nan"), 1e-30)
    form = wav(b"")[20:36]
    # The rate of AIFF is an 80-bit float: 16000 = 1.953125 * 2^13.
    aiff = b"AIFFCOMM" + struct.pack(">IhIhHQ", 18, 1, 400, 16, 16383 + 13, 16000 << 50)
    aiff += b"SSND" + struct.pack(">3I", len(ramp) + 8, 0, 0) + ramp
    guid = bytes.fromhex("f3acd3118cd100c04f8edb8a")
    w64 = b"wave" + guid + b"fmt " + guid + struct.pack("<Q", 40) + form + b"data" + guid
    rf64 = b"WAVE" + chunk(b"ds64", struct.pack("<QQQI", 900, len(ramp), 0, 0)) + chunk(b"fmt ", form)
    desc = struct.pack(">qd4s5I", 32, 16000, b"lpcm", 0, 2, 1, 1, 16)
    mean = b"\0\7"
    return {
        "wav16": mean + wav(ramp),
        "wav8": mean + wav(ramp[:300], rate=8000, bits=8),
        "wav24": mean + wav(ramp[:600], bits=24),
        "wav_float": mean + wav(floats, code=3, bits=32),
        "wav_alaw": mean + wav(ramp[:300], code=6, rate=8000, bits=8),
        "stereo_mean": mean + wav(ramp, channels=2),
        "stereo_second": b"\x80\7" + wav(ramp, channels=2),
        "channel_absent": b"\xc0\7" + wav(ramp, channels=2),
        "resampled": mean + wav(ramp, rate=44100),
        "slowest": mean + wav(ramp[:40], rate=63),
        "too_fast": mean + wav(ramp, rate=(1 << 31) - 1),
        "many_channels": mean + wav(ramp, channels=1024, rate=4000000),
        "cut_short": mean + wav(ramp, promised=9999),
        "open_length": mean + wav(ramp, promised=0xffffffff),
        "zero_length": mean + wav(ramp, promised=0),
        "junk": mean + wav(ramp)[:36] + chunk(b"junk", b"x" * 99 + b"\0") * 70 + wav(ramp)[36:],
        "au": mean + b".snd" + struct.pack(">5I", 24, len(ramp), 3, 16000, 1) + ramp,
        "aiff": mean + b"FORM" + struct.pack(">I", len(aiff)) + aiff,
        "rf64": mean + b"RF64" + b"\xff" * 4 + rf64 + b"data" + b"\xff" * 4 + ramp,
        "w64": mean + b"riff" + bytes.fromhex("2e91cf11a5d628db04c10000") + struct.pack("<Q", 900)
        + w64 + struct.pack("<Q", 24 + len(ramp)) + ramp,
        "caf": mean + b"caff\0\1\0\0desc" + desc + b"data" + struct.pack(">qI", -1, 0) + ramp,
        "pieces": b"\0\0" + wav(ramp),
        "cut_in_head": b"\0\x84" + wav(ramp),
        "cut_in_audio": b"\0\xc0" + wav(ramp),
        "raw": b"\3\7" + ramp,
        "raw_odd": b"\x3f\7" + ramp[:-1],
        "raw_empty": b"\3\7",
        "empty": mean,
        "text": mean + b"no audio at all\n",
    }


here = pathlib.Path(__file__).parent
files = [("audio_source", name, content) for name, content in audio_source().items()]
for target, name, content in [*seeds(here / "seeds.txt"), *files]:
    folder = here / "corpus" / target
    folder.mkdir(parents=True, exist_ok=True)
    (folder / name).write_bytes(content)
