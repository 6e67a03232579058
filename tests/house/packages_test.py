"""What is told about packages agrees: versions, names, groups of Debian packages, the licence, the container."""
import json
import pathlib
import re
import subprocess
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[2]
DEBIAN = ROOT / "debian"


def text(path):
    return (ROOT / path).read_text(encoding="utf-8")


def paragraphs(path):
    """The fields of each paragraph of a control file; values that take more lines have them joined."""
    found = []
    for part in re.split(r"\n\s*\n", text(path).strip()):
        fields = re.findall(r"^(\S+):[ \t]*(.*(?:\n[ \t].*)*)", part, re.M)
        found.append({name: " ".join(value.split()) for name, value in fields})
    return found


def names(value):
    return [re.sub(r"[ (\[].*", "", each.strip()) for each in value.split(",") if each.strip()]


def setup(*words):
    return subprocess.run([ROOT / "scripts/setup", *words], capture_output=True, text=True)


class Packages(unittest.TestCase):
    def test_versions_agree(self):
        version = re.search(r"^project\(zmcraster VERSION (\S+)", text("CMakeLists.txt"), re.M)[1]
        self.assertTrue(text("debian/changelog").startswith(f"zmcraster ({version}) "))
        self.assertEqual(json.loads(text("web/package.json"))["version"], version)
        self.assertIn(f"\n## {version}\n", text("CHANGELOG.md"))
        library = [each["Package"] for each in paragraphs("debian/control")
                   if each.get("Section") == "libs"]
        self.assertEqual(library, ["libzmcraster" + version.split(".")[0]])

    def test_the_packages_are_these_and_each_has_files(self):
        source, *packages = paragraphs("debian/control")
        self.assertEqual([each["Package"] for each in packages],
                         ["libzmcraster1", "libzmcraster-dev", "zmcraster", "gdal-plugin-zmcraster",
                          "python3-zmcraster", "zmcraster-doc"])
        for each in packages:
            self.assertTrue((DEBIAN / f"{each['Package']}.install").read_text().strip())
            # Parts of one version go together.
            for name, exact in re.findall(r"(libzmcraster1|zmcraster) (\([^)]*\))?", each["Depends"]):
                self.assertEqual(exact, "(= ${binary:Version})", f"{each['Package']}: {name}")

    def test_what_a_package_build_needs_is_what_the_groups_install(self):
        needed = set(names(paragraphs("debian/control")[0]["Build-Depends"]))
        groups = set(setup("--list", "demo", "package").stdout.split())
        same = {"debhelper-compat": "debhelper", "pkgconf": "pkg-config"}
        self.assertEqual({same.get(each, each) for each in needed} - groups, set())

    def test_the_demo_installs_nothing_for_tests(self):
        demo = setup("--list", "demo").stdout.split()
        self.assertIn("g++", demo)
        for name in demo:
            self.assertNotRegex(name, "clang|llvm|lld|cppcheck|gtest|gmock|rapidcheck|benchmark|pytest")
        # The commands of the demo are those of packages that it installs.
        self.assertNotIn("gdal_translate", text("scripts/demo"))

    def test_groups(self):
        every = setup("--list", "demo", "test").stdout.split()
        self.assertEqual(every, sorted(set(every)))
        self.assertGreaterEqual(set(every), set(setup("--list", "demo").stdout.split()))
        refused = setup("--list", "tests")
        self.assertEqual((refused.returncode, refused.stdout), (2, ""))
        self.assertRegex(refused.stderr, r"\Ascripts/setup: no group tests: demo test .*\n\Z")

    def test_the_licence_is_told_in_one_place(self):
        licence = next(each["License"] for each in paragraphs("debian/copyright") if each.get("Files") == "*")
        self.assertIn(f"Licence: [{licence.split()[0]}](debian/copyright)", text("README.md"))

    def test_the_one_line_that_installs_is_that_of_the_script(self):
        line = "sudo cp out/packages/zmcraster.sources /etc/apt/sources.list.d/"
        self.assertIn(line, text("README.md"))
        self.assertIn("zmcraster.sources", text("scripts/package"))

    def test_the_container_serves_what_the_packages_bring(self):
        steps = re.findall(r"^([A-Z]+) ((?:.*\\\n)*.*)$", re.sub("^#.*\n", "", text("Containerfile"), flags=re.M), re.M)
        words = {name: value for name, value in steps}
        self.assertEqual(steps[0][0], "FROM")
        self.assertEqual(words["COPY"], "out/packages /packages")
        self.assertNotEqual(words["USER"], "root")
        entry = json.loads(words["ENTRYPOINT"])
        self.assertEqual(entry[:2], ["/usr/bin/zmcraster", "serve"])
        self.assertEqual(words["EXPOSE"], entry[entry.index("--port") + 1])
        for name, value in steps:
            if name == "RUN":
                done = subprocess.run(["sh", "-n", "-c", value.replace("\\\n", "")], capture_output=True, text=True)
                self.assertEqual((done.returncode, done.stderr), (0, ""))

    def test_scripts_are_sound(self):
        for path in [*DEBIAN.glob("tests/*"), *(ROOT / "scripts" / each for each in
                     ("check-abi", "check-packages", "demo", "package", "setup"))]:
            if path.name != "control":
                done = subprocess.run(["bash", "-n", path], capture_output=True, text=True)
                self.assertEqual((done.returncode, done.stderr), (0, ""), path)
                self.assertTrue(path.stat().st_mode & 0o100, path)
        declared = re.findall(r"^Tests: (\S+)$", text("debian/tests/control"), re.M)
        self.assertEqual(sorted(declared),
                         sorted(each.name for each in DEBIAN.glob("tests/*") if each.name != "control"))

    def test_wrong_words_are_answered_in_one_line_or_with_the_help(self):
        for script in ("package", "check-packages", "check-abi"):
            done = subprocess.run([ROOT / "scripts" / script, "--nonsense"], capture_output=True, text=True)
            self.assertEqual((done.returncode, done.stdout), (2, ""), script)
            self.assertIn(f"scripts/{script}", done.stderr)
        for script, folder in (("check-abi", "docs"), ("package", "docs"), ("package", "README.md/packages")):
            done = subprocess.run([ROOT / "scripts" / script, ROOT / folder], capture_output=True, text=True)
            self.assertEqual((done.returncode, done.stdout), (1, ""), script)
            self.assertEqual(done.stderr.count("\n"), 1, done.stderr)


if __name__ == "__main__":
    unittest.main()
