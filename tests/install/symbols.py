#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Compares what the library exports with the kept list and with the public headers.

symbols.py LIBRARY LIST INCLUDE_FOLDER       prints each difference; exit code 1 if there is one
symbols.py LIBRARY LIST INCLUDE_FOLDER --write    makes the list anew, for a change on purpose"""

import pathlib
import re
import subprocess
import sys

OURS = ("tessel::authentication::", "SystemConfiguration::")
PREFIXES = re.compile(
    r"^(typeinfo for |typeinfo name for |vtable for |VTT for |(non-)?virtual thunk to )"
)


def exported(library):
    """The demangled names, each once: a constructor has several symbols of one name."""
    output = subprocess.run(
        ["nm", "--dynamic", "--defined-only", "--demangle", library],
        check=True, capture_output=True, text=True,
    ).stdout
    names = {line.split(" ", 2)[2] for line in output.splitlines()}
    # The node itself is listed as a symbol.
    return sorted(name for name in names if "@@" in name)


def declared(include):
    """What the public headers say once macros are expanded, without what they include."""
    output = subprocess.run(
        ["g++", "-std=c++17", "-E", "-x", "c++", "-I", include, "-"],
        input="#include <tslauth/tslauth.h>\n", check=True, capture_output=True, text=True,
    ).stdout
    text = []
    ours = False
    for line in output.splitlines():
        if line.startswith("# "):
            ours = "/tslauth/" in line
        elif ours:
            text.append(line)
    return "\n".join(text)


def qualified(symbol):
    """The name with its namespaces: without what it is a table of, and without the return type,
    which comes with the instances of function templates."""
    name = PREFIXES.sub("", symbol.split("@@")[0])
    return re.sub(r"^[\w:]+<\S+> (?=[\w:]+<)", "", name)


def without_templates(name):
    while "<" in re.sub(r"operator<<?=?", "", name):
        shorter = re.sub(r"(?<!operator)(?<!operator<)<[^<>]*>", "", name)
        if shorter == name:
            break
        name = shorter
    return name


def parts(symbol):
    """The enclosing class, if any, and the member's or function's own name."""
    name = re.sub(r"\[abi:cxx11\]", "", qualified(symbol))
    conversion = re.search(r"::operator (?![^(]*\()", name) or re.search(r"::operator [a-z]", name)
    if conversion:
        return name[: conversion.start()].split("::")[-1], "operator"
    name = without_templates(name.split("(")[0])
    words = name.split("::")
    return words[-2], words[-1]


def main():
    library, kept, include = sys.argv[1:4]
    symbols = exported(library)
    if "--write" in sys.argv:
        pathlib.Path(kept).write_text("".join(f"{symbol}\n" for symbol in symbols))
        return 0
    differences = []
    expected = pathlib.Path(kept).read_text().splitlines()
    differences += [f"no longer exported: {name}" for name in expected if name not in symbols]
    differences += [f"not in the kept list: {name}" for name in symbols if name not in expected]

    headers = declared(include)
    for symbol in symbols:
        if not qualified(symbol).startswith(OURS):
            differences.append(f"in a foreign namespace: {symbol}")
            continue
        scope, name = parts(symbol)
        for word in (scope, name.removeprefix("~")):
            pattern = re.escape(word) if word.startswith("operator") else rf"\b{re.escape(word)}\b"
            if not re.search(pattern, headers):
                differences.append(f"no public header declares {word}: {symbol}")
    classes = re.findall(
        r'\b(?:class|struct) __attribute__\(\(visibility\("default"\)\)\) (\w+)(?=[^;{]*\{)',
        headers
    )
    if len(classes) < 64:
        differences.append(f"only {len(classes)} exported classes found in the headers")
    for name in classes:
        if not any(re.search(rf"::{name}\b", symbol) for symbol in symbols):
            differences.append(f"nothing is exported of the class {name}")
    print("\n".join(differences) or f"{len(symbols)} symbols, {len(classes)} classes")
    return 1 if differences else 0


sys.exit(main())
