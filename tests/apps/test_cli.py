#!/usr/bin/python3
"""End-to-end tests of the tonebits command-line tool.

Files the tool writes are read back by libsndfile (through soundfile) and by
sox; the equaliser is checked against a double-precision reference of the
same cookbook designs run through scipy's lfilter.
"""
import math
import os
import shutil
import struct
import subprocess
import sys
import tempfile
import unittest

try:
    import numpy as np
    import scipy.signal
    import soundfile as sf
except ImportError as missing:  # an independent reader is missing: skip
    print(f"skipping: {missing}")
    sys.exit(77)
if shutil.which("sox") is None:
    print("skipping: sox not found")
    sys.exit(77)

TOOL = None
RATE = 48000


def run(*args, expect=0):
    proc = subprocess.run([TOOL, *args], capture_output=True, text=True)
    if expect is not None and proc.returncode != expect:
        raise AssertionError(f"tonebits {' '.join(args)} exited {proc.returncode}, expected {expect}\n"
                             f"stdout: {proc.stdout}\nstderr: {proc.stderr}")
    return proc


def sox_info(path):
    out = subprocess.run(["sox", "--i", path], capture_output=True, text=True, check=True).stdout
    return {k.strip(): v.strip() for k, v in (line.split(":", 1) for line in out.splitlines() if ":" in line)}


def cookbook(kind, f0, rate, q=None, s=None, gain_db=0.0):
    """The published cookbook designs, in double precision."""
    a = 10 ** (gain_db / 40)
    w0 = 2 * math.pi * f0 / rate
    cs, sn = math.cos(w0), math.sin(w0)
    if kind == "peak":
        alpha = sn / (2 * q)
        b = [1 + alpha * a, -2 * cs, 1 - alpha * a]
        den = [1 + alpha / a, -2 * cs, 1 - alpha / a]
    elif kind in ("lowshelf", "highshelf"):
        alpha = sn / 2 * math.sqrt((a + 1 / a) * (1 / s - 1) + 2)
        sq = 2 * math.sqrt(a) * alpha
        if kind == "lowshelf":
            b = [a * ((a + 1) - (a - 1) * cs + sq), 2 * a * ((a - 1) - (a + 1) * cs), a * ((a + 1) - (a - 1) * cs - sq)]
            den = [(a + 1) + (a - 1) * cs + sq, -2 * ((a - 1) + (a + 1) * cs), (a + 1) + (a - 1) * cs - sq]
        else:
            b = [a * ((a + 1) + (a - 1) * cs + sq), -2 * a * ((a - 1) + (a + 1) * cs), a * ((a + 1) + (a - 1) * cs - sq)]
            den = [(a + 1) - (a - 1) * cs + sq, 2 * ((a - 1) - (a + 1) * cs), (a + 1) - (a - 1) * cs - sq]
    elif kind == "lowpass":
        alpha = sn / (2 * q)
        b = [(1 - cs) / 2, 1 - cs, (1 - cs) / 2]
        den = [1 + alpha, -2 * cs, 1 - alpha]
    else:
        raise ValueError(kind)
    return np.array(b) / den[0], np.array(den) / den[0]


