#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Follows the links of the Markdown documents: files exist, headings they point at exist.

Links to the web are not followed. A code fence must stand alone in its line, or the block behind it
is shown as text.
"""

import argparse
import re
import sys
import urllib.parse
from pathlib import Path

CODE = re.compile(r"^ *(```|~~~).*?^ *\1", re.MULTILINE | re.DOTALL)
BROKEN_FENCE = re.compile(r"^.*(?:```\w*[ \t]+\S|\S[ \t]*```).*$", re.MULTILINE)
LINK = re.compile(r"!?\[(?:[^\[\]]|\[[^\]]*\]|!\[[^\]]*\]\([^)]*\))*\]\(([^()\s]+)\)")
PICTURE = re.compile(r"!\[[^\]]*\]\(([^()\s]+)\)")
HEADING = re.compile(r"^#{1,6}\s+(.*?)\s*#*$", re.MULTILINE)


def anchors(text):
    """The names under which a document's headings can be linked to."""
    names = set()
    counts = {}
    for heading in HEADING.findall(CODE.sub("", text)):
        heading = re.sub(r"\[([^\]]*)\]\([^)]*\)", r"\1", heading)
        name = re.sub(r"[^\w\- ]", "", heading.lower()).replace(" ", "-")
        number = counts.get(name, 0)
        counts[name] = number + 1
        names.add(name if number == 0 else f"{name}-{number}")
    return names


def check(document, text, read):
    """Yields the links of a document that lead nowhere. `read` gives a file's text, or None."""
    for line in BROKEN_FENCE.findall(text):
        yield f"{document}: {line.strip()}: a code fence that does not stand alone"
    text = CODE.sub("", text)
    for target in LINK.findall(text) + PICTURE.findall(text):
        if re.match(r"[a-z]+:", target):
            continue
        path, _, anchor = urllib.parse.unquote(target).partition("#")
        linked = document if path == "" else document.parent / path
        content = text if path == "" else read(linked)
        if content is None:
            yield f"{document}: {target}: no such file"
        elif anchor and linked.suffix == ".md" and anchor not in anchors(content):
            yield f"{document}: {target}: no such heading"


def read_text(path):
    if path.is_dir():
        return ""
    if not path.is_file():
        return None
    return path.read_text(encoding="utf-8") if path.suffix == ".md" else ""


def self_check():
    """The test can fail: every bad link of a sample is found, and no good one."""
    files = {"b.md": "# Two words\n## Twice\n## Twice\n", "c.png": ""}
    sample = ("# Own\n[a](#own) [b](b.md#two-words) [c](b.md#twice-1) [w](https://example.org/x)\n"
              "[![p](c.png)](b.md)\n```\n[code](nowhere.md)\n```\n")
    bad = ["[x](nowhere.md)", "[x](b.md#twice-2)", "[x](#two-words)", "![x](nowhere.png)",
           "[![x](nowhere.png)](b.md)", "[two\nlines](nowhere.md)", "```sh make\n```\n",
           "```\nmake ```\n"]
    if list(check(Path("a.md"), sample, lambda path: files.get(path.name))):
        yield "self-check: rejects good links"
    for link in bad:
        if not list(check(Path("a.md"), sample + link, lambda path: files.get(path.name))):
            yield f"self-check: does not find {link}"


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("root", type=Path, help="root of the source tree")
    root = parser.parse_args().root

    elsewhere = {"build", "out", ".git", "node_modules"}
    documents = [path for path in sorted(root.rglob("*.md"))
                 if not elsewhere & set(path.relative_to(root).parts)]
    failures = list(self_check())
    if len(documents) < 8:
        failures.append(f"{root}: hardly any documents found")
    for document in documents:
        failures += check(document, read_text(document), read_text)
    for failure in failures:
        print(failure, file=sys.stderr)
    return 1 if failures else 0


if __name__ == "__main__":
    sys.exit(main())
