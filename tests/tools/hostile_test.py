"""Folders in which somebody else works at the same time, and who is not a friend."""
import hashlib
import json
import os
import resource
import signal
import socket
import stat
import subprocess
import tempfile
import threading
import time
import unittest

import numpy as np
from osgeo import gdal, osr

from frame import TOOL, ToolTest, geotiff, samples
from pyramid import Pyramid

READERS = (["info", "{}"], ["hash", "{}"], ["verify", "{}"], ["recover", "{}"],
           ["compare", "{}", "picture.pyr"], ["compare", "picture.pyr", "{}"],
           ["verify", "picture.pyr", "--against", "{}"], ["export", "{}", "out.png"],
           ["build", "{}", "out.pyr"], ["export", "picture.pyr", "{}"],
           ["preview", "{}", "out.png"])


class NoFiles(ToolTest):
    """What waits for ever, or does anything, when it is opened."""

    def plant(self, name, kind):
        path = self.path(name)
        if kind == "pipe":
            os.mkfifo(path)
        elif kind == "socket":
            plug = socket.socket(socket.AF_UNIX)
            self.addCleanup(plug.close)
            plug.bind(path)
        elif kind == "folder":
            os.mkdir(path)
        else:
            os.symlink("/dev/zero", path)

    def test_are_refused_at_once_in_one_line(self):
        self.pyramid()
        for kind in ("pipe", "socket", "device", "folder"):
            self.plant(kind, kind)
            for command in READERS:
                with self.subTest((kind, *command)):
                    words = [word.format(kind) for word in command]
                    begin = time.monotonic()
                    done = self.run_tool(*words)
                    self.assertLess(time.monotonic() - begin, 20)
                    self.assertEqual((done.returncode, done.stdout), (1, ""), done)
                    self.assertRegex(done.stderr, r"^zmcraster: [^\n]+\n$")
                    if kind != "folder":
                        self.assertEqual(done.stderr,
                                         f"zmcraster: {kind}: it is not a regular file\n")
            self.assertEqual(self.run_tool("build", "picture.tif", kind, "--overwrite").returncode, 1)
        self.assertEqual(self.files(),
                         ["device", "folder", "picture.pyr", "picture.tif", "pipe", "socket"])

    def test_beside_a_raster_they_are_not_opened(self):
        self.pyramid()
        expected = self.good("hash", "picture.pyr").split()[0]
        for ending in (".aux.xml", ".msk", ".ovr"):
            for name in ("picture.pyr", "picture.tif"):
                self.plant(name + ending, "pipe")
        for words in (["hash", "picture.pyr"], ["hash", "picture.tif"],
                      ["verify", "picture.pyr", "--against", "picture.tif"],
                      ["compare", "picture.tif", "picture.pyr"], ["info", "picture.pyr"],
                      ["build", "picture.tif", "other.pyr"],
                      ["export", "picture.pyr", "back.tif"]):
            done = self.run_tool(*words)
            self.assertEqual(done.returncode, 0, done)
            if words[0] == "hash":
                self.assertEqual(done.stdout.split()[0], expected)

    def test_in_a_virtual_raster_they_are_not_opened(self):
        os.mkfifo(self.path("pipe"))
        with open(self.path("trap.vrt"), "w") as file:
            file.write('<VRTDataset rasterXSize="10" rasterYSize="10"><VRTRasterBand '
                       'dataType="Byte" band="1"><SimpleSource><SourceFilename relativeToVRT="1">'
                       'pipe</SourceFilename></SimpleSource></VRTRasterBand></VRTDataset>')
        self.assertEqual(self.run_tool("build", "trap.vrt", "made.pyr").returncode, 1)
        self.assertEqual(self.run_tool("hash", "trap.vrt").returncode, 1)
        self.assertEqual(self.files(), ["pipe", "trap.vrt"])


