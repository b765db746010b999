"""Reads stubs of system libraries (.tbd files, version 4): what a library exports on one target.

A stub is a sequence of documents in a small part of YAML. Each describes one library. The first one may re-export others
that follow.
"""

import functools
import re

# Matches "key: value" and "- key: value". A value in brackets may go over several lines.
ENTRY = re.compile(r"^( *)(- )?([\w-]+): *(\[[^\]]*\]|[^\n]*)", re.MULTILINE)
WORD = re.compile(r"'([^']*)'|\"([^\"]*)\"|([^\s,\[\]]+)")
# Matches "$ld$hide$os10.5$_name": an instruction to the linker for programs whose oldest system is 10.5.
RULE = re.compile(r"^\$ld\$(\w+)\$os(\d+)\.(\d+)\$(.+)$")


def words(value):
    return [first or second or third for first, second, third in WORD.findall(value)]


def documents(path):
    """Yields each document as a dictionary. The value of a key is a list of words or a list of dictionaries."""
    with open(path, encoding="utf-8") as file:
        parts = re.split(r"^---.*$", file.read(), flags=re.MULTILINE)[1:]
    for part in parts:
        document, section = {}, None
        for indent, dash, key, value in ENTRY.findall(part):
            if not indent and not dash:
                section = document[key] = words(value)
            elif dash:
                section.append({key: words(value)})
            else:
                section[-1][key] = words(value)
        yield document


@functools.cache
def exports(path, target, version):
    """Returns the names that the first library of the stub exports on the target, for example "x86_64-macos", for programs
    whose oldest system has the version, for example (11, 0). Contains the names of the libraries that it re-exports.
    """
    libraries = list(documents(path))
    if not libraries or any(document["tbd-version"] != ["4"] for document in libraries):
        raise ValueError(f"{path}: is no stub of version 4")
    named = {document["install-name"][0]: document for document in libraries}

    def items(document, *keys):
        return [item for key in keys for item in document.get(key, ()) if target in item["targets"]]

    result, visited = set(), set()
    left = [libraries[0]["install-name"][0]]
    if target not in libraries[0]["targets"]:
        raise ValueError(f"{path}: is not for {target}")
    while left:
        name = left.pop()
        if name in visited:
            continue
        visited.add(name)
        document = named[name]
        left += [library for item in items(document, "reexported-libraries") for library in item["libraries"]]
        names = {name for item in items(document, "exports", "reexports")
                 for key in ("symbols", "weak-symbols", "thread-local-symbols") for name in item.get(key, ())}
        result |= apply_rules(path, names, version)
    return result


def apply_rules(path, names, version):
    """Returns the names after the instructions to the linker among them."""
    rules = {name for name in names if name.startswith("$ld$")}
    result = names - rules
    for rule in rules:
        parts = RULE.match(rule)
        if parts is None or parts[1] not in ("hide", "add", "weak"):
            raise ValueError(f"{path}: has an unknown instruction to the linker: {rule}")
        if (int(parts[2]), int(parts[3])) != version:
            continue
        if parts[1] == "add":
            result.add(parts[4])
        else:
            # A name that is there on newer systems only would have to be imported weakly.
            result.discard(parts[4])
    return result
