"""Pyramids that the workers of a Dask cluster build together.

    from distributed import Client
    import zmcraster_dask
    summary = zmcraster_dask.build("scene.tif", "scene.pyr", Client("tcp://scheduler:8786"))

The file is laid out and finished here; each part is one task, which starts the command `zmcraster` on
its worker. So workers need that command, and all of them see source and target under the same names.
The file is byte for byte the one that `zmcraster build` makes. What fails leaves the plan, with all
that was done of it: build(..., resume=True) goes on from there.
"""
import json
import subprocess
import sys
import time
import uuid

import cloudpickle
import distributed

__all__ = ["BuildError", "build"]

_WAIT = 0.2  # seconds between two looks at a process
_END = 10  # seconds that processes have to end in

# Workers need not have this module: what they run is sent to them.
cloudpickle.register_pickle_by_value(sys.modules[__name__])


class BuildError(RuntimeError):
    """A command failed; its text is the command's own line."""


def _line(errors, tool):
    lines = [line for line in errors.splitlines() if ": warning: " not in line]
    return lines[-1].removeprefix("zmcraster: ") if lines else f"{tool} failed without a word"


def _run(tool, *words):
    """The document that a command prints."""
    try:
        done = subprocess.run([tool, *map(str, words), "--json"], capture_output=True, text=True,
                              stdin=subprocess.DEVNULL)
    except OSError as error:
        raise BuildError(f"{tool}: {error.strerror}") from None
    if done.returncode:
        raise BuildError(_line(done.stderr, tool))
    return json.loads(done.stdout) if done.stdout else {}


def _part(tool, plan, part, stop, count):
    """A task: one part, by one process, which is ended when `stop` is set. True if it did anything."""
    words = [tool, "part", plan, str(part), "--json", *(["--count"] if count else [])]
    stopped = distributed.Event(stop)
    if stopped.is_set():
        raise RuntimeError(f"{plan}: ended")
    process = subprocess.Popen(words, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                               stderr=subprocess.PIPE, text=True)
    while True:
        try:
            output, errors = process.communicate(timeout=_WAIT)
            break
        except subprocess.TimeoutExpired:
            if stopped.is_set():
                process.terminate()
    if process.returncode == 0:
        return bool(json.loads(output)["parts"])
    raise RuntimeError(_line(errors, tool) if process.returncode > 0 else
                       f"{plan}: part {part}: its process was ended by signal {-process.returncode}")


def _end(client, futures, stop):
    """Ends the processes of all tasks, while their workers are there to do so."""
    if client.status != "running":
        return
    stop.set()
    try:
        distributed.wait(futures, timeout=_END)
    except distributed.TimeoutError:
        pass
    client.cancel(futures)


def _make(client, tool, plan, parts, stop, count, retries, told):
    """Has all parts made; the first that fails for good ends them all."""
    futures = [client.submit(_part, tool, plan, part, stop.name, count, pure=False,
                             retries=retries, key=f"zmcraster-{stop.name}-{count}-{part}")
               for part in parts]
    try:
        done = 0
        for future in distributed.as_completed(futures):
            # So all tasks end when the scheduler does not answer any more.
            if future.status == "cancelled":
                raise BuildError(f"{plan}: the scheduler is gone; what is done can be gone on with")
            if future.status != "finished":
                error = future.exception()
                known = type(error) is RuntimeError
                raise BuildError(str(error) if known else f"{plan}: {error}")
            done += 1
            told(done, len(parts))
    except BaseException:
        _end(client, futures, stop)
        raise
    return [future.result() for future in futures]


def build(source, target, client, options=(), *, tool="zmcraster", retries=2, resume=False,
          progress=None):
    """Builds the pyramid `target` of `source` on the workers of `client`, and tells of it.

    `options` are those of `zmcraster plan`, as words. A part that fails is tried again `retries`
    times, on any worker. With `resume` a plan that is there is gone on with. `progress(step, done,
    all)` is called when a part is done; what it raises ends the build, as KeyboardInterrupt does.
    The answer is a dictionary: what `zmcraster finish --json` tells, with `parts`, `made` (now),
    `workers` and `seconds` of all. Raises BuildError.
    """
    start = time.monotonic()
    plan = f"{target}.zmcplan"
    if not resume:
        _run(tool, "plan", source, target, *options)
    status = _run(tool, "status", plan)
    everything = range(status["parts"])
    stop = distributed.Event(uuid.uuid4().hex, client=client)

    def told(step):
        return lambda done, count: progress and progress(step, done, count)

    _make(client, tool, plan, status["missing"], stop, False, retries, told("parts"))
    # Whether there is anything to count shows with the first.
    if any(_make(client, tool, plan, everything[:1], stop, True, retries, lambda *_: None)):
        _make(client, tool, plan, everything[1:], stop, True, retries, told("counts"))
    report = _run(tool, "finish", plan)
    return {**report, "parts": status["parts"], "made": len(status["missing"]),
            "workers": len(client.scheduler_info()["workers"]),
            "seconds": time.monotonic() - start}