class Names(ToolTest):
    """A name of a file may hold anything but a slash."""

    EVIL = "a\x1b]0;owned\x07\x1b[2Jb\r\nzmcraster: c\x9b31m\u202egpj.\x7f"
    SHOWN = (r"a\x1b]0;owned\x07\x1b[2Jb\x0d\x0azmcraster: c\xc2\x9b31m\xe2\x80\xaegpj.\x7f")

    def check(self, done, status):
        self.assertEqual(done.returncode, status, done)
        for text in (done.stdout, done.stderr):
            bad = [c for c in text if c != "\n" and (ord(c) < 32 or 127 <= ord(c) < 160 or
                                                     c in "\u202e\u2066")]
            self.assertEqual(bad, [], text)
        self.assertTrue(done.stderr == "" or done.stderr.count("\n") == 1, done)
        return done.stdout + done.stderr

    def test_nothing_of_them_steers_a_terminal(self):
        pixels = self.picture()
        os.rename(self.path("picture.tif"), self.path(self.EVIL + ".tif"))
        source, made = self.EVIL + ".tif", self.EVIL + ".pyr"
        self.assertTrue(self.check(self.run_tool("build", source, made), 0)
                        .startswith(self.SHOWN + ".pyr: 700 x 300 pixels"))
        self.assertTrue(self.check(self.run_tool("info", made), 0).startswith(self.SHOWN + ".pyr\n"))
        digest = hashlib.sha256(pixels.tobytes()).hexdigest()
        self.assertEqual(self.check(self.run_tool("hash", made), 0),
                         f"{digest}  {self.SHOWN}.pyr\n")
        self.assertEqual(self.check(self.run_tool("compare", source, made), 0),
                         f"{self.SHOWN}.tif and {self.SHOWN}.pyr are equal\n")
        self.check(self.run_tool("export", made, self.EVIL + ".png"), 0)
        self.check(self.run_tool("recover", made), 0)
        self.check(self.run_tool("verify", made, "--against", source), 0)
        self.picture("other.tif", seed=2)
        self.check(self.run_tool("verify", made, "--against", "other.tif"), 3)
        self.picture("narrow.tif", width=500)
        os.rename(self.path("narrow.tif"), self.path(self.EVIL))
        self.assertIn(self.SHOWN + " has 500 x 300 pixels",
                      self.check(self.run_tool("verify", made, "--against", self.EVIL), 3))

    def test_messages_show_them_too(self):
        name = self.EVIL
        for words in (["info", name], ["hash", name], ["build", name, "x.pyr"],
                      ["export", name, "x.tif"], ["compare", name, name], ["verify", name],
                      ["recover", name], ["preview", name, "x.png"]):
            self.assertEqual(self.check(self.run_tool(*words), 1),
                             f"zmcraster: {self.SHOWN}: there is no such file\n")
        self.pyramid()
        for words in ([name], ["hash", "picture.pyr", "--bands", name],
                      ["hash", "picture.pyr", "--" + name], ["build", "picture.tif", "a", "b", name],
                      ["export", "picture.pyr", "x", "--format", name]):
            self.assertIn(r"\x1b[2J", self.check(self.run_tool(*words), 2))
        os.rename(self.path("picture.pyr"), self.path(name))
        with open(self.path(name + ".zmcmeta"), "w") as copy:
            copy.write("torn")
        self.assertIn(r"\x1b[2J", self.check(self.run_tool("hash", name), 0))
        os.remove(self.path(name + ".zmcmeta"))
        os.truncate(self.path(name), 1000)
        self.check(self.run_tool("verify", name), 3)
        self.assertTrue(self.check(self.run_tool("hash", name), 1)
                        .startswith(f"zmcraster: {self.SHOWN}: cannot read "))

    def test_warnings_and_parts_of_messages_show_them_too(self):
        self.pyramid()
        os.rename(self.path("picture.pyr"), self.path(self.EVIL))
        self.assertIn(": " + self.SHOWN + " has the levels",
                      self.check(self.run_tool("export", self.EVIL, "x.tif", "--level", "9"), 2))
        with open(self.path(self.EVIL), "ab") as file:
            file.write(b"<")
        self.assertTrue(self.run_tool("info", self.EVIL).stderr.startswith(
            f"zmcraster: {self.SHOWN}: warning: the metadata document is malformed"))
        geotiff(self.path("wide.tif"), samples("Int64", 20, 30, 1), "Int64")
        done = self.run_tool("build", "wide.tif", self.EVIL, "--overwrite", "--nodata", str(2**62 + 1))
        self.assertTrue(self.check(done, 0).endswith("\n"))
        self.assertTrue(done.stderr.startswith(
            f"zmcraster: {self.SHOWN}: warning: a pyramid does not keep the last digits"), done)

    def test_documents_have_them_exactly(self):
        self.pyramid()
        os.rename(self.path("picture.pyr"), self.path(self.EVIL))
        for command in ("info", "hash", "verify"):
            self.assertEqual(self.document(command, self.EVIL)["file"], self.EVIL)


