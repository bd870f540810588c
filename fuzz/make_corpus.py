#!/usr/bin/env python3
"""Writes the seed corpus of every fuzz target into fuzz/corpus/. Run it after changing how a target
reads its bytes."""
import pathlib
import struct

LITERAL, CONSTANT, NOISE, PULSES = range(4)
AUDIO = 7  # the byte before a chunk of audio; all targets that take audio know it


def word(value):
    return struct.pack("<h", value)


def number(value):
    return bytes([value]) if 0 <= value < 255 else b"\xff" + struct.pack("<i", value)


def literal(*samples):
    return bytes([LITERAL, len(samples)]) + b"".join(map(word, samples))


def grown(kind, samples, level, period=None):
    """Audio of a multiple of 40 samples, up to 10240."""
    tail = b"" if period is None else bytes([period - 1])
    return bytes([kind, samples // 40 - 1]) + word(level) + tail


def constant(samples, level):
    return grown(CONSTANT, samples, level)


def noise(samples, level=30):
    return grown(NOISE, samples, level)


def voice(samples, level=20000, period=120):
    return grown(PULSES, samples, level, period)


def frames(chunk, content_type=0):
    """Whole frames by ProcessEPDFrameByCnttype."""
    return bytes([AUDIO]) + chunk + bytes([3]) + number(content_type)


def epd_frame():
    speech = [noise(8000), voice(8000), noise(6400), voice(6400, period=80), noise(9600)]
    reset, mute = bytes([0]), bytes([1, 0])
    for name, mode in {"16k": 0, "8k": 1, "quarter_8k": 3, "fourfold": 4, "second": 6}.items():
        yield name, bytes([mode]) + b"".join(map(frames, speech))
    yield "negative_mode", b"\xff" + number(-1234) + b"".join(map(frames, speech))
    yield "short_timing", bytes([0]) + b"".join(frames(chunk, 2) for chunk in speech)
    yield "any_type", bytes([1]) + b"".join(frames(chunk, -1 << 31) for chunk in speech)
    yield "resets", bytes([0]) + (mute + reset).join(map(frames, speech)) + reset
    yield "full_scale", bytes([4]) + b"".join(
        frames(chunk) for chunk in [constant(4000, -32768), voice(8000, 32767), noise(8000, 32767),
                                    constant(4000, 0), literal(*[32767, -32768] * 80)])
    # Partial frames, no samples, and a null pointer with and without a length.
    yield "odd_sizes", bytes([0]) + b"".join(
        bytes([AUDIO]) + chunk + bytes([0]) for chunk in
        [literal(), literal(1, 2, 3), noise(200), voice(440)]) + b"".join(
        bytes([2]) + number(n) for n in [0, 1, 160, -1, -1 << 31, (1 << 31) - 1])


def mcra_frame():
    def configuration(history=0, mode=0, enable=0, low=0, margin=2):
        return b"".join(map(number, [history, mode, enable, low, margin]))

    def pushed(chunk, length=160, exponent=84):
        return bytes([AUDIO]) + number(length) + number(exponent) + chunk

    reset, again, configure, only_analysed = (bytes([op]) for op in range(4))
    speech = [noise(8000), voice(8000), noise(6400), voice(6400, period=80), noise(9600)]
    for name, fields in {"all_time": (), "history": (1,), "low": (1, 0, 0, 1, 1),
                         "any_fields": (-1, 1 << 30, -1 << 31, 7, -5)}.items():
        yield name, configuration(*fields) + b"".join(map(pushed, speech))
    for name, exponent in {"calibrated": 84, "steep": 200, "flat": 0, "negative": -1082130432,
                           "not_a_number": 2143289344, "infinite": 2139095040}.items():
        yield name, configuration(1, 1, 1) + b"".join(
            pushed(chunk, exponent=exponent) for chunk in (noise(9600, 60), *speech) * 2)
    yield "lengths", configuration() + b"".join(
        pushed(noise(1600), length) for length in (0, 1, 100, 161, -1, (1 << 31) - 1)) + (
            pushed(constant(1600, -32768), 0))
    yield "full_scale", configuration() + b"".join(
        pushed(chunk) for chunk in [constant(4000, 0), constant(4000, -32768), voice(8000, 32767),
                                   noise(8000, 32767), constant(4000, 0),
                                   literal(*[32767, -32768] * 80), constant(1600, 1)])
    yield "resets", configuration(0, 1, 1) + b"".join(
        pushed(chunk) + reset + configure + configuration(1, 1, 1) for chunk in speech) + again + (
            pushed(voice(3200)) + only_analysed + noise(160) + number(160) + pushed(voice(3200)))


def functions():
    values = [0, 1, 2, 1 << 12, 12354, 12355, 32768, 1 << 26, 1409286143, (1 << 31) - 1]
    values += [-value for value in values] + [-1 << 31]
    pairs = [number(x) + number(y) for x in values for y in values[::3]]
    for name, choice, arguments in [
            ("logarithm", 0, map(number, values)), ("exponential", 1, map(number, values)),
            ("integral", 3, map(number, values)), ("roots", 5, map(number, values)),
            ("angles", 4, pairs), ("power", 6, pairs),
            ("wide", 7, [a + b for a in pairs[::7] for b in pairs[::9]]),
            ("power_of_two", 2, [number(x) + word(q) + word(31 - q) + bytes([mode])
                                 for x in values[:9] for q in (-3, 0, 15, 26) for mode in (0, 1)])]:
        yield name, b"".join(bytes([choice]) + argument for argument in arguments)


def java_strings():
    texts = [b"", b"text", b"zero\0inside", b"\xff" * 255]
    for name, choices in {"to_java": [0], "from_java": [1], "get_bytes": [2, 10],
                          "new_string": [3, 11]}.items():
        yield name, b"".join(bytes([choice, failures, len(text)]) + text for text in texts
                             for choice in choices for failures in [0, 63, 0, 32, 16, 8, 4, 2, 1])


def queries():
    pieces = [literal(), literal(1, -2, 3), literal(*[32767, -32768] * 80), noise(1280, 20000),
              voice(520, 32767), constant(320, -32768)]
    for name, choices in {"energy": (0,), "spectrum": (1, 11), "fixed_fft": (2, 12, 17, 27),
                          "float_fft": (3,), "unscaled_fft": (4, 9)}.items():
        yield name, b"".join(bytes([choice]) + number(160 if choice == 0 else 0) + piece
                             for choice in choices for piece in pieces)
    yield "rates", b"".join(bytes([0]) + number(rate) + noise(640)
                            for rate in (0, 1, 80, -160, (1 << 31) - 1))


def ns_frame():
    whole, any_cut, null = bytes([2]), bytes([1]), bytes([0])
    speech = [noise(8000), voice(8000), noise(3200), voice(6400, period=80)]
    rate_16k = bytes([1])
    start = lambda mode, mics: bytes([mode, mics - 1, 0]) + rate_16k
    for name, head in {"one_mic": start(0, 1), "strong": start(1, 1), "narrow": start(2, 1),
                       "long_frames": start(3, 1), "short_frames": start(5, 1),
                       "two_mics": start(0, 2), "two_mics_narrow": start(2, 2)}.items():
        yield name, head + b"".join(whole + chunk for chunk in speech)
        yield name + "_odd", head + any_cut + any_cut.join(
            [literal(1, 2, 3), noise(440), voice(4040), literal()])
    yield "no_mics", bytes([200]) + number(0) + bytes([0]) + number(-7) + bytes([0]) + rate_16k + (
        whole + noise(3200))
    yield "other_rate", bytes([0, 0, 0, 0]) + number(8000) + whole + voice(3200)
    yield "extremes", start(0, 2) + whole + whole.join(
        [constant(8000, 20), constant(3200, -32768), voice(6400, 32767), noise(6400, 32767),
         constant(1600, 0), literal(*[32767, -32768] * 120), noise(8000)])
    yield "hesitant", start(0, 1) + (whole + constant(160, 3)) * 3 + (whole + constant(160, 9)) * 6
    yield "nothing", start(0, 1) + b"".join(
        null + number(n) for n in [0, 1, 160, -1, -1 << 31, (1 << 31) - 1])


def settings(rate=0, gain=0, content_type=0, hangover=0, before=0, after=0, mcra=0, speech=0,
             lead_in=0):
    """The times are in steps of 5 ms up to 1270 ms, else in ms."""
    return bytes([rate]) + b"".join(
        map(number, [gain, content_type, hangover, before, after, mcra, speech, lead_in]))


def script(text=""):
    """Decisions like "50o 60s 2n": frames without speech, with speech, of null audio."""
    runs = [(int(run[:-1]), "osn".index(run[-1])) for run in text.split()]
    return bytes([len(runs)]) + bytes(64 * kind + frames for frames, kind in runs)


def utterance_stream():
    take = bytes([0])
    chunk = lambda audio: bytes([AUDIO]) + audio
    speech = b"".join(map(chunk, [noise(5000), voice(5000), noise(4000), voice(5000, period=80),
                                  noise(4000), literal(1, 2, 3)]))
    for rate in (0, 1):
        for content_type in (0, 2):
            yield f"speech_{rate}_{content_type}", (
                settings(rate, 0, content_type, 20, 40, 60) + script() + speech)
        yield f"mcra_{rate}", settings(rate, 0, 0, 4, 8, 12, 1, 10) + script() + speech
    # Null audio ends an utterance at once: the shortest that there are.
    bursts = "50o " + "1s 1n " * 50
    many = chunk(noise(4000)) + (chunk(voice(400)) + chunk(constant(80, 0))) * 40
    widest = (1 << 31) - 1
    for name, chosen in {"full_queue": (1,), "full_queue_padded": (1, 0, 0, 0, 1, 2),
                         "widest": (1, 1, -1, widest, widest, widest)}.items():
        yield name, settings(*chosen) + script(bursts) + many + take * 3
    # The first 10 s are 80000 samples.
    for name, audio in {"lead_in": speech * 5, "lead_in_flushed": speech, "lead_in_full": many * 8,
                        "lead_in_short": chunk(noise(760)),
                        "lead_in_of_null": chunk(constant(8000, 0)) * 11 + many}.items():
        yield name, settings(1, hangover=9, lead_in=1) + script() + audio + take * 9 + speech
    yield "late_takes", settings(1) + script(bursts) + chunk(noise(4000)) + (
        (chunk(voice(400)) + chunk(constant(160, 0))) * 9 + take * 5) * 4
    yield "open_end", settings(1, 2, 0, 4, 9, 9) + script("50o 40s 3n 30s") + speech[:13]
    for name, chosen, text in [
            ("refused", (0, 0, 2, 4, 9, 9), "50o 19s 60o 20s 60o 10s 2n 9s 60o 10s 2n 20s 60o"),
            ("interrupted", (1, 0, 2, 4), "50o 60s 2n 1o 21n 40s 60o 60s 10n 40s 60o 20s 2n"),
            ("joined", (1, 0, 0, 200), "50o 60s 49o 60s 50o 60s"),
            ("apart", (1, 0, 0, 0, 200, 200), "50o 60s 50o 60s 40o 60s"),
            ("short", (0, 0, 0, 20, 9, 99, 0, 30), "50o 30s 40o 60s 5o 30s 60o 38s 90n 50s 40o"),
            ("mcra_apart", (1, 0, 0, 4, 99, 99, 1, 20), "9o 2s 9o 3s 1o 3s 40o 20s 1o 9s")]:
        yield name, settings(*chosen) + script(text)
    yield "refused_rate", b"\xff" + number(44100) + settings()[1:] + script() + speech
    yield "refused_padding", settings(before=-1) + script() + speech
    yield "refused_mcra_gain", settings(gain=1, mcra=1) + script() + speech
    yield "refused_mcra_lead_in", settings(mcra=1, lead_in=1) + script() + speech


def enhancement_stream():
    chunk = lambda audio, room=AUDIO: bytes([room]) + audio
    speech = [constant(400, 3), noise(3000), voice(4000), constant(800, 0), voice(4000, period=80),
              noise(2000), voice(2000, 32767), literal(1, 2, 3, 4)]
    # Bits of a choice: level, microphones - 1, which suppression, aligned.
    choice = lambda db, mics=1, level=0, aligned=1: level + 2 * (mics - 1) + 4 * db + 12 * aligned
    for name, settings in {"one": choice(1), "strong": choice(2, level=1), "passed": choice(0),
                           "levelled": choice(0, level=1), "late": choice(1, aligned=0),
                           "late_level": choice(1, 1, 1, 0), "two": choice(1, 2),
                           "two_level": choice(1, 2, 1), "two_late": choice(1, 2, 0, 0),
                           "first_of_two": choice(0, 2), "refused": choice(2, 2)}.items():
        yield name, bytes([settings, 99]) + b"".join(map(chunk, speech))
    yield "full_scale", bytes([choice(1, 2, 1), 0]) + b"".join(map(chunk, [
        constant(4000, -32768), noise(4000, 32767), literal(*[32767, -32768] * 120)]))
    tiny = [literal(*range(1, n)) for n in (2, 2, 1, 160, 3, 200, 100, 48, 113)] * 3
    for mics in (1, 2):
        yield f"tiny_{mics}", bytes([choice(1, mics, 1), 7]) + b"".join(
            chunk(audio, 47 * i % 256) for i, audio in enumerate(tiny))
    yield "short", bytes([choice(1), 0]) + chunk(literal(1000))
    yield "half_a_pair", bytes([choice(1, 2), 255]) + chunk(literal(1000))
    yield "nothing", bytes([choice(1, 2, 1, 0), 0])
    yield "any_settings", b"\xff" + b"".join(map(number, [1, 13, 2, 1]))


def wav(data, code=1, channels=1, rate=16000, bits=16, promised=None):
    block = channels * bits // 8
    form = struct.pack("<HHIIHH", code, channels, rate, rate * block % (1 << 32), block, bits)
    size = len(data) if promised is None else promised
    body = b"WAVEfmt " + struct.pack("<I", 16) + form + b"data" + struct.pack("<I", size) + data
    return b"RIFF" + struct.pack("<I", min(size + 36, 0xffffffff)) + body


def audio_source():
    ramp = b"".join(word(step * 100 % 30000) for step in range(400))
    floats = struct.pack("<8f", 0, 0.5, -1, 1, 7, float("inf"), float("nan"), 1e-30)
    # How it is read, and pieces of 8 bytes in a pipe.
    mean, second, raw, absent = b"\x00\x07", b"\x80\x07", b"\x03\x07", b"\xc0\x07"
    pieces_of_1, cut_in_head, cut_in_audio = b"\x00\x00", b"\x00\x84", b"\x00\xc0"
    yield "wav16", mean + wav(ramp)
    yield "wav8", mean + wav(ramp[:300], rate=8000, bits=8)
    yield "wav24", mean + wav(ramp[:600], bits=24)
    yield "wav_float", mean + wav(floats, code=3, bits=32)
    yield "wav_alaw", mean + wav(ramp[:300], code=6, rate=8000, bits=8)
    yield "stereo_mean", mean + wav(ramp, channels=2)
    yield "stereo_second", second + wav(ramp, channels=2)
    yield "channel_absent", absent + wav(ramp, channels=2)
    yield "resampled", mean + wav(ramp, rate=44100)
    yield "slowest", mean + wav(ramp[:40], rate=63)
    yield "too_fast", mean + wav(ramp, rate=(1 << 31) - 1)
    yield "many_channels", mean + wav(ramp, channels=1024, rate=4000000)
    yield "cut_short", mean + wav(ramp, promised=9999)
    yield "open_length", mean + wav(ramp, promised=0xffffffff)
    yield "au", mean + b".snd" + struct.pack(">5I", 24, len(ramp), 3, 16000, 1) + ramp
    # The rate as an 80-bit float: 16000 = 1.953125 * 2^13.
    comm = struct.pack(">hIhHQ", 1, len(ramp) // 2, 16, 16383 + 13, 16000 << 50)
    aiff = b"AIFFCOMM" + struct.pack(">I", len(comm)) + comm
    aiff += b"SSND" + struct.pack(">3I", len(ramp) + 8, 0, 0) + ramp
    yield "aiff", mean + b"FORM" + struct.pack(">I", len(aiff)) + aiff
    yield "raw", raw + ramp
    chunk = lambda name, body: name + struct.pack("<I", len(body)) + body
    yield "pieces", pieces_of_1 + wav(ramp)
    yield "cut_in_head", cut_in_head + wav(ramp)
    yield "cut_in_audio", cut_in_audio + wav(ramp)
    yield "zero_length", mean + wav(ramp, promised=0)
    yield "junk", mean + wav(ramp)[:36] + chunk(b"junk", b"x" * 99 + b"\0") * 70 + wav(ramp)[36:]
    format_16k = wav(b"")[20:36]
    yield "rf64", mean + b"RF64" + b"\xff" * 4 + b"WAVE" + chunk(b"ds64", struct.pack(
        "<QQQI", 900, len(ramp), 0, 0)) + chunk(b"fmt ", format_16k) + b"data" + b"\xff" * 4 + ramp
    guid = bytes.fromhex("f3acd3118cd100c04f8edb8a")
    yield "w64", mean + b"riff" + bytes.fromhex("2e91cf11a5d628db04c10000") + struct.pack(
        "<Q", 900) + b"wave" + guid + b"fmt " + guid + struct.pack("<Q", 40) + format_16k + (
            b"data" + guid + struct.pack("<Q", 24 + len(ramp)) + ramp)
    yield "caf", mean + b"caff\0\1\0\0" + b"desc" + struct.pack(
        ">qd4s5I", 32, 16000, b"lpcm", 0, 2, 1, 1, 16) + b"data" + struct.pack(">qI", -1, 0) + ramp
    yield "caf_cut_in_head", mean + b"caff\0\1\0\0" + b"desc" + struct.pack(
        ">qd4s5I", 32, 16000, b"lpcm", 0, 2, 1, 1, 16) + b"data" + bytes(6)
    yield "wav_cut_in_head", mean + wav(b"")[:36] + b"LIST"
    yield "raw_odd", b"\x3f\x07" + ramp[:-1]
    yield "empty", mean
    yield "raw_empty", raw
    yield "text", mean + b"no audio at all\n"


def output_file():
    wav16, flac16, raw16, ogg = 0x10002, 0x170002, 0x10040002, 0x200060
    for name, inputs, destination in [("one", [0], 1), ("folder", [0, 1], 3), ("new", [0], 6),
                                      ("same", [0, 5], 3), ("link", [0, 2], 7), ("input", [1], 0),
                                      ("part", [0], 4), ("any", [251], 9)]:
        for rules in range(4):
            head = bytes([1, len(inputs) - 1]) + b"".join(
                bytes([i]) + (b"\x03\x1b\xff." if i > 249 else b"") for i in inputs)
            head += bytes([destination, rules])
            yield f"{name}_{rules}", head + b"".join(
                bytes([rules]) + number(form) + voice(400)
                for form in (wav16, flac16, raw16, ogg)[rules:])


corpus = pathlib.Path(__file__).parent / "corpus"
for target in (audio_source, enhancement_stream, epd_frame, functions, java_strings, mcra_frame, ns_frame, output_file,
               queries, utterance_stream):
    folder = corpus / target.__name__
    folder.mkdir(parents=True, exist_ok=True)
    for name, content in target():
        (folder / name).write_bytes(content)
