"""What the bytes of the DLL and of the program are, by the linker's map of a second link.

The second link is the build's own command with a map and another output, which keeps its symbols. The map gives the
place of each piece and its object file; for the project's own code, which is compiled many sources at a time, the
debug information gives the source of a piece's address.
"""

import collections
import os
import re
import shlex
import subprocess

SECTION = re.compile(r"^ (\.\S+)(?:\s+(0x[0-9a-f]+)\s+(0x[0-9a-f]+)\s+(\S.*))?$")
CONTINUED = re.compile(r"^\s+(0x[0-9a-f]+)\s+(0x[0-9a-f]+)\s+(\S.*)$")
CODE, UNWIND = (".text", ".rdata", ".data"), (".pdata", ".xdata")
OWN_CODE = "own code"
RUNTIME = ("libstdc++", "libsupc++", "libgcc")
CRT = ("libmingw", "libmsvcrt", "crt2", "dllcrt2", "crtbegin", "crtend", "libpthread", "libwinpthread")


def tool(name):
    return f"x86_64-w64-mingw32-{name}"


def link_again(build, target, output):
    """Links as the build does, with a map. Gives the lines of the map."""
    commands = subprocess.run(
        ["ninja", "-C", build, "-t", "commands", target], check=True, capture_output=True, text=True
    ).stdout.strip()
    command = commands.split("\n")[-1].split(" && ")[1]
    words = shlex.split(command)
    words[words.index("-o") + 1] = output
    words = [word for word in words if not word.startswith("-Wl,--out-implib")]
    subprocess.run([*words, f"-Wl,-Map={output}.map"], cwd=build, check=True)
    with open(f"{output}.map", encoding="utf-8", errors="replace") as file:
        return file.read().partition("Linker script and memory map")[2].split("\n")


def pieces(lines):
    """(section, address, size, object) of all that was linked."""
    waiting = None
    for line in lines:
        match = SECTION.match(line)
        if match and match[2] is None:
            waiting = match[1]
            continue
        if match:
            yield match[1], int(match[2], 16), int(match[3], 16), match[4]
        elif waiting and (rest := CONTINUED.match(line)):
            yield waiting, int(rest[1], 16), int(rest[2], 16), rest[3]
        waiting = None


def sources(image, addresses):
    """The source file of each address, "" when it is not known."""
    output = subprocess.run(
        [tool("addr2line"), "-e", image], input="\n".join(map(hex, addresses)), check=True, capture_output=True, text=True
    ).stdout.split("\n")
    return [os.path.normpath(line.rpartition(":")[0]) for line in output[: len(addresses)]]


def origin(path):
    name = os.path.basename(path)
    if "CMakeFiles" in path and "(" not in path:
        return OWN_CODE
    if any(word in name for word in RUNTIME):
        return "C++ runtime"
    if any(word in name for word in CRT):
        return "C runtime"
    return "of the imports"


def layer(source):
    """The folder of src/, for a function; inlined code of the C++ library counts as the library's."""
    match = re.search(r"(?:^|/)src/((?!CMakeFiles)\w+)/", source)
    return f"src/{match[1]}" if match else None


def sections(image):
    """Name and size in the file of each section, as objdump gives them."""
    output = subprocess.run([tool("objdump"), "-h", image], check=True, capture_output=True, text=True).stdout
    return {name: int(size, 16) for name, size in re.findall(r"^\s*\d+ (\S+)\s+([0-9a-f]{8})", output, re.M)}


def measure(root):
    build = os.path.join(root, "build", "release")
    dll = os.path.join(build, "bin", "rcvlink.dll")
    again = os.path.join(root, "build", "bench", "again.dll")
    linked = [piece for piece in pieces(link_again(build, "rcvlink", again)) if piece[2]]
    parts = collections.Counter()
    own = [piece for piece in linked if piece[0].startswith(CODE) and origin(piece[3]) == OWN_CODE]
    for (section, _, size, _), source in zip(own, sources(again, [piece[1] for piece in own])):
        parts[layer(source) or ("C++ templates" if section.startswith(".text") else "own constants")] += size
    for section, _, size, path in linked:
        if section.startswith(CODE) and origin(path) != OWN_CODE:
            parts[origin(path)] += size
    in_file = sections(dll)
    parts["unwind data"] = sum(in_file[name] for name in UNWIND)
    parts["exports and imports"] = in_file[".edata"] + in_file[".idata"]
    parts["relocations"] = in_file[".reloc"]
    parts["version resource"] = in_file[".rsrc"]
    total = os.path.getsize(dll)
    parts["headers, filling"] = total - sum(parts.values())

    program = os.path.join(build, "bin", "rcvlink-cli.exe")
    program_again = os.path.join(root, "build", "bench", "again.exe")
    origins = collections.Counter()
    streams = 0
    for section, _, size, path in pieces(link_again(build, "rcvlink-cli", program_again)):
        if not section.startswith((*CODE, *UNWIND)):
            continue
        where = "own code and CLI11" if "CMakeFiles" in path or "librcvlink_cli" in path else origin(path)
        origins[where] += size
        member = re.search(r"\((.*)\)", path)
        if where == "C++ runtime" and member and re.search(
            r"locale|ios|stream|codecvt|ctype|facet|numeric|time_mem|messages|monetary|inst\.o|cow-", member[1]
        ):
            streams += size
    return {
        "dll": total,
        "parts": dict(parts),
        "program": os.path.getsize(program),
        "program_parts": dict(origins),
        "program_streams": streams,
        "simulator": os.path.getsize(os.path.join(root, "build", "native", "bin", "rcvlink-sim")),
    }