class Limits(ToolTest):
    def test_a_limit_of_file_sizes_is_a_refusal_and_leaves_nothing(self):
        self.pyramid("made.pyr")
        with open(self.path("made.pyr"), "rb") as file:
            old = file.read()
        self.picture("large.tif", 2600, 2600, 3)
        for target, status in (("made.pyr", 1), ("new.pyr", 1)):
            done = self.run_tool(
                "build", "large.tif", target, "--overwrite",
                preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (12 << 20, 12 << 20)))
            self.assertEqual((done.returncode, done.stdout), (status, ""), done)
            self.assertRegex(done.stderr, rf"^zmcraster: {target}: [^\n]*File too large[^\n]*\n$")
            self.assertEqual(self.files(), ["large.tif", "made.pyr", "picture.tif"])
        with open(self.path("made.pyr"), "rb") as file:
            self.assertEqual(file.read(), old)
        done = self.run_tool(
            "export", "made.pyr", "back.tif",
            preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (65536, 65536)))
        self.assertEqual((done.returncode, self.files()),
                         (1, ["large.tif", "made.pyr", "picture.tif"]), done)


@unittest.skipUnless(os.geteuid() == 0, "only root makes containers here")
class Containers(ToolTest):
    def test_a_build_in_another_container_is_alive(self):
        """Its process has a number here that no process has, or another one."""
        dataset = gdal.GetDriverByName("GTiff").Create(
            self.path("large.tif"), 20000, 20000, 3, gdal.GDT_Byte, ["SPARSE_OK=TRUE"])
        dataset = None
        self.picture()
        build = subprocess.Popen(["unshare", "--pid", "--fork", "--kill-child", TOOL, "build",
                                  "large.tif", "made.pyr"], cwd=self.folder,
                                 stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)
        deadline = time.monotonic() + 60
        while not [name for name in self.files() if ".zmcbuild-" in name]:
            if build.poll() is not None:
                self.skipTest("no container can be made here: " + build.communicate()[1])
            self.assertLess(time.monotonic(), deadline)
            time.sleep(0.001)
        ours = [name for name in self.files() if ".zmcbuild-" in name]
        self.good("build", "picture.tif", "made.pyr", "--quiet")
        self.assertEqual([name for name in self.files() if ".zmcbuild-" in name], ours)
        build.kill()
        build.communicate()
        deadline = time.monotonic() + 60
        while [name for name in self.files() if ".zmcbuild-" in name]:
            self.assertLess(time.monotonic(), deadline)
            self.good("build", "picture.tif", "made.pyr", "--quiet", "--overwrite")
        self.assertEqual(self.files(), ["large.tif", "made.pyr", "picture.tif"])


