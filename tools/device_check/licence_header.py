#!/usr/bin/env python3
# Copyright (C) 2026 The vyrservice Authors
# SPDX-License-Identifier: Apache-2.0

"""The licence header that every source file of the tree starts with.

  licence_header.py ROOT          lists the source files without it; exits 1 if there is any
  licence_header.py --fix ROOT    adds it to them

Source files: C and C++ (.h .c .cc .cpp), AIDL, Go, Python and shell (.py .sh), and every file
that starts with "#!" (the scripts). The header comes after the "#!" line of a script. The dumps
under aidl_api/ are left alone: they are the aidl tool's output, and a frozen version's hash
covers its files.
"""

import argparse
import os
import sys

HEADER = ["Copyright (C) 2026 The vyrservice Authors", "SPDX-License-Identifier: Apache-2.0"]
SLASH_SUFFIXES = (".h", ".c", ".cc", ".cpp", ".aidl", ".go")
HASH_SUFFIXES = (".py", ".sh")
# Folders of the root that hold no source of the tree: the build's output and the aidl dumps.
ROOT_SKIPPED = {"build", "aidl_api"}


def comment_prefix(path, text):
    """'//' or '#' for a source file, None for any other file."""
    if path.endswith(SLASH_SUFFIXES):
        return "//"
    if path.endswith(HASH_SUFFIXES) or text.startswith("#!"):
        return "#"
    return None


def header_lines(prefix):
    return [f"{prefix} {line}" for line in HEADER]


def has_header(text, prefix):
    lines = text.splitlines()
    if lines and lines[0].startswith("#!"):
        lines = lines[1:]
    return lines[:2] == header_lines(prefix)


def with_header(text, prefix):
    lines = text.splitlines(keepends=True)
    shebang = lines[:1] if lines and lines[0].startswith("#!") else []
    rest = lines[len(shebang):]
    header = [line + "\n" for line in header_lines(prefix)]
    # A blank line parts the header from the file's own opening comment or code.
    separator = ["\n"] if rest and rest[0].strip() else []
    return "".join(shebang + header + separator + rest)


def source_files(root):
    """(relative path, text, comment prefix) of every source file under root."""
    for directory, subdirs, files in os.walk(root):
        relative_dir = os.path.relpath(directory, root)
        subdirs[:] = sorted(d for d in subdirs
                            if d != ".git" and not (relative_dir == "." and d in ROOT_SKIPPED))
        for name in sorted(files):
            path = os.path.join(directory, name)
            if os.path.islink(path):
                continue
            try:
                with open(path, encoding="utf-8") as f:
                    text = f.read()
            except (UnicodeDecodeError, OSError):
                continue
            relative = os.path.relpath(path, root)
            prefix = comment_prefix(relative, text)
            if prefix:
                yield relative, text, prefix


def missing(root):
    return [relative for relative, text, prefix in source_files(root)
            if not has_header(text, prefix)]


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--fix", action="store_true")
    parser.add_argument("root")
    args = parser.parse_args()
    root = os.path.realpath(args.root)
    without = missing(root)
    if args.fix:
        for relative in without:
            path = os.path.join(root, relative)
            with open(path, encoding="utf-8") as f:
                text = f.read()
            with open(path, "w", encoding="utf-8") as f:
                f.write(with_header(text, comment_prefix(relative, text)))
            print(f"{relative}: header added")
        return 0
    for relative in without:
        print(f"{relative}: has no licence header")
    return 1 if without else 0


if __name__ == "__main__":
    sys.exit(main())
