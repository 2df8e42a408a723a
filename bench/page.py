"""The text of docs/performance.md."""

import math
import textwrap

LIMIT = 11520  # bytes a second at 115200 bit/s, 10 bits a byte
# The share of the file in the bytes on the line: a block of 512 in 518, and a chunk of 1024 in a log of 1064.
LAYOUTS = {"quorin": 512 / 518, "velmar": 1024 / 1064}
NAMES = {"quorin": "Quorin", "velmar": "Velmar"}


def number(value):
    return f"{value:,.0f}"


def percent(share):
    return f"{100 * share:.1f} %"


def table(head, rows):
    lines = ["| " + " | ".join(head) + " |", "|---|" + "---:|" * (len(head) - 1)]
    return "\n".join([*lines, *("| " + " | ".join(map(str, row)) + " |" for row in rows)])


def wrapped(page):
    """The page with its paragraphs broken anew: figures have made their lines longer or shorter."""
    blocks = page.split("\n\n")
    return "\n\n".join(
        block if block.startswith(("|", "#", "- ", "`bench/run")) else
        textwrap.fill(block, 120, break_long_words=False, break_on_hyphens=False)
        for block in blocks
    ) + "\n"


def line_table(figures):
    delays = list(next(iter(figures["rates"].values())))
    rows = []
    for protocol, rates in figures["rates"].items():
        cells = [f"{number(rates[delay])} ({percent(rates[delay] / LIMIT)})" for delay in delays]
        rows.append([NAMES.get(protocol, protocol), *cells])
    return table(["Protocol", *(f"{delay} ms" for delay in delays)], rows)


def line_share(figures, protocol):
    """What of its layout's limit the protocol has without a delay."""
    rates = figures["line"]["rates"][protocol]
    return rates[next(iter(rates))] / LIMIT / LAYOUTS[protocol]


def get_table(figures):
    rows = []
    for row in figures["table"]:
        carried = max(row["to_host"], row["from_host"]) / LIMIT
        rest = row["used_s"] - row["silent_s"] - carried
        rows.append(
            [
                f"{NAMES[row['family']]}, {number(row['size']) if row['size'] else '`find`'}",
                f"{row['total_s']:.2f}",
                f"{carried:.2f}",
                f"{row['silent_s']:.2f} ({row['silences']})",
                f"{rest:.2f}",
                f"{row['total_s'] - row['used_s']:.2f}",
            ]
        )
    return table(
        ["Family, bytes", "Total, s", "The line carries, s", "Silences, s", "Other exchange, s", "Program, s"], rows
    )


def library_table(figures):
    fastest = figures["crc_eight_bytes_ns"]
    rows = [
        ["Checksum of a block, eight bytes a step", f"{fastest:.0f} ns", "1.0"],
        ["one byte a step", f"{figures['crc_byte_ns']:.0f} ns", f"{figures['crc_byte_ns'] / fastest:.1f}"],
        ["bit by bit", f"{figures['crc_bit_ns']:.0f} ns", f"{figures['crc_bit_ns'] / fastest:.1f}"],
    ]
    closed = figures["trace_closed_ns"]
    for name, key in (
        ("Line of the report, no report open", "trace_closed_ns"),
        ("the same, only formatted", "trace_formatted_ns"),
        ("the same, written to a report", "trace_open_ns"),
    ):
        rows.append([name, f"{figures[key]:.0f} ns", f"{figures[key] / closed:.1f}"])
    return table(["", "Time", "Ratio"], rows)


def registry_table(figures):
    rows = [
        [number(count), f"{figures[f'registry_handle_{count}_ns']:.0f} ns", f"{figures[f'registry_name_{count}_ns'] / 1000:.1f} us"]
        for count in (1, 100, 10_000)
    ]
    return table(["Receivers", "By handle", "By name (`OpenReceiver`)"], rows)


def memory_table(figures):
    rows = [
        ["allocations for each file of a directory", *(f"{figures[f'{f}_entry_allocations']:.2f}" for f in NAMES)],
        ["bytes of these, all together", *(figures[f"{f}_entry_bytes"] for f in NAMES)],
        ["allocations for each block or chunk", *(f"{figures[f'{f}_piece_allocations']:.2f}" for f in NAMES)],
        ["bytes that a found receiver holds", *(number(figures[f"{f}_receiver_bytes"]) for f in NAMES)],
        ["most bytes that a download holds in addition", *(number(figures[f"{f}_download_bytes"]) for f in NAMES)],
        ["pauses in a search at the right speed, ms", *(figures[f"{f}_search_pauses_ms"] for f in NAMES)],
        ["pauses in a file list, ms", *(figures[f"{f}_list_pauses_ms"] for f in NAMES)],
        ["pauses in a download that raises the speed, ms", *(figures[f"{f}_download_pauses_ms"] for f in NAMES)],
    ]
    return table(["", *NAMES.values()], rows)


