"""Each file that is installed is in one Debian package, what the libraries export is what its symbols file tells, and
GDAL says one line of a plug-in that was made for another GDAL: packages.py PREFIX LIBDIR TREE"""
import fnmatch
import os
import pathlib
import re
import subprocess
import sys
import tempfile

prefix, libdir, tree = pathlib.Path(sys.argv[1]), sys.argv[2], pathlib.Path(sys.argv[3])
debian = tree / "debian"
faults = []

# Which package a file goes to. Files are where `usr/lib/*/` stands for the folder of libraries.
patterns = [(package.stem, line.split()[0].removeprefix("usr/").replace("lib/*/", libdir + "/"))
            for package in debian.glob("*.install") for line in package.read_text().splitlines()
            if line.startswith("usr/")]
# What tests of the prefix have put there.
theirs = re.compile(r"(image|one|made)\.[a-z.]+$|.*__pycache__/")
for path in sorted(each for each in prefix.rglob("*") if each.is_symlink() or each.is_file()):
    name = path.relative_to(prefix).as_posix()
    # A star of these patterns stays in its folder.
    homes = {package for package, pattern in patterns if name.startswith(pattern + "/") or
             fnmatch.fnmatchcase(name, pattern) and name.count("/") == pattern.count("/")}
    if len(homes) != 1 and not theirs.match(name):
        faults.append(f"{name} is in {', '.join(sorted(homes)) or 'no package'}")


def exported(library):
    lines = subprocess.run(["nm", "-D", "--defined-only", "-C", library], check=True, capture_output=True,
                           text=True).stdout.splitlines()
    return {line.split(" ", 2)[2] for line in lines if line.split(" ", 2)[1] != "A"}


told, current = {}, None
for line in (debian / "libzmcraster1.symbols").read_text().splitlines():
    if match := re.match(r"(\S+) libzmcraster1 ", line):
        current = told.setdefault(match[1], set())
    elif match := re.match(r' (?:\(c\+\+\))?"?(.+?)@Base"? \d', line):
        current.add(match[1])
if sorted(told) != ["libzmcfiles.so.1", "libzmcg.so.1", "libzmcloader.so.1"]:
    faults.append(f"the symbols file tells of {sorted(told)}")
for library, symbols in told.items():
    there = exported(prefix / libdir / library)
    faults += [f"{library} exports {name}, which the symbols file does not have" for name in sorted(there - symbols)]
    faults += [f"{library} does not export {name}" for name in sorted(symbols - there)]

# The same plug-in, as if it had been linked with a GDAL that is not there.
with tempfile.TemporaryDirectory() as folder:
    plugin = (prefix / libdir / "gdalplugins/gdal_ZMCPyramid.so").read_bytes()
    wanted = re.search(rb"libgdal\.so\.\d\d\0", plugin)[0]
    pathlib.Path(folder, "gdal_ZMCPyramid.so").write_bytes(plugin.replace(wanted, b"libgdal.so.00\0"))
    done = subprocess.run(["gdalinfo", "--formats"], capture_output=True, text=True,
                          env={**os.environ, "GDAL_DRIVER_PATH": folder, "LD_LIBRARY_PATH": str(prefix / libdir)})
    if done.returncode != 0 or "GTiff" not in done.stdout or "ZMCPyramid" in done.stdout:
        faults.append(f"GDAL does not go on without a plug-in for another GDAL: {done.stdout[-200:]}")
    # GDAL's own programs may say it once more, when they look for plug-ins again.
    if len(set(done.stderr.splitlines())) != 1 or "libgdal.so.00" not in done.stderr:
        faults.append(f"of a plug-in for another GDAL is said: {done.stderr!r}")

print("\n".join(faults) or f"{len(patterns)} patterns, {sum(map(len, told.values()))} symbols")
sys.exit(bool(faults))
