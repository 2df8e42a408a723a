#!/bin/bash
# Makes the Wine prefix of the build folder (once), the serial ports in it, and build/bed/tcflush.so
# for the programs that open them.
#
# COM7 and COM10 to COM33 are links in the prefix's dosdevices folder; they point to build/ports/com7
# and so on. A simulated receiver on a port makes that path a link to its pseudo-terminal. Without it
# the port does not exist: opening it fails with ERROR_FILE_NOT_FOUND. (A port that is named in Wine's
# registry would open even without a receiver.)
set -euo pipefail

root="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
export WINEPREFIX="$root/build/wine" WINEDEBUG=-all
# Wine must not add menus to the user's home folder or offer to install browsers and runtimes.
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
  # The registry is written to disk only when the server has ended.
  wineserver -w
  echo "$made_for" >"$marker"
fi

mkdir -p "$root/build/ports"
for number in 7 {10..33}; do
  ln -sfn "$root/build/ports/com$number" "$WINEPREFIX/dosdevices/com$number"
done

mkdir -p "$root/build/bed"
cc -shared -fPIC -O2 -Wall -Wextra -o "$root/build/bed/tcflush.so" "$root/tests/bed/tcflush.c"
