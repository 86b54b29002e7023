#!/usr/bin/env python3
"""Fails when a source file includes a layer above its own, or reaches into a private detail/
folder it does not belong to. Layers, lowest first; each may use only those before it."""
import os
import re
import sys

LAYERS = ["platform", "text", "model", "core", "ops", "tools"]
RANK = {name: i for i, name in enumerate(LAYERS)}
RANK["python"] = RANK["tools"]
INCLUDE = re.compile(r'^\s*#\s*include\s*[<"]([^>"]+)[>"]', re.M)


def resolve(root, source, target):
    """The path of an included file relative to the root, or None for a system header."""
    for base in (os.path.dirname(source), root, os.path.join(root, "include")):
        path = os.path.normpath(os.path.join(base, target))
        if os.path.isfile(path):
            path = os.path.relpath(os.path.realpath(path), os.path.realpath(root))
            # The one header for hosts stands for the whole library.
            host = path == os.path.join("include", "kest", "calmorph.h")
            return "core/calmorph.h" if host else path
    return None


def problems(root):
    for layer in RANK:
        for folder, _, files in os.walk(os.path.join(root, layer)):
            for name in sorted(files):
                if not name.endswith((".h", ".hpp", ".cpp", ".cc")):
                    continue
                source = os.path.join(folder, name)
                own = os.path.relpath(source, root)
                with open(source, encoding="utf-8", errors="replace") as f:
                    text = f.read()
                for target in INCLUDE.findall(text):
                    path = resolve(root, source, target)
                    if path is None:
                        continue
                    parts = path.split(os.sep)
                    if parts[0] in RANK and RANK[parts[0]] > RANK[layer]:
                        yield f"{own}: includes {path}, a layer above {layer}/"
                    if "detail" in parts[:-1]:
                        home = os.sep.join(parts[: parts.index("detail")])
                        if not own.startswith(home + os.sep):
                            yield f"{own}: includes {path}, private to {home}/"
                        elif name.endswith(".h") and "detail" not in own.split(os.sep):
                            yield f"{own}: a public header includes {path}"


def main():
    root = sys.argv[1] if len(sys.argv) > 1 else os.path.dirname(os.path.dirname(__file__))
    found = list(problems(os.path.abspath(root)))
    for line in found:
        print(line)
    print(f"{len(found)} layering problem(s)")
    return 1 if found else 0


if __name__ == "__main__":
    sys.exit(main())