def calls_table(figures):
    # A name that begins with a small letter is one of the C runtime.
    functions = sorted({name for family in figures.values() for name in family if name[0].isupper()})
    rows = [[f"`{name}`", *(f"{figures[f].get(name, 0):.2f}" for f in NAMES)] for name in functions]
    rows.append(["all", *(f"{sum(figures[f].get(name, 0) for name in functions):.2f}" for f in NAMES)])
    return table(["Function", *NAMES.values()], rows)


def percentile(values, share):
    """The least of the values that so many of them do not exceed."""
    return sorted(values)[max(0, math.ceil(share * len(values)) - 1)]


def aborts_table(figures):
    rows = []
    for row in figures["table"]:
        times = row["milliseconds"]
        cells = [f"{percentile(times, share):.1f} ms" for share in (0.5, 0.99)]
        rows.append([f"{NAMES[row['family']]}, {row['operation']}", len(times), *cells])
    return table(["Operation", "Aborts", "Median", "99th percentile"], rows)


def many_table(figures):
    mib = 1024 * 1024
    rows = []
    alone = figures["table"][0]["processor_s"] / figures["table"][0]["bytes"]
    for row in figures["table"]:
        rows.append(
            [
                row["receivers"],
                f"{row['seconds']:.2f} s",
                f"{row['processor_s'] / (row['bytes'] / mib):.2f} s",
                f"{row['processor_s'] / row['bytes'] / alone:.2f}",
                f"{(row['working_set_found'] - row['working_set_empty']) / 1024 / row['receivers']:,.0f} KiB",
            ]
        )
    return table(
        ["Receivers", "Elapsed", "Processor time for a MiB", "Ratio", "Working set for each"], rows
    )


def size_table(figures):
    total = figures["dll"]
    rows = [[name, number(size), percent(size / total)] for name, size in sorted(
        figures["parts"].items(), key=lambda part: -part[1])]
    rows.append(["all", number(total), percent(1)])
    return table(["`rcvlink.dll`", "Bytes", "Share"], rows)


def program_table(figures):
    rows = [[name, number(size)] for name, size in sorted(figures["program_parts"].items(), key=lambda part: -part[1])]
    rows.insert(1, ["of the C++ runtime: streams and locales", number(figures["program_streams"])])
    return table(["`rcvlink-cli.exe`", "Bytes"], rows)


