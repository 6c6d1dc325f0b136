#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Compiles each public header alone, in every language standard it promises, without a warning."""

import argparse
import subprocess
import sys
from pathlib import Path

FLAGS = ["-fsyntax-only", "-Wall", "-Wextra", "-Wpedantic", "-Wundef", "-Wconversion", "-Werror"]
STANDARDS = {"c": ["c99", "c11", "c17"], "c++": ["c++11", "c++14", "c++17", "c++20"]}
# A host that takes the linkage into its own hands, and one that does not.
DEFINITIONS = [[], ["-DN3DS_API="]]


def compiles(command, source, messages=None):
    return subprocess.run(command + ["-"], input=source, text=True, stderr=messages,
                          check=False).returncode == 0


def main():
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("--cc", required=True, help="C compiler")
    parser.add_argument("--cxx", required=True, help="C++ compiler")
    parser.add_argument("headers", nargs="+", type=Path, help="public header")
    arguments = parser.parse_args()

    compilers = {"c": arguments.cc, "c++": arguments.cxx}
    failed = 0
    for header in arguments.headers:
        for language, standards in STANDARDS.items():
            for standard in standards:
                for definitions in DEFINITIONS:
                    command = [compilers[language], "-x", language, f"-std={standard}", *FLAGS,
                               *definitions, f"-I{header.parent}"]
                    if not compiles(command, f'#include "{header.name}"\nint unused;\n'):
                        print(f"{header.name}: {standard} {' '.join(definitions)}", file=sys.stderr)
                        failed += 1
    # Warnings do end the compilation: this one must.
    unclean = [arguments.cc, "-x", "c", "-std=c99", *FLAGS]
    if compiles(unclean, "int f(void) { return 1.5; }\n", messages=subprocess.DEVNULL):
        print("the compiler accepts what it should warn about", file=sys.stderr)
        failed += 1
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
