# SPDX-License-Identifier: MIT
"""Compiles the examples of the documents with warnings as errors: C as C99 and C++17, C++ as
C++17.

    python3 tools/docs/compile_examples.py

An example is a block marked c or cpp whose first line is a comment with its file name. Ends with
status 1 when one does not compile, or when a document has a block without a name.
"""

import argparse
import os
import re
import subprocess
import sys
import tempfile
from pathlib import Path

ROOT = Path(__file__).resolve().parents[2]
BLOCK = re.compile(r"^```(?:c|cpp)\n(.*?)^```$", re.MULTILINE | re.DOTALL)
NAME = re.compile(r"/\* (?P<c>[a-z0-9_]+\.c) \*/\n|// (?P<cpp>[a-z0-9_]+\.cpp)\n")
FLAGS = ["-Wall", "-Wextra", "-Wshadow", "-Wconversion", "-Werror", "-pedantic"]
LANGUAGES = [[os.environ.get("CC", "cc"), "-x", "c", "-std=c99"],
             [os.environ.get("CXX", "c++"), "-x", "c++", "-std=c++17"]]


def compiles(text, name, folder):
    source = Path(folder) / name
    source.write_text(text, encoding="utf-8")
    for compiler in LANGUAGES if name.endswith(".c") else LANGUAGES[1:]:
        command = [*compiler, *FLAGS, f"-I{ROOT / 'include'}", "-c", str(source), "-o", os.devnull]
        if subprocess.run(command, check=False).returncode != 0:
            return False
    return True


def main():
    argparse.ArgumentParser(description=__doc__.splitlines()[0]).parse_args()
    good = total = 0
    with tempfile.TemporaryDirectory() as folder:
        for document in sorted([*ROOT.glob("*.md"), *(ROOT / "docs").glob("*.md")]):
            for text in BLOCK.findall(document.read_text(encoding="utf-8")):
                total += 1
                name = NAME.match(text)
                if name is None:
                    print(f"{document.name}: an example without a file name", file=sys.stderr)
                elif compiles(text, name[name.lastgroup], folder):
                    good += 1
                    print(f"{document.name}: {name[name.lastgroup]} compiles")
                else:
                    print(f"{document.name}: {name[name.lastgroup]} does not compile",
                          file=sys.stderr)
    return 0 if good == total and total > 0 else 1


if __name__ == "__main__":
    sys.exit(main())