class Rights(ToolTest):
    """What may be done with a target outlives its replacement."""

    def build(self, name="made.pyr", mask=0o022, source="picture.tif"):
        done = self.run_tool("build", source, name, "--overwrite", preexec_fn=lambda: os.umask(mask))
        self.assertEqual(done.returncode, 0, done)

    def mode(self, name):
        return stat.S_IMODE(os.stat(self.path(name)).st_mode)

    def test_a_new_file_obeys_the_mask_of_the_process(self):
        geotiff(self.path("picture.tif"), samples("Byte", 20, 20, 1), nodata=7)
        for mask, mode in ((0o022, 0o644), (0o077, 0o600), (0o002, 0o664)):
            name = f"made{mask:o}.pyr"
            self.build(name, mask)
            self.assertEqual(self.mode(name), mode)
            self.assertEqual(self.mode(name + ".aux.xml"), mode)

    def test_the_mode_stays(self):
        geotiff(self.path("picture.tif"), samples("Byte", 20, 20, 1), nodata=7)
        self.build()
        for mode in (0o600, 0o640, 0o664, 0o606, 0o700):
            os.chmod(self.path("made.pyr"), mode)
            os.chmod(self.path("made.pyr.aux.xml"), mode)
            self.build()
            self.assertEqual((self.mode("made.pyr"), self.mode("made.pyr.aux.xml")), (mode, mode))

    def test_a_sidecar_that_comes_new_is_no_more_open_than_its_pyramid(self):
        self.picture("plain.tif", 20, 20, 1)
        geotiff(self.path("with.tif"), samples("Byte", 20, 20, 1), nodata=7)
        self.build(source="plain.tif")
        os.chmod(self.path("made.pyr"), 0o600)
        self.build(source="with.tif")
        self.assertEqual(self.mode("made.pyr.aux.xml"), 0o600)

    def test_while_it_grows_it_is_nobody_elses(self):
        self.pyramid("made.pyr")
        dataset = gdal.GetDriverByName("GTiff").Create(
            self.path("large.tif"), 9000, 9000, 3, gdal.GDT_Byte, ["SPARSE_OK=TRUE"])
        dataset = None
        os.chmod(self.path("made.pyr"), 0o600)
        child = subprocess.Popen([TOOL, "build", "large.tif", "made.pyr", "--overwrite", "-q"],
                                 cwd=self.folder)
        seen = set()
        while child.poll() is None:
            for name in self.files():
                if ".zmcbuild-" in name:
                    try:
                        status = os.stat(self.path(name))
                    except FileNotFoundError:
                        continue
                    if status.st_size > 0:
                        seen.add(stat.S_IMODE(status.st_mode))
        self.assertEqual((child.returncode, seen), (0, {0o600}))

    @unittest.skipUnless(os.geteuid() == 0, "only root gives files away")
    def test_owner_and_group_stay(self):
        self.picture()
        self.build()
        os.chown(self.path("made.pyr"), 1234, 2345)
        os.chmod(self.path("made.pyr"), 0o640)
        self.build()
        status = os.stat(self.path("made.pyr"))
        self.assertEqual((status.st_uid, status.st_gid, self.mode("made.pyr")), (1234, 2345, 0o640))

    @unittest.skipUnless(os.geteuid() == 0, "only root becomes somebody else")
    def test_a_group_that_cannot_be_given_is_not_replaced_by_a_wider_one(self):
        self.picture()
        self.build()
        os.chmod(self.folder, 0o777)
        os.chown(self.path("made.pyr"), 1234, 2345)
        os.chmod(self.path("made.pyr"), 0o666)
        done = self.run_tool("build", "picture.tif", "made.pyr", "--overwrite", user=4321,
                             group=5432, extra_groups=[])
        if "Permission" in done.stderr:
            self.skipTest("the program is not for others here: " + done.stderr)
        self.assertEqual(done.returncode, 0, done)
        status = os.stat(self.path("made.pyr"))
        self.assertEqual((status.st_uid, status.st_gid, self.mode("made.pyr")), (4321, 5432, 0o666))
        os.chown(self.path("made.pyr"), 4321, 2345)
        os.chmod(self.path("made.pyr"), 0o664)
        self.run_tool("build", "picture.tif", "made.pyr", "--overwrite", user=4321, group=5432,
                      extra_groups=[])
        status = os.stat(self.path("made.pyr"))
        self.assertEqual((status.st_uid, status.st_gid, self.mode("made.pyr")), (4321, 5432, 0o644))

    def test_attributes_and_the_access_list_stay(self):
        self.picture()
        self.build()
        path = self.path("made.pyr")
        # Version 2; the owner rw, user 1234 r, the group -, the mask r, others -.
        entries = ((1, 6, 0xFFFFFFFF), (2, 4, 1234), (4, 0, 0xFFFFFFFF), (16, 4, 0xFFFFFFFF),
                   (32, 0, 0xFFFFFFFF))
        access = (2).to_bytes(4, "little") + b"".join(
            tag.to_bytes(2, "little") + bits.to_bytes(2, "little") + who.to_bytes(4, "little")
            for tag, bits, who in entries)
        wanted = {"user.origin": b"survey 7", "system.posix_acl_access": access}
        for name, value in list(wanted.items()):
            try:
                os.setxattr(path, name, value)
            except OSError:
                del wanted[name]
        if not wanted:
            self.skipTest("the file system has no attributes")
        mode = self.mode("made.pyr")
        self.build()
        self.assertEqual({name: os.getxattr(path, name) for name in wanted}, wanted)
        self.assertEqual(self.mode("made.pyr"), mode)


