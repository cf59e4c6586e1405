#!/usr/bin/env python3
"""Changes the interfaces in ways that break the layout, one after the other, and requires
check_layout.py to notice each. Its arguments are those of check_layout.py."""

import pathlib
import re
import shutil
import subprocess
import sys
import tempfile

HERE = pathlib.Path(__file__).resolve().parent
SOURCES = HERE.parents[1] / "src"

# What breaks: header, text there and in interfaces.cpp, its replacement.
FAULTS = {
    "overloads": ("support/IErrMgr.h", "GetThreadErrorTrace(long", "GetErrorTrace(long"),
    "overloads side by side": ("support/ILogger.h", "EnableLogPidThreadId(bool",
                               "EnableLogTimeStamp(int, bool"),
    "a destructor of two slots": ("media/ISampleProcessor.h",
                                  "ZOLT_INTERFACE_DESTRUCTOR(ISampleProcessor)",
                                  "virtual ~ISampleProcessor()"),
    "an empty base at the start": ("media/IMediaConfig.h", ": private zolt::EmptyInterface<IMediaConfig>",
                                   ""),
}
# Both compilers follow such a change of the headers, the built library does not.
FAULTS_OF_LIBRARY = {
    "two operations swapped": ("media/IEncSettings.h",
                               "    virtual int GetBitRateKbs() = 0;\n    virtual int SetBitRateKbs(int kbs) = 0;",
                               "    virtual int SetBitRateKbs(int kbs) = 0;\n    virtual int GetBitRateKbs() = 0;"),
    "one operation more": ("media/ISampleProducer.h", "    virtual int Connect(",
                           "    virtual void More() {}\n    virtual int Connect("),
}


def main():
    options = sys.argv[1:]
    faults = FAULTS | (FAULTS_OF_LIBRARY if "--dll" in options else {})
    unnoticed = 0
    for name, (file, text, replacement) in faults.items():
        with tempfile.TemporaryDirectory() as directory:
            sources = pathlib.Path(directory)
            for folder in ("media", "support"):
                shutil.copytree(SOURCES / folder, sources / folder)
            header = (sources / file).read_text()
            assert text in header, file
            (sources / file).write_text(header.replace(text, replacement))
            classes = sources / "interfaces.cpp"
            classes.write_text((HERE / classes.name).read_text().replace(text, replacement))
            check = subprocess.run([sys.executable, HERE / "check_layout.py", "--sources", sources,
                                    "--classes", classes, *options],
                                   stdout=subprocess.PIPE, text=True)
        print(f"--- {name}\n{check.stdout}", end="")
        if not re.search(r" [1-9]\d* differ$", check.stdout):
            print("not noticed")
            unnoticed += 1
    return 1 if unnoticed else 0


if __name__ == "__main__":
    sys.exit(main())
