#!/usr/bin/env python3
"""Compares how two compilers lay out the host interfaces: clang for the Microsoft C++ ABI, which is
the host's, and MinGW's g++, which builds the library. With --dll, the tables in the library, too.

Fails when operations are not in the same slots, when there is one more or less, or when a base is
at another offset. What is compared are the classes of interfaces.cpp.
"""

import argparse
import pathlib
import re
import struct
import subprocess
import sys
import tempfile

HERE = pathlib.Path(__file__).resolve().parent

# A virtual destructor is one slot of the host's table, and an operation of this name here.
DESTRUCTOR = "DeletingDestructor"
CLASSES = ("Session", "Uncompressed", "StreamConfig", "FileSample", "MediaSample", "ErrMgr", "Logger",
           "ParallelTask", "ParallelRunner")
INTERFACES = ("ISampleConsumer", "ISampleProcessor", "IMediaEncoder", "IConfigVideo", "IConfigVideoAvc",
              "IConfigVideoUncompressed", "IVideoEncCapabilities", "IVideoEncSettings",
              "IVideoEncRunTimeControl", "MediaSample", "StreamConfig", "ErrMgr", "Logger")
# Classes of the library, and those of interfaces.cpp that have their tables.
LIBRARY_CLASSES = {"VideoH264ZoltEnc": "Session", "MediaSample": "MediaSample",
                   "MediaStreamConfig": "StreamConfig"}


def run(*command):
    return subprocess.run(command, check=True, stdout=subprocess.PIPE, text=True).stdout


class Layout:
    def __init__(self):
        self.tables = {}  # of a class, in the order of its bases: the operations' names
        self.bases = {}  # of a class: the offsets by the bases' names

    def set_bases(self, owner, bases):
        self.bases[owner] = {name: int(offset) for name, offset in bases
                             if "EmptyInterface" not in name}


def compile_options(sources, classes):
    return ["-std=c++17", "-Wall", "-Wextra", "-Wno-invalid-offsetof", f"-I{sources}", classes]


def host_layout(clang, target, *input_files):
    text = run(clang, f"--target={target}-pc-windows-msvc", "-ffreestanding", "-fno-rtti",
               "-Xclang", "-fno-access-control", "-Xclang", "-fdump-record-layouts",
               "-Xclang", "-fdump-vtable-layouts", *compile_options(*input_files),
               "-c", "-o", "/dev/null")
    layout = Layout()
    for owner, body in re.findall(r"^VFTable for (?:.*in )?'(\w+)' \(.*\n((?: .*\n)*)", text, re.M):
        names = re.findall(r"^ +\d+ \| .*?::(~?\w+)\(", body, re.M)
        layout.tables.setdefault(owner, []).append(
            [DESTRUCTOR if name.startswith("~") else name for name in names])
    for record in text.split("*** Dumping AST Record Layout\n")[1:]:
        lines = re.findall(r"^ *(\d+) \| +class ([\w:<>]+)(.*)$", record, re.M)
        layout.set_bases(lines[0][1], [(name, offset) for offset, name, rest in lines[1:]
                                       if "base" in rest])
    return layout


def library_layout(gxx, *input_files):
    with tempfile.TemporaryDirectory() as directory:
        dump = pathlib.Path(directory) / "classes"
        run(gxx, "-fno-access-control", f"-fdump-lang-class={dump}", *compile_options(*input_files),
            "-S", "-o", "/dev/null")
        text = dump.read_text()
    layout = Layout()
    for owner, body in re.findall(r"^Vtable for (\w+)\n.*\n((?:\d+ .*\n)*)", text, re.M):
        # Each table begins with the offset of its base and the type's information.
        tables = re.split(r".*& _ZTI.*\n", body)[1:]
        layout.tables[owner] = [[last_name(name) for name in re.findall(r"::(\S+)$", table, re.M)]
                                for table in tables]
    for owner, body in re.findall(r"^Class (\w+)\n   size.*\n   base size.*\n((?:.+\n)*)", text, re.M):
        lines = re.findall(r"^([\w:<>]+) \(\w+\) (\d+)", body, re.M)
        layout.set_bases(owner, lines[1:])
    return layout


def last_name(name):
    """The operation of a thunk, whose mangled name has each name after its length."""
    thunk = re.match(r"_ZThn\d+_N(.*)", name)
    rest = thunk.group(1) if thunk else ""
    while length := re.match(r"\d+", rest):
        end = length.end() + int(length.group())
        name, rest = rest[length.end():end], rest[end:]
    return name


