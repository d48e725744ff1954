#!/usr/bin/env python3
"""Holds the guide's first program and the example to each other, and both to under 30 lines."""
import re
import sys

guide, example = (open(path, encoding="utf-8").read() for path in sys.argv[1:3])
shown = re.search(r"```cpp\n(.*?)```", guide, re.DOTALL)
if not shown or shown[1] != example:
    sys.exit("the first program of the guide is not the example")
if len(example.splitlines()) >= 30:
    sys.exit("the first program of the guide is too long")
