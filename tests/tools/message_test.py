"""Every refusal: one line on stderr, nothing on stdout, and the right exit status."""
import os
import re

from frame import ToolTest, geotiff, samples

COMMANDS = ["build", "plan", "part", "finish", "status", "info", "export", "hash", "verify", "compare", "update",
            "recover", "preview", "serve"]


class Help(ToolTest):
    def test_help_of_every_command_has_examples(self):
        self.assertIn("Exit status", self.good("--help"))
        for command in COMMANDS:
            text = self.good(command, "--help")
            self.assertIn(f"Examples:\n  zmcraster {command} ", text)
            self.assertIn("--json", text)
            self.assertIn("--quiet", text)

    def test_version(self):
        self.assertRegex(self.good("--version"),
                         r"^zmcraster \d+\.\d+\.\d+\npyramid format 1\.1\nXerces-C\+\+ 3\.\S+\n"
                         r"GDAL 3\.\S+\n$")
        self.pyramid()
        written = self.document("info", "picture.pyr")["version"]
        self.assertIn(f"\npyramid format {written}\n", self.good("--version"))

    def test_the_page_of_the_command_line_shows_the_help_there_is(self):
        with open(os.path.join(os.path.dirname(__file__), "../../docs/cli.md")) as page:
            text = page.read()
        shown = text.split("$ zmcraster build --help\n")[1].split("```")[0]
        self.assertEqual(shown.rstrip("\n"), self.good("build", "--help").rstrip("\n"))
        for status in self.good("--help").split("Exit status: ")[1].rstrip(".\n").split(", "):
            number = status.split()[0]
            self.assertRegex(text, rf"Exit status:[^.]*\b{number}\b")
        commands = re.findall(r"^  (\w+) {2,}", self.good("--help").split("Subcommands:")[1], re.M)
        self.assertEqual(sorted(re.findall(r"^## ([a-z]+)$", text, re.M)), sorted(commands))


