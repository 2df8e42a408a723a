#!/usr/bin/env python3
"""The host program in the README is the one that is compiled."""
import pathlib
import sys

root = pathlib.Path(__file__).resolve().parents[2]
example = (root / "examples" / "download.cpp").read_text()
if f"```cpp\n{example}```" not in (root / "README.md").read_text():
    sys.exit("README.md does not show examples/download.cpp as it is")
print("README.md shows examples/download.cpp")
