"""A terminal screen that understands what Wine's console writes."""

import re

_TOKEN = re.compile(r"\x1b\[([0-9;?]*)([A-Za-z])|\x1b\][^\x07]*\x07|\x1b.|([\s\S])")
# An escape sequence that may continue in the next chunk.
_UNFINISHED = re.compile(r"\x1b(\[[0-9;?]*|\][^\x07]*)?$")


class Screen:
    """Keeps the lines, and in order each text that a line has shown."""

    def __init__(self, rows, columns):
        self._rows = rows
        self._columns = columns
        self._lines = [[] for _ in range(rows)]
        self._row = 0
        self._column = 0
        self._scrolled = []
        self._history = []
        self._rest = ""
        self._bytes = b""

    def feed(self, chunk):
        self._bytes += chunk
        text, self._bytes = _split_utf8(self._bytes)
        text = self._rest + text
        unfinished = _UNFINISHED.search(text)
        cut = unfinished.start() if unfinished else len(text)
        text, self._rest = text[:cut], text[cut:]
        for token in _TOKEN.finditer(text):
            parameters, command, character = token.groups()
            if command:
                self._escape(parameters, command)
            elif character:
                self._character(character)

    def text(self):
        lines = self._scrolled + [self._line(row) for row in range(self._rows)]
        return "\n".join(lines).rstrip("\n") + "\n"

    def history(self):
        return self._history + [self._line(self._row)]

    def has_shown(self, text):
        return text in self.text() or any(text in line for line in self._history)

    def _line(self, row):
        return "".join(self._lines[row]).rstrip()

    def _remember(self):
        line = self._line(self._row)
        if line and (not self._history or self._history[-1] != line):
            self._history.append(line)

    def _character(self, character):
        if character == "\r":
            self._remember()
            self._column = 0
        elif character == "\n":
            self._remember()
            self._next_row()
        elif character == "\b":
            self._column = max(0, self._column - 1)
        elif character >= " ":
            if self._column >= self._columns:
                self._column = 0
                self._next_row()
            line = self._lines[self._row]
            line.extend(" " * (self._column + 1 - len(line)))
            line[self._column] = character
            self._column += 1

    def _next_row(self):
        if self._row + 1 < self._rows:
            self._row += 1
            return
        self._scrolled.append(self._line(0))
        self._lines = self._lines[1:] + [[]]

    def _escape(self, parameters, command):
        numbers = [int(number) for number in re.findall(r"\d+", parameters)]
        count = numbers[0] if numbers else 0
        if command == "A":
            self._row = max(0, self._row - max(1, count))
        elif command == "B":
            self._row = min(self._rows - 1, self._row + max(1, count))
        elif command == "C":
            self._column = min(self._columns - 1, self._column + max(1, count))
        elif command == "D":
            self._column = max(0, self._column - max(1, count))
        elif command == "G":
            self._column = max(0, count - 1)
        elif command == "H":
            self._remember()
            self._row = min(self._rows, max(1, count)) - 1
            self._column = (numbers[1] if len(numbers) > 1 else 1) - 1
        elif command == "J" and count == 2:
            self._lines = [[] for _ in range(self._rows)]
        elif command == "K" and count == 0:
            del self._lines[self._row][self._column :]


def _split_utf8(data):
    """The complete text, and the bytes of an unfinished character."""
    for cut in range(len(data), max(-1, len(data) - 4), -1):
        try:
            return data[:cut].decode(), data[cut:]
        except UnicodeDecodeError:
            continue
    return data.decode(errors="replace"), b""
