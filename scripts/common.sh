# shellcheck shell=bash
# Sourced by ./test, ./demo and ./release, which set `root` to the repository's folder first.

build="${root:?}/build"
mkdir -p "$build"

# A compiler cache when there is one. A precompiled header is compared by its sources, not by its time.
if command -v ccache >/dev/null; then
  export CMAKE_CXX_COMPILER_LAUNCHER=ccache CCACHE_SLOPPINESS=pch_defines,time_macros
fi

die() {
  echo "$*" >&2
  exit 1
}

# Only one run at a time in a build folder, because the Wine prefix and the ports are shared. A process
# that may outlive this script must not inherit the lock, so commands are started with `unlocked`.
take_lock() {
  exec {lock_fd}>"$build/.lock"
  if ! flock -n "$lock_fd"; then
    echo "waiting for another run in this folder to end ..."
    flock "$lock_fd"
  fi
}

unlocked() {
  "$@" {lock_fd}>&-
}

# logged LOG COMMAND...: writes the output to a file, and shows its end only if the command fails.
logged() {
  local log="$1"
  shift
  if ! unlocked "$@" >>"$log" 2>&1 </dev/null; then
    tail -n 120 "$log" >&2
    die "failed: $* (the full output is in ${log#"$root"/})"
  fi
}

# configure_preset LOG PRESET WITH_TESTS
configure_preset() {
  (
    cd "$root" || exit
    logged "$1" cmake --preset "$2" -DBUILD_TESTING="$3"
  )
}

# build_preset LOG PRESET WITH_TESTS [TARGET...]: builds all targets if none is named.
build_preset() {
  local log="$1" preset="$2" with_tests="$3"
  configure_preset "$log" "$preset" "$with_tests"
  shift 3
  (
    cd "$root" || exit
    logged "$log" cmake --build --preset "$preset" -j "$(nproc)" ${1:+--target "$@"}
  )
}
