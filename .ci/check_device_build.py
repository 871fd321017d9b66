#!/usr/bin/env python3
"""Fails when a device's build files or docs/device.md say other than the code and the simulator."""

import os
import re
import sys

# The targets that a device builds, with CMake's file and name for each. Of the tests it takes a part.
TARGETS = {
    "libcorvex": ("CMakeLists.txt", "corvex"),
    "corvexd": ("CMakeLists.txt", "corvexd"),
    "corvexctl": ("client/CMakeLists.txt", "corvexctl"),
    "corvex_tests": ("tests/CMakeLists.txt", "corvex_tests"),
}
OF_SUPPORT = ("tests/CMakeLists.txt", "corvex_test_support")

# The modules whose code becomes the daemon.
MODULES = [
    "capture",
    "collect",
    "connectivity",
    "core",
    "early",
    "fs_mgr",
    "service",
    "storage",
    "thermal",
]

# A dotted name, but for those that end as a file's do. The code may name the beginning of some.
PROPERTY = r"[a-z]\w*(?:\.[\w-]+)+"
FILE_NAME = r".*\.(?:cpp|gz|h|log|md|rc|txt)"

USERS = {"0": "root", "1000": "system"}


def read(path):
    with open(path, encoding="utf-8") as file:
        return file.read()


def cmake_sources(path, target):
    text = re.search(r"add_(?:library|executable)\(%s\s([^)]*)\)" % target, read(path)).group(1)
    return {
        os.path.normpath(os.path.join(os.path.dirname(path), name))
        for name in re.findall(r"[\w./]+\.cpp", text)
    }


def soong_sources():
    """The sources of each module in Android.bp."""
    sources = {}
    for body in re.findall(r"^\w+ \{\n(.*?)^\}", read("Android.bp"), re.M | re.S):
        name = re.search(r'^ {4}name: "(\w+)"', body, re.M).group(1)
        listed = re.search(r"^ {4}srcs: \[(.*?)\]", body, re.M | re.S)
        if listed:
            sources[name] = set(re.findall(r'"([^"]+)"', listed.group(1)))
    return sources


def source_problems():
    soong = soong_sources()
    for name in sorted(set(soong) ^ set(TARGETS)):
        yield "Android.bp: %s is no target of both builds" % name
    for name in sorted(set(soong) & set(TARGETS)):
        cmake = cmake_sources(*TARGETS[name])
        if name == "corvex_tests":
            missing = soong[name] - cmake - cmake_sources(*OF_SUPPORT)
        else:
            missing = soong[name] ^ cmake
        for path in sorted(missing):
            yield "%s: is in %s of one build and not of the other" % (path, name)


def properties_in_code():
    names = set()
    for module in MODULES:
        for file in sorted(os.listdir(module)):
            code = re.sub(r"//.*", "", read(os.path.join(module, file)))
            names |= set(re.findall(r'"(%s\.?)"' % PROPERTY, code))
    return {name for name in names if not re.fullmatch(FILE_NAME, name)}


def properties_in_text():
    section = re.search(r"^## Properties$(.*?)^## ", read("docs/device.md"), re.M | re.S).group(1)
    names = re.findall(r"(?<![\w./-])%s" % PROPERTY, section)
    return {name for name in names if not re.fullmatch(FILE_NAME, name)}


def property_problems():
    code, text = properties_in_code(), properties_in_text()
    beginnings = {name for name in code if name.endswith(".")}
    for name in sorted(code - beginnings - text):
        yield "docs/device.md: lacks the property %s" % name
    for name in sorted(beginnings):
        if not any(other.startswith(name) for other in text):
            yield "docs/device.md: lacks a property that begins with %s" % name
    for name in sorted(text - code):
        if not name.startswith(tuple(beginnings)):
            yield "docs/device.md: the daemon knows no property %s" % name


def socket_problems():
    """The simulator's init makes the control socket as a device's does."""
    code = read("simulator/init/services.cpp")
    name, kind, mode = re.search(r'\{"(corvexd)", SOCK_(\w+), (\d+),', code).groups()
    owner = re.search(r"chown\(path\.c_str\(\), (\w+), (\w+)\)", code).groups()
    users = [
        USERS[re.sub(r"^kSystem$", re.search(r"kSystem = (\d+)", code).group(1), number)]
        for number in owner
    ]
    simulated = ["socket", name, kind.lower(), mode] + users
    on_device = re.search(r"^ +(socket .*)$", read("packaging/corvexd.rc"), re.M).group(1).split()
    if on_device != simulated:
        yield 'packaging/corvexd.rc: "%s", but the simulator has "%s"' % (
            " ".join(on_device),
            " ".join(simulated),
        )


def main():
    os.chdir(os.path.join(os.path.dirname(os.path.abspath(__file__)), ".."))
    problems = [*source_problems(), *property_problems(), *socket_problems()]
    for problem in problems:
        print(problem, file=sys.stderr)
    return 1 if problems else 0


if __name__ == "__main__":
    sys.exit(main())
