# SPDX-License-Identifier: MIT
"""Who calls whom in the sources, by their text: definitions that begin a line, and the names in them."""
import glob
import os
import re
import sys

sys.path.insert(0, os.path.join(os.path.dirname(__file__), "../support/verdict"))
from verdict import ROOT, read  # noqa: E402

ENTRY = ("tool/arrayctl.cpp", "main")
NO_CODE = re.compile(r'//[^\n]*|"(?:[^"\\\n]|\\.)*"')
NAME = re.compile(r"[A-Za-z_]\w*")
# What a definition is called: a macro, a type, or the word in front of its arguments, size or value.
HEAD = re.compile(r"#define\s+(\w+)|(?:struct|enum(?: class)?)\s+(\w+)\s*(?::\s*\w+\s*)?\{|using\s+(\w+)"
                  r"|[\w:<>,&*\s\[\]]*?(?<![\w:])(\w+)(?:\[\w*\])*\s*(?:\(|=|\{|;)")


def files():
    patterns = ("tool/*.cpp", "lib*/lib/*/*.cpp", "lib*/lib/*/*.h", "lib*/include/*/*.h")
    return sorted(path for pattern in patterns for path in glob.glob(pattern, root_dir=ROOT))


def definitions(text):
    """Each definition of a file: a line that is not indented, up to the next one."""
    chunk = []
    for line in text.split("\n"):
        begins = re.match(r"[A-Za-z_#\[]", line) and not re.match(r"(namespace|template|public|private)\b", line)
        if begins and chunk:
            yield "\n".join(chunk)
            chunk = []
        chunk.append(line)
    yield "\n".join(chunk)


def name_of(chunk):
    head = HEAD.match(re.sub(r"\[\[\w+\]\]\s*", "", NO_CODE.sub("", chunk)).lstrip("} \n"))
    return next((name for name in head.groups() if name), None) if head else None


def graph():
    """(file, name) -> its texts. A header's names are its own too: owners release what they own."""
    found = {}
    for path in files():
        for chunk in definitions(read(path)):
            name = name_of(chunk)
            if name is not None and not chunk.startswith("#include"):
                found.setdefault((path, name), []).append(chunk)
    return found


def reached(found):
    """All that main comes to: a name of the same file first, then that of any other."""
    everywhere = {}
    for path, name in found:
        everywhere.setdefault(name, []).append((path, name))
    seen, ahead = set(), [ENTRY]
    while ahead:
        node = ahead.pop()
        if node in seen:
            continue
        seen.add(node)
        for word in NAME.findall(NO_CODE.sub("", "\n".join(found[node]))):
            here = (node[0], word)
            ahead += [here] if here in found and here != node else everywhere.get(word, [])
    return seen


def public_functions():
    """The names that a public header declares as functions."""
    for path in files():
        if "/include/" in path:
            text = NO_CODE.sub("", read(path))
            yield from re.findall(r"^[A-Za-z][\w:*&<> ]*?[ *](\w+)\([^;{]*\)(?: __attribute__\(.*?\))?;", text, re.M)


def uncalled():
    """Public functions that no command calls."""
    names = {name for path, name in reached(graph()) if path.endswith(".cpp")}
    return sorted(set(public_functions()) - names)


if __name__ == "__main__":
    print("\n".join(uncalled()))
