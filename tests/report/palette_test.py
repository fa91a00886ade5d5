# SPDX-License-Identifier: Apache-2.0
"""Compares the colours of the page of `twctl report` by numbers."""

import math
import pathlib
import re
import unittest

STYLE = pathlib.Path(__file__).resolve().parents[2] / "src/tools/twctl/report/page.css"


class PaletteTest(unittest.TestCase):
    def palettes(self):
        style = STYLE.read_text()
        light, dark, paper = [dict(re.findall(r"--(\w+): (#[0-9a-f]{6})", block)) for block in re.findall(r":root \{(.*?)\}", style, re.DOTALL)]
        self.assertEqual(light, paper)
        return {"light": light, "dark": dark}

    @staticmethod
    def linear(colour):
        parts = [int(colour[i : i + 2], 16) / 255 for i in (1, 3, 5)]
        return [part / 12.92 if part <= 0.04045 else ((part + 0.055) / 1.055) ** 2.4 for part in parts]

    def contrast(self, one, other):
        lights = sorted(sum(part * weight for part, weight in zip(self.linear(colour), (0.2126, 0.7152, 0.0722))) for colour in (one, other))
        return (lights[1] + 0.05) / (lights[0] + 0.05)

    def test_marks_and_texts_stand_out_from_the_page(self):
        for scheme, palette in self.palettes().items():
            for name in [f"c{i}" for i in range(1, 9)] + ["bad", "bell", "input"]:
                with self.subTest(scheme=scheme, colour=name):
                    self.assertGreaterEqual(self.contrast(palette[name], palette["page"]), 3.0)
            for name in ("ink", "quiet"):
                for ground in ("page", "card"):
                    with self.subTest(scheme=scheme, colour=name, ground=ground):
                        self.assertGreaterEqual(self.contrast(palette[name], palette[ground]), 4.5)

    def test_steps_of_loudness_grow_evenly_in_light(self):
        for scheme, palette in self.palettes().items():
            steps = [self.contrast(palette[f"h{i}"], palette["page"]) for i in range(1, 7)]
            with self.subTest(scheme=scheme):
                for before, after in zip(steps, steps[1:]):
                    self.assertGreater(after / before, 1.25)

    # Machado, Oliveira and Fernandes 2009, the strongest degree of each.
    SIGHTS = {
        "usual": ((1, 0, 0), (0, 1, 0), (0, 0, 1)),
        "without red": ((0.152286, 1.052583, -0.204868), (0.114503, 0.786281, 0.099216), (-0.003882, -0.048116, 1.051998)),
        "without green": ((0.367322, 0.860646, -0.227968), (0.280085, 0.672501, 0.047413), (-0.011820, 0.042940, 0.968881)),
        "without blue": ((1.255528, -0.076749, -0.178779), (-0.078411, 0.930809, 0.147602), (0.004733, 0.691367, 0.303900)),
    }

    def lab(self, colour, sight):
        linear = self.linear(colour)
        seen = [min(1.0, max(0.0, sum(weight * part for weight, part in zip(row, linear)))) for row in sight]
        xyz = [sum(weight * part for weight, part in zip(row, seen)) for row in ((0.4124, 0.3576, 0.1805), (0.2126, 0.7152, 0.0722), (0.0193, 0.1192, 0.9505))]
        x, y, z = [(part / white) ** (1 / 3) if part / white > 0.008856 else 7.787 * part / white + 16 / 116 for part, white in zip(xyz, (0.9505, 1.0, 1.089))]
        return (116 * y - 16, 500 * (x - y), 200 * (y - z))

    def test_the_first_devices_differ_for_every_sight(self):
        for scheme, palette in self.palettes().items():
            for name, sight in self.SIGHTS.items():
                colours = [self.lab(palette[f"c{i}"], sight) for i in range(1, 6)]
                for i, one in enumerate(colours):
                    for k, other in enumerate(colours[:i]):
                        with self.subTest(scheme=scheme, sight=name, colours=(k + 1, i + 1)):
                            self.assertGreater(math.dist(one, other), 10)


if __name__ == "__main__":
    unittest.main()
