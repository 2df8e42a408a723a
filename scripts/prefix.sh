#!/bin/bash
# Makes the build folder's own Wine prefix (once), the serial ports in it, and build/bed/tcflush.so
# for the programs that open them.
#
# The ports of tests/bed/ports.conf are links in the prefix's folder of devices: COM7 leads to
# build/ports/com7, and so on. A link there to a receiver's pseudo-terminal puts the receiver on the
# port. Without it, opening the port fails with ERROR_FILE_NOT_FOUND. (A port named in Wine's
# registry instead would open although nothing is there.)
set -euo pipefail

root="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
export WINEPREFIX="$root/build/wine" WINEDEBUG=-all
# No menus in the user's home folder, no offers to install browsers and runtimes.
export WINEDLLOVERRIDES="winemenubuilder.exe,mscoree,mshtml="
unset DISPLAY

marker="$WINEPREFIX/made-for-rcvlink"
made_for="$(wine --version) $WINEPREFIX"

if [ "$(cat "$marker" 2>/dev/null)" != "$made_for" ]; then
  rm -rf "$WINEPREFIX"
  mkdir -p "$WINEPREFIX"
  log="$root/build/wineboot.log"
  if ! wineboot -i >"$log" 2>&1 </dev/null; then
    cat "$log" >&2
    echo "Wine could not make its prefix $WINEPREFIX" >&2
    exit 1
  fi
  # The registry is on the disk only when the server is gone.
  wineserver -w
  echo "$made_for" >"$marker"
fi

mkdir -p "$root/build/ports"
# shellcheck source=tests/bed/ports.conf
. "$root/tests/bed/ports.conf"
for number in "$DEMO_PORT" $(seq "$FIRST_PORT" $((FIRST_PORT + PORT_SETS * PORTS_PER_SET - 1))); do
  ln -sfn "$root/build/ports/com$number" "$WINEPREFIX/dosdevices/com$number"
  # Left by a run that was killed: its pseudo-terminal may be another program's by now.
  rm -f "$root/build/ports/com$number"
done

mkdir -p "$root/build/bed"
cc -shared -fPIC -O2 -Wall -Wextra -o "$root/build/bed/tcflush.so" "$root/tests/bed/tcflush.c"
