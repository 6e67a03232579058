"""What the tests of builds in parts share: a source, what one process builds of it, and plans.

Of what has many variants a run takes a few, from day to day others; ZMC_CAMPAIGN_PHASE fixes which, and
ZMC_CAMPAIGN=full takes all of them, and more of what is left to chance."""
import os
import random
import time

from frame import ToolTest, geotiff, samples

PLAN = "made.pyr.zmcplan"
FULL = os.environ.get("ZMC_CAMPAIGN") == "full"
PHASE = int(os.environ.get("ZMC_CAMPAIGN_PHASE", time.time() // 86400))


def luck(what):
    """Numbers that look random, the same in all runs of a day."""
    return random.Random(f"{what} {PHASE}")


def drawn(variants, count):
    """So many of the variants, in their order."""
    variants = list(variants)
    if FULL:
        return variants
    chosen = luck(len(variants)).sample(range(len(variants)), min(count, len(variants)))
    return [variants[place] for place in sorted(chosen)]


class PartsTest(ToolTest):
    # By what it was made with: the bytes of a source, and what build makes of it.
    sources = {}
    built = {}

    def content(self, name):
        with open(self.path(name), "rb") as file:
            return file.read()

    def source(self, type_name="Single", height=700, width=1100, bands=1, **more):
        path, self.kind = self.path("source.tif"), repr((type_name, height, width, bands, more))
        if self.kind in self.sources:
            with open(path, "wb") as file:
                file.write(self.sources[self.kind])
            return
        geotiff(path, samples(type_name, height, width, bands), type_name, **more)
        self.sources[self.kind] = self.content("source.tif")

    def expected(self, *options):
        """What build makes of the source, with what stands beside it."""
        key = self.kind, options
        if key not in self.built:
            self.good("build", "source.tif", "built.pyr", "--overwrite", *options)
            self.built[key] = self.result("built.pyr")
            for name in ("built.pyr", "built.pyr.aux.xml"):
                if os.path.exists(self.path(name)):
                    os.remove(self.path(name))
        return self.built[key]

    def result(self, name="made.pyr"):
        beside = name + ".aux.xml"
        return (self.content(name),
                self.content(beside) if os.path.exists(self.path(beside)) else None)

    def plan(self, *options, size="512"):
        """Plans, and gives the number of parts."""
        return self.document("plan", "source.tif", "made.pyr", "--part-size", size,
                             *options)["parts"]

    def status(self):
        return self.document("status", PLAN)

    def hidden(self):
        return [name for name in self.files() if name.startswith(".")]

    def pyramid_path(self):
        """The file of the plan, as it grows."""
        [name] = [name for name in self.hidden() if name.endswith(".tmp")]
        return self.path(name)

    def records(self):
        """What is kept of the parts, by the names of the records."""
        folder = self.pyramid_path() + ".parts"
        kept = {}
        for name in os.listdir(folder):
            if not name.startswith("."):
                with open(os.path.join(folder, name), "rb") as file:
                    kept[name] = file.read()
        return kept

    def assertFinished(self, expected):
        made = self.result()
        self.assertTrue(made[0] == expected[0], "the bytes are others")
        self.assertEqual(made[1], expected[1])
        self.assertEqual(self.hidden(), [])
        self.assertNotIn(PLAN, self.files())
