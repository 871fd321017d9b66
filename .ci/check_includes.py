#!/usr/bin/env python3
"""Fails when an include points the wrong way between the rooms, or round in a circle."""

import os
import re
import sys

# The rooms whose headers each room may include, besides its own. A new room gets a row.
ALLOWED = {
    "platform": [],
    "core": [],
    "fs_mgr": [],
    "storage": ["core"],
    "capture": ["core", "storage"],
    "early": ["core", "storage", "capture"],
    "collect": ["core", "storage", "capture"],
    "thermal": ["core", "storage", "capture"],
    "connectivity": ["core", "storage", "capture"],
    "client": [],
    "simulator": [],
}

# These look at whatever they try out.
OUTSIDE = ["tests", "fuzz", "bench", "faults"]

# What of core sits on top of the rooms: it may look into each of them, and none of them at it.
TOP = ["core/main", "core/startup", "core/control_socket", "core/commands"]


def room(path):
    return path.split("/")[0]


def is_top(path):
    return os.path.splitext(path)[0] in TOP


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


def wrong_way(path, target):
    """Why `path` may not include `target`, or None."""
    if not os.path.exists(target):
        return "is not named from the top of the tree"
    if room(path) in OUTSIDE or is_top(path):
        return None
    if is_top(target):
        return "sits above it"
    if room(target) != room(path) and room(target) not in ALLOWED[room(path)]:
        return "is in a room that %s/ may not include" % room(path)
    return None


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
    problems = [
        "%s: has no row in .ci/check_includes.py" % name
        for name in sorted({room(path) for path in includes} - set(ALLOWED) - set(OUTSIDE))
    ]
    if not problems:
        for path, targets in includes.items():
            for target in targets:
                reason = wrong_way(path, target)
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
