#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Checks that the comments of the public headers keep their form.

The headers are the manual: what an argument must be stands in a line of its own that starts with
the argument's name. A formatter that joins lines destroys this without an error, so the form is
tested. The rules, for every function N3DS_API declares:

  - A comment stands directly above the function, or above a group of functions without blank lines
    between them.
  - A function with more than three parameters has an argument line for each of them: three spaces
    after the asterisk, the name or several names with commas, at least two spaces, text. It stands
    in the function's own comment or in the comment that opens its section. With up to three
    parameters, argument lines may be left out altogether, but not for some of the parameters only.
  - Argument lines follow a blank comment line. A gap of two blanks stands between an entry's name
    and its text only, so a line that has swallowed the next entry is found by its second gap.
  - No line is longer than 100 columns, the end of a comment that starts with text does not stand
    alone, and results are told by their names, not as bare numbers.
"""

import argparse
import re
import sys
from pathlib import Path

COLUMNS = 100
PROSE_PARAMETERS = 3  # a function with up to so many parameters may be described in a sentence
NAMES = r"[A-Za-z][A-Za-z0-9]*(?:, [A-Za-z][A-Za-z0-9]*)*"
ARGUMENT = re.compile(rf" \*   ({NAMES})  +\S")
ENTRY = re.compile(r" \*   \S.*?  +\S")
PROTOTYPE = re.compile(r"^N3DS_API\s+[^;#(]*?\b(\w+)\(([^)]*)\)[^;]*;", re.MULTILINE)
BARE_CODE = re.compile(r"[Rr]eturns? -?\d\b|(?<![\w.])-(?:100|201)\b|; -[12]\b")
SECTION = "/* -----"


def split_comment(text):
    return [" " + line.strip() if line.strip().startswith("*") else line.strip()
            for line in text.split("\n")]


def blocks(header):
    """Yields (line number, comment lines, prototypes below it) of every comment in the file."""
    for match in re.finditer(r"^/\*.*?\*/", header, re.MULTILINE | re.DOTALL):
        below = re.split(r"\n\s*\n|\n/\*", header[match.end():] + "\n\n", maxsplit=1)[0]
        line = header.count("\n", 0, match.start()) + 1
        yield line, split_comment(match.group()), PROTOTYPE.findall(below)


def parameter_names(parameters):
    if parameters.strip() in ("", "void"):
        return []
    return [re.search(r"(\w+)\s*$", parameter).group(1) for parameter in parameters.split(",")]


def argument_lines(comment):
    """Yields (index of the line, names it starts with)."""
    for index, line in enumerate(comment):
        match = ARGUMENT.match(line)
        if match:
            yield index, match.group(1).split(", ")


def check_argument_lines(comment, parameters):
    """Complaints about the shape of a comment's lines."""
    arguments = [index for index, names in argument_lines(comment) if set(names) & parameters]
    if arguments and (arguments[0] == 0 or comment[arguments[0] - 1] != " *"):
        yield f"no blank line before '{comment[arguments[0]].strip()}'"
    for line in comment:
        entry = ENTRY.match(line)
        text = line[entry.end() - 1:] if entry else line.lstrip(" *")
        if "  " in text:
            yield f"a gap in the middle of '{line.strip()}': two entries in a line?"


def check_header(header):
    """Yields the complaints about a header's text, as (line number, complaint)."""
    for number, line in enumerate(header.split("\n"), start=1):
        if len(line) > COLUMNS:
            yield number, f"longer than {COLUMNS} columns"
        in_comment = line.startswith(("/*", " *"))
        if in_comment and BARE_CODE.search(line):
            yield number, f"a result as a bare number: '{line.strip()}'"

    section = set()
    documented = set()
    for number, comment, prototypes in blocks(header):
        if comment[0].startswith(SECTION):
            section = {name for _, names in argument_lines(comment) for name in names}
        if comment[-1] == " */" and comment[0] != "/*":
            yield number, "the end of the comment stands alone"
        described = {name for _, names in argument_lines(comment) for name in names}
        everything = {name for _, parameters in prototypes for name in parameter_names(parameters)}
        for complaint in check_argument_lines(comment, everything):
            yield number, complaint
        for function, parameters in prototypes:
            documented.add(function)
            names = parameter_names(parameters)
            missing = [name for name in names if name not in described | section]
            prose = len(names) <= PROSE_PARAMETERS and not described & set(names)
            if missing and not prose:
                yield number, f"{function}: no line for {', '.join(missing)}"
    for function, _ in PROTOTYPE.findall(re.sub(r"/\*.*?\*/", "", header, flags=re.DOTALL)):
        if function not in documented:
            yield 0, f"{function}: no comment directly above it"


GOOD = """\
/* Does something.
 *
 *   engine  handle
 *   image   size of the image, in
 *           pixels
 *   a, b    numbers
 *
 * Returns N3DS_OK, or
 *   N3DS_FAILED  image is null */
N3DS_API MRESULT Something(void* engine, const NSVL_OFFSCREEN* image, int32_t a,
                           int32_t b);

/* Releases an engine. */
N3DS_API void Release(void* engine);
"""

# Each is GOOD damaged in one way: (replaced, by, words of the complaint).
DAMAGED = [
    (" *   image   size of the image, in\n *           pixels\n *   a, b    numbers\n",
     " *   image   size of the image, in\n * pixels a, b    numbers\n", "no line for a, b"),
    (" *   engine  handle\n *   image   size of the image, in\n",
     " *   engine  handle image   size of the image, in\n", "no line for image"),
    (" *   engine  handle\n *   image   size of the image, in\n",
     " *   engine  handle image   size of the image, in\n", "two entries in a line"),
    (" *\n *   engine  handle", " *   engine  handle", "no blank line before"),
    (" *   a, b    numbers\n", " *   a       a number\n", "no line for b"),
    ("Returns N3DS_OK, or", "Returns 0; -201 without memory, or", "bare number"),
    ("/* Releases an engine. */\n", "", "Release: no comment"),
    (" an engine. */", " an engine.\n */", "stands alone"),
    ("handle", "handle" + " of an engine" * 8, "longer than"),
]


def self_check():
    """The test can fail: it accepts a good sample and rejects every damaged one."""
    for complaint in check_header(GOOD):
        yield f"self-check: rejects a good header: {complaint[1]}"
    for before, after, words in DAMAGED:
        assert before in GOOD
        damaged = GOOD.replace(before, after, 1)
        if not any(words in complaint for _, complaint in check_header(damaged)):
            yield f"self-check: does not find '{words}'"


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("headers", nargs="+", type=Path, help="public header")
    arguments = parser.parse_args()

    failures = list(self_check())
    for path in arguments.headers:
        header = path.read_text(encoding="utf-8")
        if len(PROTOTYPE.findall(header)) < 5:
            failures.append(f"{path}: hardly any functions found")
        failures += [f"{path.name}:{line}: {text}" for line, text in check_header(header)]
    for failure in failures:
        print(failure, file=sys.stderr)
    return 1 if failures else 0


if __name__ == "__main__":
    sys.exit(main())