class Moments(ToolTest):
    """A raster that changes while it is read: what is told of it is true of one of its two contents,
    or the command fails in one line."""

    SIDE = 2000
    # Between two changes, in times of what a command takes that reads the raster at rest: it meets
    # a change in the short ones, and none in the long ones.
    PAUSES = (0.3, 1.2, 0.6, 2.4)
    RUNS = 60  # in which both outcomes come, where there are two
    UNDISTURBED = 6  # runs of a command that meets no change

    @classmethod
    def setUpClass(cls):
        cls.rasters = tempfile.TemporaryDirectory(prefix="zmctools")
        cls.addClassCleanup(cls.rasters.cleanup)
        cls.digests = []
        pixels = samples("Byte", cls.SIDE, cls.SIDE, 3)
        for number in (1, 2):
            pixels[::16, ::16] ^= number  # all over, and not so much that commands take longer
            geotiff(cls.raster(number, "tif"), pixels)
            subprocess.run([TOOL, "build", cls.raster(number, "tif"), cls.raster(number, "pyr")],
                           check=True, capture_output=True)
            cls.digests.append(hashlib.sha256(pixels.tobytes()).hexdigest())

    @classmethod
    def raster(cls, number, kind):
        return os.path.join(cls.rasters.name, f"{number}.{kind}")

    def contents(self, kind):
        parts = []
        for number in (1, 2):
            with open(self.raster(number, kind), "rb") as file:
                parts.append(file.read())
        return parts

    def replace(self, name, part):
        with open(self.path("next"), "wb") as file:
            file.write(part)
        os.rename(self.path("next"), self.path(name))

    def rewrite(self, name, part):
        with open(self.path(name), "r+b" if os.path.exists(self.path(name)) else "wb") as file:
            for at in range(0, len(part), 1 << 20):
                file.seek(at)
                file.write(part[at:at + (1 << 20)])

    def at_rest(self, words, name, parts):
        """What a command answers to either content."""
        answers = []
        for part in parts:
            self.replace(name, part)
            done = self.run_tool(*words)
            self.assertEqual(done.stderr, "", words)
            self.assertIn(done.returncode, (0, 3), words)
            answers.append((done.returncode, done.stdout))
        return answers

    def seconds(self, words):
        begin = time.monotonic()
        self.run_tool(*words)
        return time.monotonic() - begin

    def answers_while(self, change, words, kind, meets_changes=True, reading=None):
        """The answers of a command to both contents, and one of them is what it says of the raster
        while that changes, or that it has changed. `reading` is a command that takes as long as the
        part of it that reads the raster."""
        name, parts = "a." + kind, self.contents(kind)
        answers = self.at_rest(words, name, parts)
        unit = self.seconds(reading or words)
        stop = threading.Event()

        def work():
            turn = 0
            while not stop.is_set():
                change(name, parts[turn % 2])
                stop.wait(unit * self.PAUSES[turn % len(self.PAUSES)])
                turn += 1
        thread = threading.Thread(target=work)
        thread.start()
        good = refused = 0
        try:
            for _ in range(self.RUNS):
                done = self.run_tool(*words)
                if done.stderr == "":
                    good += 1
                    self.assertIn((done.returncode, done.stdout), answers, words)
                else:
                    refused += 1
                    self.assertEqual((done.returncode, done.stdout), (1, ""), done)
                    self.assertRegex(done.stderr, r"^(zmcraster: [^\n]+\n)+$")
                    self.assertIn("it changed while it was read", done.stderr)
                if good > 0 and refused > 0 if meets_changes else good == self.UNDISTURBED:
                    break
        finally:
            stop.set()
            thread.join()
        self.assertGreater(good, 0, (words, refused))
        if meets_changes:
            self.assertGreater(refused, 0, (words, good))
        return answers

    def check_hash(self, change, kind, meets_changes=True):
        answers = self.answers_while(change, ["hash", "a." + kind], kind, meets_changes)
        self.assertEqual(answers, [(0, f"{digest}  a.{kind}\n") for digest in self.digests])

    def test_a_pyramid_that_is_replaced_has_the_digest_of_one_file(self):
        self.check_hash(self.replace, "pyr", meets_changes=False)

    def test_a_pyramid_that_is_rewritten_has_the_digest_of_one_file_or_none(self):
        self.check_hash(self.rewrite, "pyr")

    def test_a_picture_that_is_replaced_has_the_digest_of_one_file_or_none(self):
        self.check_hash(self.replace, "tif")

    def test_a_picture_that_is_rewritten_has_the_digest_of_one_file_or_none(self):
        self.check_hash(self.rewrite, "tif")

    def check_compare(self, change, kind, meets_changes=True):
        words = ["compare", self.raster(1, "pyr"), "a." + kind, "--json"]
        same, other = self.answers_while(change, words, kind, meets_changes)
        self.assertEqual((same[0], other[0]), (0, 3))
        self.assertTrue(json.loads(same[1])["equal"])

    def test_a_pyramid_that_is_replaced_compares_as_one_file(self):
        self.check_compare(self.replace, "pyr", meets_changes=False)

    def test_a_pyramid_that_is_rewritten_compares_as_one_file_or_not(self):
        self.check_compare(self.rewrite, "pyr")

    def test_a_picture_that_is_replaced_compares_as_one_file_or_not(self):
        self.check_compare(self.replace, "tif")

    def test_a_picture_that_is_rewritten_compares_as_one_file_or_not(self):
        self.check_compare(self.rewrite, "tif")

    def check_verify(self, change, meets_changes=True):
        answers = self.answers_while(change, ["verify", "a.pyr"], "pyr", meets_changes)
        self.assertEqual([status for status, _ in answers], [0, 0])

    def test_a_pyramid_that_is_replaced_verifies_as_one_file(self):
        self.check_verify(self.replace, meets_changes=False)

    def test_a_pyramid_that_is_rewritten_verifies_as_one_file_or_not(self):
        self.check_verify(self.rewrite)

    def check_verify_against(self, change):
        pyramid = self.raster(1, "pyr")
        answers = self.answers_while(change, ["verify", pyramid, "--against", "a.tif"], "tif",
                                     reading=["compare", pyramid, "a.tif"])
        self.assertEqual([status for status, _ in answers], [0, 3])

    def test_a_pyramid_is_verified_against_one_picture_that_is_replaced_or_none(self):
        self.check_verify_against(self.replace)

    def test_a_pyramid_is_verified_against_one_picture_that_is_rewritten_or_none(self):
        self.check_verify_against(self.rewrite)

    def test_a_pyramid_that_was_built_just_now_has_a_digest(self):
        for _ in range(3):
            self.good("build", self.raster(1, "tif"), "new.pyr", "--overwrite", "--quiet")
            self.assertEqual(self.good("hash", "new.pyr").split()[0], self.digests[0])