def text(figures, processor):
    library, size = figures["library"], figures["size"]
    block_ms = 1000 * 518 / LIMIT
    cores = {1: "one core", 2: "two cores"}.get(processor["cores"], f"{processor['cores']} cores")
    speed = f" of {processor['ghz']} GHz" if processor["ghz"] else ""
    return wrapped(f"""# Performance

`bench/run` measured all of this and wrote this page; `bench/run PART` repeats one part. Nothing here is a test: no
run fails because it was slow.

- The machine has {cores}{speed}, and is not this program's alone. So absolute times are noisy, and ratios are
  what counts: the sides of a ratio were measured in turns or side by side in one run. Each figure is the median of
  all turns, unless it says something else.
- The library and its programs ran under Wine on Linux, not on Windows, and lrzsz as a program of Linux. So the
  time that a block of Quorin takes beyond the line's has Wine's in it, and lrzsz has no such part.
- The receivers are simulated. A real one takes time to read its storage, which none of these figures contain.

## Protocols on the same line

`bench/run line`

A file of {number(figures['line']['bytes'])} bytes over two pseudo-terminals and a relay (`bench/relay.cpp`) that
carries 115200 bit/s in each direction, 10 bits a byte, so at most {number(LIMIT)} bytes a second. What the host
sends arrives 0, 1, 5 or 16 ms late, as with a USB adapter that collects bytes. All protocols ran at the same time,
each on a line of its own. The figures are bytes of the file a second in the middle of the transfer (between 10 and
90 % of the bytes on the line), without what comes before and after it, and in brackets the share of the line's limit.
A transfer of lrzsz that failed was repeated once.

{line_table(figures['line'])}

Quorin sends a block of 512 bytes and waits for the answer, so a late answer costs it twice as much as XMODEM-1K and
YMODEM with blocks of 1024. The library asks for blocks of 512 bytes, the only ones that it takes. Of 518 bytes on the
line 512 are the file's, so {percent(LAYOUTS['quorin'])} is the most that it can have, and it has
{percent(line_share(figures, 'quorin'))} of that without a delay. ZMODEM and Velmar do not wait for answers. Of 1064 bytes of a
Velmar log 1024 are the file's, at most {percent(LAYOUTS['velmar'])}; it has {percent(line_share(figures, 'velmar'))} of that.

## Whole downloads

`bench/run get`

`rcvlink-cli find` and `rcvlink-cli get`, with `PORT NAME --speed 115200 --no-memory`, on that line without a delay. Each
was run three times, but the larger files once. A silence is a time of 0.4 s or more in which neither side sends, with their number
in brackets. "The line carries" is the time of the bytes alone, "program" what is before the first byte and after the last one: the start of
Wine's process and its end.

{get_table(figures['get'])}

Both families ask for a reply of unknown length by a read for a whole buffer, which the port ends 1 s after the last
byte: COM ports are opened with this interval (`src/transport/serial_connection.cpp`). So each reply of a Quorin
receiver costs 1 s: two of the search, one of the list, three before the first block. Velmar has half a second more after
each reply, since its receivers need a moment before they take the next command, and the silences of its search, which
asks for a Quorin receiver first. The end of a Velmar file waits in the same way, and counts as "program" here. The
blocks of Quorin have a known length, and no such wait; "other exchange" is what passes between them. Before a download,
`get` asks for the list of files. `find` also reads the identity, and the wait after its last reply counts as "program".
The smallest Velmar file here has 4 bytes: fewer do not arrive
([known behaviour](known-behaviour.md)).

## What the library costs

`bench/run library`

{library_table(library)}

A block that is whole costs the library {library['block_ns']:.0f} ns, with its checksum and without the Win32 calls.
The line carries it in {block_ms:.0f} ms. A line without a report makes {library['trace_closed_allocations']}
allocations.

{registry_table(library)}

Every call finds its receiver by its handle, in a hash table. Names are compared one by one by Windows' own function,
which knows that "com7" is COM7, so the time grows with their number; a host opens a receiver by name once.

{memory_table(library)}

The receivers are in memory, and allocations are those of C++'s `new`. The most bytes of a Quorin
download are those of a command before it: each has a buffer of 64 KiB for its reply. A Velmar command has 8 KiB more
on its stack. Of the bytes of a found receiver, 64 KiB are its port's, which keeps a buffer of its largest read: that of
the search for a Quorin receiver. An entry of a Velmar directory costs more than a Quorin one, since its fields are texts that are taken apart one by one.
The pauses are those that the library makes by its clock, without the ends of reads.

## Win32 calls for each 512 bytes

`bench/run calls`

Calls of `rcvlink.dll` to Windows' DLLs, except the C runtime, counted at its import table: what a download of 200 KiB has more than one of
100 KiB, for each 512 bytes. A function with less than 0.05 is left out. The port is a COM port of Wine, on which a write of one byte ends at once; one that does
not takes a `GetLastError`, a `WaitForMultipleObjects` and a `GetOverlappedResult` more.

{calls_table(figures['calls'])}

A block takes two reads and a write. Each needs its `ReadFile` or `WriteFile`, and each read that is not over at once
`GetLastError`, a wait and the result. That makes nine calls; with one read for a block it would be five. The second read
is that of the header, which says whether the rest is worth waiting for. Each transfer first clears its event
(`ResetEvent`). The time at which a block came is noted (`GetTickCount`), since over USB a receiver may not stay without one
for too long; so is the time at which a log of Velmar came. A block takes no allocation, and a
lock only when the percent changes. Velmar reads up to 8 KiB at once.

## From an abort to the return

`bench/run aborts`

The time from `Abort` on one thread to the return of the operation on another, at random moments of its first three
seconds. The receivers are at 115200 bit/s, so a download does not raise the speed, and their lines are paced. All six rows ran
at the same time. The goal is 50 ms for the median and 250 ms for the 99th percentile.

{aborts_table(figures['aborts'])}

An abort ends the wait of an operation. It does not end the half second of pause that follows each answer of a Velmar
receiver, so the 99th percentile of its operations lies above the goal. After an abort in the middle of a Velmar file the
receiver is told to stop, so that the next operation finds it silent: half a second for a late answer, a second until the
answer has ended, and the pause.

## Many receivers at once

`bench/run many`

Each receiver is a process with a pseudo-terminal of its own, and a thread of the host downloads {number(figures['many']['table'][0]['bytes'])}
bytes from it. The speed is raised for the transfer and set back, and the silences of these replies are in the elapsed
time; the lines are not paced. Processor time is that of the host's process alone,
without Wine's server and the receivers. The working set is what a search of all receivers added to it, for each
receiver; what is loaded once is in it, so it falls with their number. The ratio is that of the processor times of a
MiB, to one receiver's. The library's own share of a MiB is that of {1024 * 1024 // 512} blocks, {library['block_ns'] * 2048 / 1e6:.1f} ms;
the rest is that of Wine's functions.

All receivers are then downloaded from once more while four threads open and close them by name: the bytes are those of
the file, and each receiver has one user left, or the part fails.

{many_table(figures['many'])}

## Sizes

`bench/run size`

The bytes of the DLL, by the linker's map of a second link with the same objects. A layer's row is its code; its
constants, such as the texts of the report and the tables of checksums, are one row of all. Sections that nothing
uses are left out; identical functions are not folded, which GNU's linker cannot do for Windows.

{size_table(size)}

{program_table(size)}

The program has {number(size['program'])} bytes; the goal is a million. CLI11 reads and writes by streams, and they bring libstdc++'s
streams and locales into a program that is linked statically. The DLL has none of them. `rcvlink-sim` has
{number(size['simulator'])} bytes, with symbols.""")
