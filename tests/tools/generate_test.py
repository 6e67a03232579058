"""Man page and completion tell all that the help tells."""
import re
import subprocess

from frame import TOOL, ToolTest
from message_test import COMMANDS


class Generate(ToolTest):
    def options(self, command):
        return set(re.findall(r"--[a-z-]+", self.good(command, "--help").split("\nExamples:")[0]))

    def test_the_man_page_has_every_option(self):
        page = self.good("generate", "man")
        self.assertTrue(page.startswith(".TH ZMCRASTER 1"))
        for command in COMMANDS:
            self.assertIn(f".SS {command} ", page)
            for option in self.options(command):
                self.assertIn(option.replace("-", "\\-"), page)

    def test_arguments_come_first_and_in_the_order_in_which_they_are_given(self):
        page = self.good("generate", "man")
        for command, names in (("build", ["SOURCE", "TARGET"]), ("export", ["FILE", "TARGET"]),
                               ("compare", ["A", "B"]), ("info", ["FILE"]), ("hash", ["FILE..."])):
            usage, rest = self.good(command, "--help").split("\n\nPositionals:\n")
            self.assertTrue(usage.endswith(" ".join(["[OPTIONS]"] + names)), usage)
            bare = [name.rstrip(".") for name in names]
            self.assertEqual(re.findall(r"^  ([A-Z]+) ", rest.split("\n\n")[0], re.M), bare)
            section = page.split(f"\n.SS {command} ")[1].split("\n.SS ")[0]
            self.assertEqual(section.split("\n")[0], " ".join(names))
            listed = re.findall(r"^\.B (\S+)", section, re.M)
            self.assertEqual(listed[:len(names)], bare)

    def test_the_man_page_is_sound(self):
        with open(self.path("zmcraster.1"), "w") as file:
            file.write(self.good("generate", "man"))
        try:
            done = subprocess.run(["man", "--warnings=w", "-l", self.path("zmcraster.1")],
                                  capture_output=True, text=True, env={"MANPAGER": "cat",
                                                                       "PATH": "/usr/bin:/bin",
                                                                       "LC_ALL": "C.UTF-8"})
        except FileNotFoundError:
            self.skipTest("there is no man here")
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        self.assertIn("EXIT STATUS", done.stdout)

    def complete(self, *words):
        script = self.good("generate", "completion") + (
            'COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); _zmcraster; printf "%s\\n" "${COMPREPLY[@]}"')
        done = subprocess.run(["bash", "-c", script, "bash", "zmcraster", *words],
                              capture_output=True, text=True, cwd=self.folder, check=True)
        self.assertEqual(done.stderr, "")
        return set(done.stdout.split())

    def test_completion(self):
        self.assertEqual(self.complete("") & set(COMMANDS), set(COMMANDS))
        self.assertNotIn("generate", self.complete(""))
        self.assertEqual(self.complete("ver"), {"verify"})
        for command in COMMANDS:
            self.assertEqual(self.complete(command, "--"), self.options(command))
        self.assertEqual(self.complete("build", "--ordering", ""), {"auto", "scanline", "blocked"})
        self.assertEqual(self.complete("verify", "--resampling", "m"),
                         {"mode", "minimum", "maximum", "median"})
        self.picture("here.tif", 4, 4, 1)
        self.assertEqual(self.complete("build", "he"), {"here.tif"})

    def test_it_is_not_shown(self):
        self.assertNotIn("generate", subprocess.run([TOOL, "--help"], capture_output=True,
                                                    text=True).stdout)