class ClosedStreams(ToolTest):
    """Programs of some starters have no standard streams at all."""

    def started(self, words, closed):
        def close():
            for number in closed:
                os.close(number)
        return subprocess.run([TOOL, *words], cwd=self.folder, preexec_fn=close, timeout=120,
                              stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                              stderr=subprocess.DEVNULL).returncode

    def content(self):
        parts = {}
        for name in ("picture.pyr", "picture.tif", "damaged.pyr"):
            with open(self.path(name), "rb") as file:
                parts[name] = file.read()
        return parts

    def test_no_file_gets_their_numbers(self):
        self.pyramid()
        # The parsers of libraries have something to say about this one.
        with open(self.path("picture.pyr"), "rb") as file:
            data = bytearray(file.read())
        data[Pyramid(self.path("picture.pyr")).end + 60] = 0x3C
        with open(self.path("damaged.pyr"), "wb") as file:
            file.write(data)
        before = self.content()
        expected = Pyramid(self.path("picture.pyr")).read(0)
        for closed in ((0,), (1,), (2,), (0, 1, 2)):
            for words in (["info", "picture.pyr"], ["info", "damaged.pyr"], ["hash", "picture.pyr"],
                          ["hash", "picture.tif"], ["verify", "damaged.pyr"],
                          ["verify", "picture.pyr", "--against", "picture.tif"],
                          ["compare", "picture.tif", "picture.pyr"], ["recover", "picture.pyr"],
                          ["build", "picture.tif", "out.pyr", "--overwrite"],
                          ["export", "picture.pyr", "out.tif"], ["hash", "nonesuch"]):
                with self.subTest((closed, *words)):
                    status = self.started(words, closed)
                    self.assertIn(status, (0, 1, 3))
                    self.assertEqual(self.content(), before)
            # What is written is whole and has no message in it.
            np.testing.assert_array_equal(Pyramid(self.path("out.pyr")).read(0), expected)
            made = np.moveaxis(gdal.Open(self.path("out.tif")).ReadAsArray(), 0, -1)
            np.testing.assert_array_equal(made, expected)

    def test_a_result_that_nobody_can_read_is_a_failure(self):
        self.pyramid()
        self.assertEqual(self.started(["hash", "picture.pyr"], (1,)), 1)
        self.assertEqual(self.started(["info", "picture.pyr", "--json"], (0, 1, 2)), 1)