class ToolTest(unittest.TestCase):
    def setUp(self):
        self.dir = tempfile.mkdtemp(prefix="tonebits-cli-")

    def tearDown(self):
        shutil.rmtree(self.dir, ignore_errors=True)

    def path(self, name):
        return os.path.join(self.dir, name)

    def write(self, name, data, subtype="PCM_24", rate=RATE):
        p = self.path(name)
        sf.write(p, data, rate, subtype=subtype)
        return p

    def programme(self, seconds=1.0, channels=2, seed=1):
        rng = np.random.default_rng(seed)
        t = np.arange(int(seconds * RATE)) / RATE
        cols = [0.4 * np.sin(2 * np.pi * (300 + 250 * c) * t) + 0.05 * rng.standard_normal(t.size) for c in range(channels)]
        return np.stack(cols, axis=1)

    def assertNothingLeft(self, name):
        leftovers = [f for f in os.listdir(self.dir) if f.startswith(name)]
        self.assertEqual(leftovers, [], "the tool left a partial output behind")

    # ---- the main job ----
    def test_demo_writes_a_stereo_file_both_readers_accept(self):
        proc = run("demo", "--dir", self.dir, "--seconds", "3", "--quiet")
        self.assertIn("faster than real time", proc.stdout)
        data, rate = sf.read(self.path("demo.wav"))
        self.assertEqual(rate, RATE)
        self.assertEqual(data.shape, (3 * RATE, 2))
        self.assertGreater(np.max(np.abs(data)), 0.05)
        self.assertLess(np.max(np.abs(data)), 1.0)
        info = sox_info(self.path("demo.wav"))
        self.assertEqual(info["Channels"], "2")
        self.assertEqual(info["Precision"], "24-bit")
        with open(self.path("demo.svg")) as svg:
            self.assertIn("<svg", svg.read())
        self.assertTrue(os.path.exists(self.path("demo-mix.ini")))

    # ---- info ----
    def test_info_describes_the_format_and_cadence(self):
        p = self.write("in.wav", self.programme(0.5), "PCM_16")
        out = run("info", p, "--frame-rate", "29.97").stdout
        self.assertIn("PCM", out)
        self.assertIn("16 bit (1)", out)
        self.assertIn("channels:    2", out)
        self.assertIn("48000 Hz", out)
        self.assertIn("stride:      2", out)
        self.assertIn("duration:    0.500 s", out)
        self.assertIn("8008 samples per cycle", out)
        fl = self.write("f.wav", self.programme(0.1, 3), "FLOAT")
        out = run("info", fl).stdout
        self.assertIn("(7)", out)
        self.assertIn("FLoating Point", out)

    # ---- meter ----
    def test_meter_matches_the_peaks_and_counts_clips(self):
        t = np.arange(RATE) / RATE
        quiet = 0.5 * np.sin(2 * np.pi * 1000 * t)
        loud = np.clip(1.5 * np.sin(2 * np.pi * 50 * t), -1, 1)
        p = self.write("m.wav", np.stack([quiet, loud], axis=1), "PCM_24")
        out = run("meter", p).stdout
        lines = [l for l in out.splitlines() if l.strip().startswith("ch ")]
        self.assertEqual(len(lines), 2)
        read = sf.read(p)[0]
        for line, column in zip(lines, read.T):
            words = line.split()
            expected = 20 * math.log10(np.max(np.abs(column)))
            self.assertAlmostEqual(float(words[3]), expected, delta=0.01)
        self.assertEqual(lines[0].split()[6], "0")
        self.assertGreater(int(lines[1].split()[6]), 50)

    # ---- convert ----
    def test_convert_round_trips_every_export_type(self):
        p = self.write("src.wav", self.programme(0.3, 3), "FLOAT")
        source = sf.read(p)[0]  # the float32 samples the file holds
        for name, bits, step in (("16 bit", 16, 2 ** -15), ("24 bit", 24, 2 ** -23),
                                 ("24 bit unpacked (4 bytes)", 32, 2 ** -23)):
            out = self.path(f"conv{bits}.wav")
            run("convert", p, out, "--type", name)
            data, rate = sf.read(out)
            self.assertEqual(data.shape, source.shape)
            # Truncation toward zero: within one step, never away from zero.
            self.assertLessEqual(np.max(np.abs(data - source)), step * 1.01, name)
            self.assertTrue(np.all(np.abs(data) <= np.abs(source) + 1e-9), name)
            info = sox_info(out)
            self.assertEqual(info["Channels"], "3")
            back = self.path(f"back{bits}.wav")
            run("convert", out, back, "--type", name)
            # A 4-byte file reads back as 32-bit integers, whose rule carries
            # a half-step offset: a second pass may move a sample by a step.
            tolerance = 0 if bits < 32 else step * 1.01
            self.assertLessEqual(np.max(np.abs(sf.read(back)[0] - data)), tolerance, f"{name}: second pass")

    # ---- process ----
    def equaliser_error_db(self, source_path, bands, designs):
        """RMS error of the tool's output against the double-precision
        reference, relative to the reference, in dB."""
        source = sf.read(source_path)[0]
        out = self.path("eq-out.wav")
        run("process", source_path, out, "--type", "24 bit", *sum((["--eq", b] for b in bands), []))
        got = sf.read(out)[0]
        expected = source.copy()
        for kind, f0, kw in designs:
            b, a = cookbook(kind, f0, RATE, **kw)
            expected = scipy.signal.lfilter(b, a, expected, axis=0)
        error = np.sqrt(np.mean((got - expected) ** 2)) / np.sqrt(np.mean(expected ** 2))
        return 20 * math.log10(error)

    def test_equaliser_matches_a_double_precision_reference(self):
        p = self.write("eq.wav", self.programme(1.0, 2), "FLOAT")
        mid_and_high = self.equaliser_error_db(
            p, ["peak:1000:1q:-6", "peak:3000:2q:4", "highshelf:8000:1s:4"],
            [("peak", 1000, dict(q=1.0, gain_db=-6)), ("peak", 3000, dict(q=2.0, gain_db=4)),
             ("highshelf", 8000, dict(s=1.0, gain_db=4))])
        self.assertLess(mid_and_high, -90)
        # A band at 100 Hz puts the poles close to the unit circle, where the
        # single-precision recursion (bit-exact to the filter's per-sample
        # rule) is good to about -85 dB against double precision.
        with_bass = self.equaliser_error_db(
            p, ["peak:100:1q:3", "peak:1000:1q:-6", "peak:8000:1q:4"],
            [("peak", 100, dict(q=1.0, gain_db=3)), ("peak", 1000, dict(q=1.0, gain_db=-6)),
             ("peak", 8000, dict(q=1.0, gain_db=4))])
        self.assertLess(with_bass, -80)

    def test_gain_and_fader_and_automation(self):
        source = self.programme(1.0, 1)[:, 0] * 0.5
        p = self.write("g.wav", source, "FLOAT")
        out = self.path("g-out.wav")
        run("process", p, out, "--gain", "-6", "--type", "24 bit")
        self.assertLess(np.max(np.abs(sf.read(out)[0] - source * 10 ** (-6 / 20))), 2 ** -22)
        run("process", p, self.path("f.wav"), "--fader", "1.0", "--law", "mixer", "--type", "24 bit")
        self.assertLess(np.max(np.abs(sf.read(self.path("f.wav"))[0] - source)), 2 ** -22)
        env = self.path("env.txt")
        with open(env, "w") as f:
            f.write("# a fade in and a dip\n0 0\n0.5 1\n0.7 -6dB\n")
        run("process", p, self.path("a.wav"), "--automation", env, "--type", "24 bit")
        got = sf.read(self.path("a.wav"))[0]
        t = np.arange(source.size) / RATE
        gain = np.interp(t, [0, 0.5, 0.7], [0, 1, 10 ** (-6 / 20)])
        self.assertLess(np.max(np.abs(got - source * gain)), 1e-3)

    def test_reverse_plays_the_chain_backwards(self):
        source = self.programme(0.5, 2)
        p = self.write("r.wav", source, "FLOAT")
        run("process", p, self.path("r-out.wav"), "--reverse", "--gain", "-6", "--type", "24 bit")
        got = sf.read(self.path("r-out.wav"))[0]
        self.assertLess(np.max(np.abs(got - source[::-1] * 10 ** (-6 / 20))), 2 ** -22)

    # ---- mix ----
    def test_mix_applies_levels_pans_mutes_and_routing(self):
        a = self.programme(0.5, 1, seed=2)[:, 0]
        b = self.programme(0.5, 1, seed=3)[:, 0]
        pa = self.write("a.wav", a, "FLOAT")
        pb = self.write("b.wav", b, "FLOAT")
        state = self.path("state.ini")
        with open(state, "w") as f:
            f.write("[SimpleMixState]\nVersion=1.1\n"
                    "[SimpleMixState.InputChannels.Fader]\n000=1.0\n001=1.0\n"
                    "[SimpleMixState.InputChannels.Pan]\n000=0.0\n001=1.0\n"
                    "[SimpleMixState.InputChannels.Mute]\n000=0\n001=0\n")
        out = self.path("mix.wav")
        run("mix", out, pa, pb, "--state", state, "--type", "24 bit")
        got = sf.read(out)[0]
        self.assertEqual(got.shape, (a.size, 2))
        self.assertLess(np.max(np.abs(got[:, 0] - a)), 2 ** -22)  # hard left
        self.assertLess(np.max(np.abs(got[:, 1] - b)), 2 ** -22)  # hard right
        with open(state, "a") as f:
            f.write("[SimpleMixState.InputChannels.Solo]\n001=1\n")
        run("mix", out, pa, pb, "--state", state, "--type", "24 bit")
        got = sf.read(out)[0]
        self.assertEqual(np.max(np.abs(got[:, 0])), 0.0)  # the solo silences input 0
        self.assertLess(np.max(np.abs(got[:, 1] - b)), 2 ** -22)
        self.assertEqual(sox_info(out)["Channels"], "2")

    # ---- plot ----
    def test_plots_are_svg(self):
        for args in (("eq", self.path("eq.svg"), "--eq", "peak:1000:1q:-6"),
                     ("law", self.path("law.svg")),):
            run("plot", *args)
            with open(args[1]) as f:
                self.assertIn("<polyline", f.read())

    # ---- errors: clear messages, documented exit codes, nothing left behind ----
    def test_bad_inputs_give_documented_errors(self):
        run("info", self.path("missing.wav"), expect=2)
        junk = self.path("junk.wav")
        with open(junk, "wb") as f:
            f.write(b"this is not audio at all")
        run("meter", junk, expect=3)
        adpcm = self.path("adpcm.wav")
        fmt = struct.pack("<HHIIHH", 2, 1, 8000, 4000, 256, 4)
        with open(adpcm, "wb") as f:
            body = b"WAVE" + b"fmt " + struct.pack("<I", len(fmt)) + fmt + b"data" + struct.pack("<I", 4) + b"\0" * 4
            f.write(b"RIFF" + struct.pack("<I", len(body)) + body)
        run("info", adpcm, expect=4)
        good = self.write("good.wav", self.programme(0.2), "PCM_16")
        with open(good, "rb") as f:
            whole = f.read()
        cut = self.path("cut.wav")
        with open(cut, "wb") as f:
            f.write(whole[: len(whole) // 2])
        proc = run("convert", cut, self.path("cut-out.wav"), "--type", "16 bit", expect=5)
        self.assertIn("truncated", proc.stderr)
        self.assertNothingLeft("cut-out")
        run("convert", cut, self.path("cut-out.wav"), "--type", "16 bit", "--allow-truncated", "--quiet")
        self.assertGreater(sf.info(self.path("cut-out.wav")).frames, 0)
        run("convert", good, good, "--type", "16 bit", expect=1)
        run("convert", good, self.path("x.wav"), "--type", "12 bit", expect=1)
        self.assertNothingLeft("x.wav")
        run("process", good, self.path("y.wav"), "--eq", "peak:90000:1q:3", expect=1)
        run("process", good, self.path("y.wav"), "--gain", "loud", expect=1)
        run("frobnicate", expect=1)
        for command in ("demo", "info", "meter", "convert", "process", "mix", "plot"):
            self.assertIn("usage:", run(command, "--help").stdout)


if __name__ == "__main__":
    TOOL = os.path.abspath(sys.argv.pop(1))
    unittest.main(verbosity=1)