class Library:
    """The built library: its symbols and what its sections hold."""

    def __init__(self, nm, path):
        self.image = pathlib.Path(path).read_bytes()
        pe = struct.unpack_from("<I", self.image, 0x3C)[0]
        sections, optional_size = struct.unpack_from("<H12xH", self.image, pe + 6)
        optional = pe + 24
        self.wide = struct.unpack_from("<H", self.image, optional)[0] == 0x20B
        self.base = struct.unpack_from("<Q" if self.wide else "<4xI", self.image, optional + 24)[0]
        self.sections = [struct.unpack_from("<4I", self.image, optional + optional_size + 40 * i + 8)
                         for i in range(sections)]
        self.addresses = {}
        self.names = {}
        for address, name in re.findall(r"^([0-9a-f]+) [tTrR] (.*)$", run(nm, "-C", path), re.M):
            self.addresses[name] = int(address, 16)
            self.names.setdefault(int(address, 16), []).append(name)

    def read(self, address, count):
        for _, start, size, offset in self.sections:
            if start <= address - self.base < start + size:
                begin = address - self.base - start + offset
                return self.image[begin:begin + count]
        return b""

    def word(self, address):
        return struct.unpack("<Q" if self.wide else "<I", self.read(address, 8 if self.wide else 4))[0]

    def tables(self, owner):
        """The tables of a class: for each slot its address and the names of what is there, several
        where the compiler has made one of functions that do the same."""
        tables = []
        step = 8 if self.wide else 4
        place = self.addresses[f"vtable for {owner}"]
        # Each table begins with the offset of its base and the type's information.
        while self.word(place + step) == self.addresses[f"typeinfo for {owner}"]:
            place += 2 * step
            tables.append([])
            while names := re.findall(rf"\b{owner}::(~?\w+)\(",
                                      "\n".join(self.names.get(self.word(place), []))):
                tables[-1].append((self.word(place), names))
                place += step
        return tables


class Comparison:
    def __init__(self):
        self.checked = 0
        self.faults = 0

    def expect(self, what, expected, found):
        self.checked += 1
        if expected != found:
            self.faults += 1
            print(f"{what}: the host expects {expected}, the library has {found}")

    def tables(self, what, expected, found, matches):
        self.expect(f"{what}, number of tables", len(expected), len(found))
        for number, (host, own) in enumerate(zip(expected, found)):
            # The first table goes on, for g++ alone, with the operations of the others.
            rest = own[len(host):]
            others = sorted(name for table in expected[1:] for name in table) if number == 0 else []
            self.expect(f"{what}, table {number}, slots", len(host) + len(others), len(own))
            # The order of overloads does not show, and is not the same.
            self.expect(f"{what}, table {number}, different names", len(host), len(set(host)))
            for slot, name in enumerate(host):
                entry = own[slot] if slot < len(own) else None
                good = entry is not None and matches(name, entry)
                self.expect(f"{what}, table {number}, slot {slot}", name, name if good else entry)
            for entry in rest:
                good = any(matches(name, entry) for name in others)
                self.expect(f"{what}, table {number}, behind the slots", True, good)


def main():
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("--clang", default="clang++")
    parser.add_argument("--gxx", required=True)
    parser.add_argument("--target", choices=("x86_64", "i686"), required=True)
    parser.add_argument("--sources", default=HERE.parents[1] / "src")
    parser.add_argument("--classes", default=HERE / "interfaces.cpp")
    parser.add_argument("--dll")
    parser.add_argument("--nm")
    arguments = parser.parse_args()

    host = host_layout(arguments.clang, arguments.target, arguments.sources, arguments.classes)
    own = library_layout(arguments.gxx, arguments.sources, arguments.classes)
    comparison = Comparison()
    for name in CLASSES:
        comparison.tables(name, host.tables[name], own.tables[name], lambda a, b: a == b)
    for name in INTERFACES:
        comparison.expect(f"{name}, offsets of bases", host.bases[name], own.bases[name])
    if arguments.dll:
        library = Library(arguments.nm, arguments.dll)
        for name, like in LIBRARY_CLASSES.items():
            comparison.tables(f"{name} in the library", host.tables[like], library.tables(name),
                              lambda operation, entry: operation in entry[1])
        if arguments.target == "i686":
            # An operation takes its argument off the stack, as the host's compiler has it: ret 4.
            table = library.tables("VideoH264ZoltEnc")[4]
            address = next(place for place, names in table if "SetKeyFrameIntMsecs" in names)
            comparison.expect("return of SetKeyFrameIntMsecs", b"\xc2\x04\x00",
                              library.read(address, 3))
    print(f"{arguments.target}: {comparison.checked} places compared, "
          f"{comparison.faults} differ")
    return 1 if comparison.faults else 0


if __name__ == "__main__":
    sys.exit(main())