class ReadOnly(ToolTest):
    def modes(self, words, path):
        """The access modes of all descriptors of a file that the program was seen to have."""
        child = subprocess.Popen([TOOL, *words], cwd=self.folder, stdout=subprocess.DEVNULL,
                                 stderr=subprocess.DEVNULL)
        modes = set()
        while child.poll() is None:
            folder = f"/proc/{child.pid}/fd"
            try:
                for number in os.listdir(folder):
                    if os.readlink(f"{folder}/{number}") == path:
                        with open(f"/proc/{child.pid}/fdinfo/{number}") as info:
                            flags = int(info.read().split("flags:")[1].split()[0], 8)
                        # A number that was closed meanwhile may be that of another file already.
                        if os.readlink(f"{folder}/{number}") == path:
                            modes.add(flags & os.O_ACCMODE)
            except OSError:
                pass
        self.assertEqual(child.returncode, 0, words)
        self.assertTrue(modes, f"{words} was never seen to have {path} open")
        return modes

    def test_commands_that_read_open_for_reading_only(self):
        geotiff(self.path("large.tif"), samples("Byte", 2500, 2500, 3))
        self.good("build", "large.tif", "large.pyr")
        path = os.path.realpath(self.path("large.pyr"))
        for words in (["hash", "large.pyr"], ["verify", "large.pyr"],
                      ["compare", "large.pyr", "large.tif"], ["export", "large.pyr", "back.tif"],
                      ["build", "large.pyr", "other.pyr"]):
            self.assertEqual(self.modes(words, path), {os.O_RDONLY}, words)


