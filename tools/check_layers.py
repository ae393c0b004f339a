#!/usr/bin/env python3
"""Checks the library's folders against the order written in src/README.md.

The table under "## Layers" in src/README.md lists the folders of src/ from the top down, each
with its private headers. A file in a folder may include its own folder's headers and the
public headers of the folders below it; an include that goes up the order, names a private
header of another folder, or names a header that does not exist is reported, and so is any
circle of includes between files. Exits 1 on any finding, printing one line each.

Usage: tools/check_layers.py [REPOSITORY_ROOT]
"""
import os
import re
import sys

INCLUDE = re.compile(r'^\s*#\s*include\s+"([^"]+)"', re.M)
ROW = re.compile(r"^\|\s*`(\w+)/`\s*\|[^|]*\|([^|]*)\|\s*$")


def read_layers(readme):
    """Folders from the bottom up, and each folder's private headers, from the Layers table."""
    order, private, in_table = [], {}, False
    with open(readme, encoding="utf-8") as f:
        for line in f:
            if line.startswith("## "):
                in_table = line.strip() == "## Layers"
                continue
            match = ROW.match(line) if in_table else None
            if match:
                folder = match.group(1)
                order.append(folder)
                private[folder] = set(re.findall(r"`([\w.]+)`", match.group(2)))
    order.reverse()
    return order, private


def main():
    root = sys.argv[1] if len(sys.argv) > 1 else os.path.join(os.path.dirname(__file__), "..")
    src = os.path.join(root, "src")
    order, private = read_layers(os.path.join(src, "README.md"))
    if not order:
        print("src/README.md: no Layers table")
        return 1
    rank = {folder: i for i, folder in enumerate(order)}
    problems, graph = [], {}
    for folder in sorted(os.listdir(src)):
        path = os.path.join(src, folder)
        if not os.path.isdir(path):
            continue
        if folder not in rank:
            problems.append(f"src/{folder}/: a folder the Layers table does not place")
            continue
        for name in sorted(os.listdir(path)):
            if not name.endswith((".h", ".cpp", ".inc")):
                continue
            here = f"{folder}/{name}"
            with open(os.path.join(path, name), encoding="utf-8") as f:
                includes = INCLUDE.findall(f.read())
            graph[here] = [inc for inc in includes if "/" in inc]
            for inc in graph[here]:
                there, header = inc.split("/", 1)
                if there not in rank:
                    continue  # generated or external ("jni/version.h" is generated into jni/)
                if there == folder:
                    continue
                if rank[there] > rank[folder]:
                    problems.append(f"src/{here}: includes {inc}, which is above {folder}/")
                elif header in private[there]:
                    problems.append(f"src/{here}: includes {inc}, private to {there}/")
                elif not os.path.exists(os.path.join(src, inc)):
                    problems.append(f"src/{here}: includes {inc}, which does not exist")
    # Circles of includes between files (depth-first search, iterative).
    state = {}
    for start in sorted(graph):
        if state.get(start):
            continue
        stack = [(start, iter(graph[start]))]
        state[start], path = 1, [start]
        while stack:
            node, children = stack[-1]
            child = next(children, None)
            if child is None:
                state[node] = 2
                stack.pop()
                path.pop()
            elif child in graph and state.get(child) == 1:
                circle = path[path.index(child):] + [child]
                problems.append("include circle: " + " -> ".join(f"src/{p}" for p in circle))
            elif child in graph and not state.get(child):
                state[child] = 1
                path.append(child)
                stack.append((child, iter(graph[child])))
    for problem in problems:
        print(problem)
    print(f"{len(graph)} files in {len(rank)} layers: {len(problems)} problems")
    return 1 if problems else 0


if __name__ == "__main__":
    sys.exit(main())
