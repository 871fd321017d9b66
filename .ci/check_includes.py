#!/usr/bin/env python3
"""Fails when an include points the wrong way between the modules, or round in a circle."""

import os
import re
import sys

# The picture of the modules: each line of it includes only headers of the lines below.
PICTURE = "docs/architecture.md"

# These share no code with the daemon.
APART = ["client", "platform", "simulator"]

# These look at whatever they try out.
OUTSIDE = ["tests", "tools"]


def read_levels():
    """The level of each module in the picture; 0 is the top."""
    with open(PICTURE, encoding="utf-8") as file:
        picture = re.search(r"^```text\n(.*?)^```", file.read(), re.M | re.S).group(1)
    lines = [re.match(r"(\w+/ +)+", line) for line in picture.splitlines()]
    rows = [re.findall(r"\w+", line.group()) for line in lines if line]
    return {name: level for level, row in enumerate(rows) for name in row}


def module(path):
    return path.split("/")[0]


def read_includes():
    """Every source and header of ours, with the quoted includes of each."""
    includes = {}
    for name in sorted(os.listdir(".")):
        if name.startswith((".", "build")):
            continue
        for directory, _, files in os.walk(name):
            for file in files:
                if file.endswith((".h", ".cpp")):
                    path = os.path.join(directory, file)
                    with open(path, encoding="utf-8") as source:
                        text = source.read()
                    includes[path] = re.findall(r'^\s*#\s*include\s*"([^"]+)"', text, re.M)
    return includes


def wrong_way(path, target, levels):
    """Why `path` may not include `target`, or None."""
    if not os.path.exists(target):
        return "is not named from the top of the tree"
    above, below = module(path), module(target)
    if above in OUTSIDE or above == below:
        return None
    if above in levels and below in levels and levels[above] < levels[below]:
        return None
    return "is in a module that %s/ may not include" % above


def find_cycle(includes):
    """The files of one circle of includes, or an empty list."""
    done = set()

    def walk(path, trail):
        if path in trail:
            return trail[trail.index(path) :] + [path]
        if path in done:
            return []
        for target in includes.get(path, []):
            cycle = walk(target, trail + [path])
            if cycle:
                return cycle
        done.add(path)
        return []

    for path in includes:
        cycle = walk(path, [])
        if cycle:
            return cycle
    return []


def main():
    os.chdir(os.path.join(os.path.dirname(os.path.abspath(__file__)), ".."))
    includes = read_includes()
    levels = read_levels()
    problems = [
        "%s/: stands neither in the picture in %s nor in .ci/check_includes.py" % (name, PICTURE)
        for name in sorted({module(path) for path in includes} - {*levels, *APART, *OUTSIDE})
    ]
    for path, targets in includes.items():
        for target in targets:
            reason = wrong_way(path, target, levels)
            if reason:
                problems.append('%s: "%s" %s' % (path, target, reason))
    cycle = find_cycle(includes)
    if cycle:
        problems.append("includes go in a circle: " + " -> ".join(cycle))
    for problem in problems:
        print(problem, file=sys.stderr)
    return 1 if problems else 0


if __name__ == "__main__":
    sys.exit(main())