class Usage(ToolTest):
    def test_the_command(self):
        self.refused(2, "A subcommand is required; see zmcraster --help")
        self.refused(2, "stretch: there is no such command; see zmcraster --help", "stretch")

    def test_words_that_are_nearly_right(self):
        for word, meant in (("bild", "build"), ("verfiy", "verify"), ("Info", "info")):
            self.refused(2, f"{word}: there is no such command (did you mean {meant}?); see "
                            "zmcraster --help", word)
        for word, meant in (("--jsn", "--json"), ("-json", "--json"), ("--quite", "--quiet")):
            self.refused(2, f"The following argument was not expected: {word} (did you mean "
                            f"{meant}?); see zmcraster info --help", "info", "a.pyr", word)
        self.refused(2, "The following arguments were not expected: --level=2 --ordring x (did you "
                        "mean --levels?); see zmcraster build --help", "build", "a.tif", "b.pyr",
                     "--level=2", "--ordring", "x")
        self.refused(2, "The following argument was not expected: --limt=bands=2 (did you mean "
                        "--limit?); see zmcraster info --help", "--limt=bands=2", "info", "a.pyr")
        for word in ("--palette", "-z", "-", "--", "---", "--="):
            done = self.run_tool("info", "a.pyr", word)
            self.assertNotIn("did you mean", done.stderr)
            self.assertEqual(done.stderr.count("\n"), 1)

    def test_words_that_nothing_takes_are_told_in_their_order(self):
        self.refused(2, "The following arguments were not expected: c d e; see zmcraster build "
                        "--help", "build", "a", "b", "c", "d", "e")

    def test_arguments_of_every_command(self):
        for command in COMMANDS:
            done = self.run_tool(command)
            self.assertEqual((done.returncode, done.stdout), (2, ""))
            self.assertRegex(done.stderr, r"^zmcraster: .* is required; see zmcraster " + command +
                             r" --help\n$")
            done = self.run_tool(command, "a", "b", "c", "--nonesuch")
            self.assertEqual((done.returncode, done.stderr.count("\n")), (2, 1))

    def test_names_of_lent_sources_reach_nothing(self):
        self.pyramid()
        name = "zmc-lent:0123456789abcdef0123456789abcdef"
        os.rename(self.path("picture.pyr"), self.path(name))
        for words in (["info", name], ["export", name, "a.tif"], ["hash", name], ["verify", name],
                      ["recover", name], ["compare", name, "a"], ["compare", "a", name],
                      ["verify", "a.pyr", "--against", name], ["build", name, "a.pyr"],
                      ["build", "a.tif", name], ["export", "a.pyr", name],
                      ["preview", name, "a.png"], ["preview", "a.pyr", name]):
            done = self.run_tool(*words)
            self.assertEqual((done.returncode, done.stdout), (2, ""), words)
            self.assertIn(name + ": names of lent sources are not taken here", done.stderr)
        self.good("info", "./" + name)

    def test_options_of_build(self):
        self.picture()
        tail = "; see zmcraster build --help"
        methods = "nearest,average,rms,mode,minimum,maximum,median,bilinear,cubic,lanczos,gauss,cubicspline"
        for option, value, message in (
                ("--levels", "z", '--levels: "z" is no whole number'),
                ("--levels", "32", "--levels: 32 is more than 31"),
                ("--resampling", "best", f"--resampling: best not in {{{methods}}}" + tail),
                ("--ordering", "morton",
                 "--ordering: morton not in {auto,scanline,blocked}" + tail),
                ("--nodata", "x", '--nodata: "x" is no number'),
                ("--nodata", "-1", "--nodata: no sample of type Byte can be -1"),
                ("--nodata", "1.5", "--nodata: no sample of type Byte can be 1.5"),
                ("--bands", "4", "--bands: there is no band 4: the raster has the bands 1 to 3"),
                ("--bands", "0", "--bands: there is no band 0: the raster has the bands 1 to 3"),
                ("--bands", "", "--bands: an empty list names no band" + tail),
                ("--bands", "a", '--bands: "a" is no list such as 3,2,1'),
                ("--bins", "0", "--bins: a histogram has one bin at least"),
                ("--threads", "-2", '--threads: "-2" is no whole number'),
                ("--memory", "lots",
                 '--memory: "lots" is no size: give bytes, or 512K, 256M, 2G')):
            self.refused(2, message, "build", "picture.tif", "made.pyr", option, value)
        self.assertEqual(self.files(), ["picture.tif"])

    def test_levels_windows_and_tolerance(self):
        self.pyramid()
        for command in (["hash", "picture.pyr"], ["export", "picture.pyr", "x.tif"]):
            self.refused(2, "--level: there is no level 3: picture.pyr has the levels 0 to 2",
                         *command, "--level", 3)
            self.refused(2, "--window: 0,0,351,1 is not inside the level, which has 350 x 150 "
                            "pixels", *command, "--level", 1, "--window", "0,0,351,1")
            self.refused(2, '--window: "1,2,3" is not X,Y,WIDTH,HEIGHT', *command, "--window",
                         "1,2,3")
        self.refused(2, "--tolerance: -1 is below 0", "compare", "picture.pyr", "picture.tif",
                     "--tolerance", "-1")
        self.assertEqual(self.files(), ["picture.pyr", "picture.tif"])

    def test_empty_lists_of_bands(self):
        self.pyramid()
        for command, *names in (("hash", "picture.pyr"), ("verify", "picture.pyr"),
                                ("export", "picture.pyr", "x.tif")):
            self.refused(2, "--bands: an empty list names no band; see zmcraster "
                            f"{command} --help", command, *names, "--bands", "")
        self.assertEqual(self.files(), ["picture.pyr", "picture.tif"])

    def test_a_method_that_complex_numbers_do_not_have(self):
        geotiff(self.path("source.tif"), samples("ComplexSingle", 20, 20, 1), "ComplexSingle")
        done = self.run_tool("build", "source.tif", "made.pyr", "--resampling", "median")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1))
        self.good("build", "source.tif", "made.pyr", "--levels", 1)
        self.refused(2, "--resampling: median is not defined for this pixel type", "verify",
                     "made.pyr", "--resampling", "median")


