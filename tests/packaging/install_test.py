# SPDX-License-Identifier: Apache-2.0
"""Tests `cmake --install`: all files are below the given prefix, and no file refers to another prefix."""

import os
import pathlib
import re
import subprocess
import tempfile
import unittest

BUILD = os.environ["TONEWERK_BUILD"]
# Places of files that tell other programs the paths of the installed ones.
TELLING = ["lib/systemd", "share/dbus-1", "etc/apparmor.d", "lib/pkgconfig", "lib/*/pkgconfig"]


def run(arguments, **options):
    answer = subprocess.run(
        arguments, text=True, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, timeout=100, **options
    )
    if answer.returncode != 0:
        raise AssertionError(f"{arguments} ended with {answer.returncode}: {answer.stdout}")
    return answer.stdout


class InstallTest(unittest.TestCase):
    def setUp(self):
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.scratch = pathlib.Path(scratch.name)

    def install(self, prefix):
        """Installs below another root, so that files outside the prefix are found too."""
        environment = {**os.environ, "DESTDIR": str(self.scratch)}
        run([os.environ["TONEWERK_CMAKE"], "--install", BUILD, "--prefix", prefix], env=environment)
        return {str(path.relative_to(self.scratch)) for path in self.scratch.rglob("*") if not path.is_dir()}

    def telling_files(self, tree):
        found = [path for place in TELLING for folder in tree.glob(place) for path in folder.rglob("*") if path.is_file()]
        self.assertGreater(len(found), 8)
        return found

    def test_writes_below_the_prefix_only(self):
        installed = self.install("/somewhere/of/mine")
        self.assertGreater(len(installed), 50)
        self.assertEqual([name for name in installed if not name.startswith("somewhere/of/mine/")], [])
        for name in ["bin/twreportingd", "lib/systemd/user/twreportingd.socket", "etc/tonewerk/device-facts.toml",
                     "etc/tonewerk/preferences/com.orvane.tonewerk.store.toml", "etc/apparmor.d/usr.bin.twreportingd",
                     "lib/sysusers.d/tonewerk.conf", "lib/tmpfiles.d/tonewerk.conf",
                     "share/bash-completion/completions/twctl", "share/zsh/vendor-completions/_twctl",
                     "share/fish/vendor_completions.d/twctl.fish"]:
            self.assertIn(f"somewhere/of/mine/{name}", installed)

    def test_names_the_programs_of_the_prefix(self):
        prefix = "/somewhere/of/mine"
        self.install(prefix)
        tree = self.scratch / prefix[1:]
        named = set()
        for path in self.telling_files(tree):
            for program in re.findall(r"(?<![\w.-])(/[^\s=:]*/tw[a-z-]+)", path.read_text()):
                with self.subTest(file=path.name, program=program):
                    self.assertTrue(program.startswith(f"{prefix}/bin/"))
                    named.add(program)
            self.assertNotIn("@prefix@", path.read_text(), path.name)
        self.assertEqual({f"{prefix}/bin/{name}" for name in ["twreportingd", "tw-pipewire", "tw-memory-usage"]} - named, set())
        package = next(path for path in self.telling_files(tree) if path.name == "twreporting.pc")
        self.assertIn(f"prefix={prefix}\n", package.read_text())
        for name in ["twreportingd", "tw-pipewire", "tw-memory-usage", "twctl"]:
            # They must find the client library without any setting.
            self.assertRegex(run([tree / "bin" / name, "--version"], env={}), r"\d+\.\d+\.\d+")

    def test_below_usr_is_the_systems(self):
        installed = self.install("/usr")
        self.assertEqual({name.split("/")[0] for name in installed}, {"usr", "etc"})
        self.assertEqual([name for name in installed if name.startswith("usr/etc/")], [])
        self.assertIn("etc/tonewerk/device-facts.toml", installed)
        self.assertIn("prefix=/usr\n", next(self.scratch.rglob("twreporting.pc")).read_text())
        unit = self.scratch / "usr/lib/systemd/system/twreportingd.service"
        self.assertIn("ExecStart=/usr/bin/twreportingd\n", unit.read_text())
        for name in ["twctl", "tw-replay", "tw-pipewire"]:
            self.assertNotRegex(run(["readelf", "-d", self.scratch / "usr/bin" / name]), r"\((RPATH|RUNPATH)\)")


if __name__ == "__main__":
    unittest.main()
