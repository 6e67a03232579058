"""What the package says of itself: examples, stubs, and the guide."""
import ast
import doctest
import importlib
import inspect
import os
import re
import shutil

import pytest

import zmcraster
from zmcraster import _zmcraster

ROOT = os.path.join(os.path.dirname(__file__), "..", "..")
MODULES = ("zmcraster", "zmcraster._building", "zmcraster._raster", "zmcraster.xarray_backend")


@pytest.fixture
def scene_here(folder, scene_file):
    for ending in ("", ".aux.xml"):
        shutil.copy(scene_file + ending, "scene.pyr" + ending)


@pytest.mark.parametrize("name", MODULES)
def test_examples_of_a_module(scene_here, name):
    result = doctest.testmod(importlib.import_module(name))
    assert result.attempted > 0 and result.failed == 0


@pytest.mark.parametrize("guide", ("docs/python.md",))
def test_examples_of_the_guide(scene_here, guide):
    with open(os.path.join(ROOT, guide), encoding="utf-8") as text:
        lines = ["" if line.startswith("```") else line.rstrip("\n") for line in text]
    test = doctest.DocTestParser().get_doctest("\n".join(lines) + "\n", {}, guide, guide, 0)
    assert len(test.examples) > 10
    failed, _ = doctest.DocTestRunner(optionflags=doctest.ELLIPSIS).run(test)
    assert failed == 0


def test_stubs_tell_what_the_extension_has():
    with open(os.path.join(os.path.dirname(_zmcraster.__file__), "_zmcraster.pyi"), encoding="utf-8") as text:
        stub = ast.parse(text.read())
    told = {}
    for node in stub.body:
        if isinstance(node, ast.ClassDef):
            told[node.name] = {each.name if isinstance(each, ast.FunctionDef) else each.target.id for each in node.body
                               if isinstance(each, (ast.FunctionDef, ast.AnnAssign))} - {"__init__"}
        elif isinstance(node, ast.FunctionDef):
            told[node.name] = [argument.arg for argument in node.args.args]
    for name, names in told.items():
        thing = getattr(_zmcraster, name)
        if isinstance(names, set):
            assert names == {each for each in vars(thing) if not each.startswith("_")}, name
        else:
            assert re.findall(r"(?:\(|, )(\w+): ", thing.__doc__.splitlines()[0]) == names, name
    public = {name for name in vars(_zmcraster) if not name.startswith("_")} - {"version"}
    assert public == set(told)


def test_the_package_is_typed():
    folder = os.path.dirname(zmcraster.__file__)
    assert os.path.exists(os.path.join(folder, "py.typed"))
    for name in zmcraster.__all__:
        thing = getattr(zmcraster, name)
        if inspect.isfunction(thing):
            parameters = inspect.signature(thing).parameters.values()
            assert all(each.annotation is not inspect.Parameter.empty for each in parameters), name
            assert thing.__doc__