class Failures(ToolTest):
    def test_files_that_are_not_there(self):
        self.pyramid()
        for command in (["info", "nonesuch"], ["verify", "nonesuch"], ["hash", "nonesuch"],
                        ["export", "nonesuch", "x.png"], ["build", "nonesuch", "x.pyr"],
                        ["compare", "nonesuch", "picture.pyr"],
                        ["compare", "picture.pyr", "nonesuch"],
                        ["verify", "picture.pyr", "--against", "nonesuch"]):
            self.refused(1, "nonesuch: there is no such file", *command)

    def test_files_that_are_something_else(self):
        with open(self.path("text.txt"), "w") as file:
            file.write("no raster at all, but long enough to be looked at\n")
        self.refused(1, "text.txt: it is in no raster format that GDAL knows", "build", "text.txt",
                     "x.pyr")
        self.picture()
        for command in ("info", "verify"):
            done = self.run_tool(command, "picture.tif")
            self.assertEqual((done.returncode, done.stdout, done.stderr.count("\n")), (1, "", 1))
            self.assertTrue(done.stderr.startswith("zmcraster: picture.tif: "), done.stderr)
            self.refused(1, ".: it is a folder", command, ".")

    def test_targets_of_build(self):
        self.pyramid()
        os.mkdir(self.path("folder"))
        with open(self.path("picture.pyr"), "rb") as file:
            before = file.read()
        build = ["build", "picture.tif"]
        self.refused(1, "picture.pyr: the file exists already; --overwrite replaces it", *build,
                     "picture.pyr")
        self.refused(1, "folder: it is a folder; name a file in it", *build, "folder",
                     "--overwrite")
        self.refused(1, "picture.tif: it is the source; name another file", *build, "picture.tif",
                     "--overwrite")
        os.chmod(self.path("picture.pyr"), 0o444)
        self.refused(1, "picture.pyr: cannot replace it: the file is read-only", *build,
                     "picture.pyr", "--overwrite")
        done = self.run_tool(*build, "nowhere/made.pyr")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1))
        self.assertTrue(done.stderr.startswith("zmcraster: nowhere/made.pyr: "), done.stderr)
        with open(self.path("picture.pyr"), "rb") as file:
            self.assertEqual(file.read(), before)
        self.assertEqual(self.files(), ["folder", "picture.pyr", "picture.tif"])

    def test_addresses_in_memory_are_no_names(self):
        self.pyramid()
        for name in ("MEM:::DATAPOINTER=0x1000,PIXELS=10,LINES=10",
                     "SAMPLES=10;LINES=10;BANDS=1;INTERLEAVE=0;PIXELTYPE=1;PIXELDATA=0x1000"):
            for command in (["build", name, "x.pyr"], ["info", name], ["hash", name],
                            ["verify", name], ["export", name, "x.tif"],
                            ["compare", name, "picture.pyr"]):
                self.refused(1, f"{name}: there is no such file", *command)

    def test_addresses_in_memory_do_not_come_out_of_files(self):
        with open(self.path("trap.vrt"), "w") as file:
            file.write('<VRTDataset rasterXSize="10" rasterYSize="10"><VRTRasterBand '
                       'dataType="Byte" band="1"><SimpleSource><SourceFilename>MEM:::DATAPOINTER='
                       '0x1000,PIXELS=10,LINES=10</SourceFilename></SimpleSource></VRTRasterBand>'
                       '</VRTDataset>')
        done = self.run_tool("build", "trap.vrt", "made.pyr")
        self.assertEqual(done.returncode, 1, done)
        self.assertEqual(self.files(), ["trap.vrt"])

    def test_names_with_line_ends_give_one_line(self):
        done = self.run_tool("info", "two\nlines")
        self.assertEqual(done.stderr, "zmcraster: two\\x0alines: there is no such file\n")

    def test_names_that_are_not_utf8(self):
        name = os.fsdecode(b"b\xffd.pyr")
        self.pyramid()
        os.rename(self.path("picture.pyr"), self.path(name))
        done = self.run_tool("info", name, "--json", errors="surrogateescape")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1))

    def test_no_room_on_standard_output(self):
        self.pyramid()
        with open("/dev/full", "w") as full:
            import subprocess
            from frame import TOOL
            done = subprocess.run([TOOL, "info", "picture.pyr"], cwd=self.folder, stdout=full,
                                  stderr=subprocess.PIPE, text=True)
        self.assertEqual((done.returncode, done.stderr),
                         (1, "zmcraster: standard output: it cannot be written\n"))
