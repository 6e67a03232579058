#!/usr/bin/env python3
"""Tells which lines of a target's sources its corpus does not reach: coverage.py LIST < LCOV.

LIST names one source a line. Indented lines below a source explain what cannot be reached there:
the start of the source line, two blanks, a dash, a blank, and the reason. The status is 1 if a line
is neither reached nor explained.
"""

import pathlib
import sys


def read_list(path):
    sources = {}
    for line in pathlib.Path(path).read_text().splitlines():
        if not line.strip() or line.startswith("#"):
            continue
        if line.startswith(" "):
            text, reason = line.strip().split("  - ")
            sources[source][text.strip()] = reason
        else:
            source = line.strip()
            sources[source] = {}
    return sources


def read_counts(lines, sources):
    counts = {source: {} for source in sources}
    current = None
    for line in lines:
        if line.startswith("SF:"):
            path = line[3:].strip()
            current = next((s for s in sources if path.endswith("/" + s)), None)
        elif line.startswith("DA:") and current:
            number, count = (int(part) for part in line[3:].split(",")[:2])
            counts[current][number] = max(count, counts[current].get(number, 0))
    return counts


def main():
    sources = read_list(sys.argv[1])
    failed = False
    for source, lines in read_counts(sys.stdin, sources).items():
        text = pathlib.Path(source).read_text().splitlines()
        # A lone bracket shares the fate of the line before it.
        missed = [number for number, count in sorted(lines.items())
                  if count == 0 and text[number - 1].strip(" });")]
        explained, open_lines = [], []
        for number in missed:
            here = text[number - 1].strip()
            reason = next((r for t, r in sources[source].items() if here.startswith(t)), None)
            (explained if reason else open_lines).append((number, here, reason))
        print(f"{source}: {len(lines) - len(missed)} of {len(lines)} lines reached, "
              f"{len(explained)} explained, {len(open_lines)} open")
        for number, here, reason in explained + open_lines:
            print(f"    {number:4} {here}" + (f"  - {reason}" if reason else ""))
        failed = failed or bool(open_lines) or not lines
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