class Endings(ToolTest):
    """A build that is ended anywhere leaves the old raster or the new one, each with its own
    georeference, no-data value and mask."""

    RENAME, REMOVE, OPEN, SYNC = 64, 128, 1, 16

    def raster(self, name, place, nodata, mask, referenced=True):
        geotiff(self.path(name), np.full((30, 40, 1), place, np.uint8), nodata=nodata)
        dataset = gdal.Open(self.path(name), gdal.GA_Update)
        if referenced:
            reference = osr.SpatialReference()
            reference.ImportFromEPSG(32631)
            dataset.SetSpatialRef(reference)
            dataset.SetGeoTransform([place, 1, 0, place, 0, -1])
        if mask is not None:
            dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
            dataset.GetRasterBand(1).GetMaskBand().WriteArray(np.full((30, 40), mask, np.uint8))
        dataset = None

    def state(self, name):
        """All that a reader sees of a raster, as one value."""
        if os.path.exists(self.path("seen.tif")):
            os.remove(self.path("seen.tif"))
        done = self.run_tool("export", name, "seen.tif", "--quiet")
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        seen = gdal.Open(self.path("seen.tif"))
        band = seen.GetRasterBand(1)
        return (int(band.ReadAsArray()[0, 0]), seen.GetGeoTransform(), band.GetNoDataValue(),
                band.GetMaskFlags(), band.GetMaskBand().ReadAsArray().tobytes())

    def kinds(self):
        preload = os.environ.get("ZMC_FILE_FAULTS_LIBRARY")
        if not preload:
            self.skipTest("nothing can be loaded ahead of the program here")
        return preload

    def ended(self, n, source):
        """Builds, and is killed before the n-th call on the folder; whether it was."""
        preload = self.kinds()
        calls = self.RENAME | self.REMOVE | self.OPEN | self.SYNC
        done = self.run_tool(
            "build", source, self.path("made.pyr"), "--overwrite", "--threads", "1", "--quiet",
            env={**os.environ, "LD_PRELOAD": preload,
                 "ZMC_FILE_FAULTS": f"{calls} {n} 0 3 0 {self.folder}"})
        self.assertIn(done.returncode, (0, -signal.SIGKILL), done)
        return done.returncode != 0

    def every_ending(self, old, new, step=1):
        """Before each call, or in the short form of the tests before each `step`-th."""
        if os.environ.get("ZMC_CAMPAIGN") == "full":
            step = 1
        self.raster("old.tif", *old)
        self.raster("new.tif", *new)
        states = []
        for source in ("old.tif", "new.tif"):
            self.good("build", source, "made.pyr", "--overwrite", "--quiet")
            states.append(self.state("made.pyr"))
        self.assertNotEqual(*states)
        seen = []
        n = 1
        self.good("build", "old.tif", "made.pyr", "--overwrite", "--quiet")
        clean = self.files()
        self.assertEqual(self.state("made.pyr"), states[0])
        while True:
            if not self.ended(n, "new.tif"):
                break
            state = self.state("made.pyr")
            self.assertIn(state, states, n)
            seen.append(states.index(state))
            self.good("build", "old.tif", "made.pyr", "--overwrite", "--quiet")
            self.assertEqual(self.files(), clean, n)
            n += step
        self.assertEqual(seen, sorted(seen), "once it is new it stays new")
        self.assertEqual(set(seen), {0, 1})
        self.assertGreater(n, 30)

    def test_with_other_sidecars(self):
        self.every_ending((10, 3, None), (20, 4, None), step=2)

    def test_with_a_mask_before_and_after(self):
        self.every_ending((10, None, 0), (20, None, 255), step=3)

    def test_without_a_sidecar_afterwards(self):
        self.every_ending((10, 3, 0), (20, None, None, False), step=3)
        # The last build came to its end.
        self.assertEqual([name for name in self.files() if name.startswith("made.")], ["made.pyr"])
