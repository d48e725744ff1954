#!/usr/bin/env python3
"""Holds the layers: who may include whom, and where other people's headers may stand.

Run without arguments for the whole tree, or with the path of another tree (its own test does that).
"""
import pathlib
import re
import sys

# A folder may include itself and the folders listed here. The longest prefix of a file's path decides.
ALLOWED = {
    "base": [],
    "platform": ["base"],
    "platform/simulated": ["platform", "base"],
    "platform/linux": ["platform", "base"],
    "support": ["platform", "base"],
    "ipc": ["support", "platform", "base"],
    "media": ["ipc", "support", "platform", "base"],
    "session": ["media", "ipc", "support", "platform", "base"],
    "daemon": ["session", "media", "ipc", "support", "platform", "base"],
    "kit": ["ipc", "support", "platform/linux", "platform", "base"],
    "tools": ["kit", "ipc", "support", "platform/linux", "platform", "base"],
}
# The one file that knows on which platform the daemon runs.
ADAPTERS_ALLOWED_IN = {"daemon/main.cpp"}
ADAPTER_LAYERS = ("platform/linux", "platform/simulated")
THIRD_PARTY_ALLOWED = ("platform/linux", "kit", "tools")
# Headers of the C library and the kernel, besides the C++ standard library's (which have no suffix).
SYSTEM_HEADERS = re.compile(
    r"^(fcntl|unistd|pthread|poll|syslog|dlfcn)\.h$|^sys/(mman|stat|statvfs|file|random|inotify|eventfd|signalfd|"
    r"prctl|socket|un|uio|wait|types|resource|syscall)\.h$|^linux/[a-z]+\.h$"
)
INCLUDE = re.compile(r'^\s*#\s*include\s*(<([^>]+)>|"([^"]+)")')


def layer_of(path):
    """The layer that a path below src/ belongs to: the longest one whose folder it is in."""
    layers = [layer for layer in ALLOWED if path == layer or path.startswith(layer + "/")]
    return max(layers, key=len) if layers else None


def problem_with(file, included, is_quoted):
    """What is wrong with `file` (a path below src/) including `included`; None when nothing is."""
    layer = layer_of(file)
    target = layer_of(included)
    if not is_quoted or target is None:
        is_standard = "." not in included or SYSTEM_HEADERS.match(included)
        if is_standard or layer.startswith(THIRD_PARTY_ALLOWED):
            return None
        return "a third-party header does not belong here"
    if target in ADAPTER_LAYERS and file in ADAPTERS_ALLOWED_IN:
        return None
    if target == layer or target in ALLOWED[layer]:
        return None
    return f"{layer} may not include {target}"


def check(tree):
    problems = []
    source = pathlib.Path(tree) / "src"
    for path in sorted(source.rglob("*")):
        if path.suffix not in (".h", ".cpp"):
            continue
        file = path.relative_to(source).as_posix()
        if layer_of(file) is None:
            problems.append(f"src/{file}: is in no layer")
            continue
        for number, line in enumerate(path.read_text(encoding="utf-8").splitlines(), 1):
            match = INCLUDE.match(line)
            if not match:
                continue
            problem = problem_with(file, match[2] or match[3], match[3] is not None)
            if problem:
                problems.append(f"src/{file}:{number}: {line.strip()}: {problem}")
    return problems


if __name__ == "__main__":
    found = check(sys.argv[1] if len(sys.argv) > 1 else pathlib.Path(__file__).parents[2])
    print("\n".join(found) if found else "every include keeps the layers")
    sys.exit(1 if found else 0)
