#!/bin/bash
# Installs the Debian packages that are missing: `setup.sh demo`, `release`, `test`, `coverage` or `bench`.
set -euo pipefail

demo_packages=(
  cmake ninja-build
  g++ libc6-dev
  g++-mingw-w64-x86-64-posix mingw-w64-x86-64-dev
  llvm-14
  libcli11-dev nlohmann-json3-dev
  wine wine64
)
release_packages=("${demo_packages[@]}" doxygen python3)
test_packages=("${release_packages[@]}" googletest libgtest-dev libgmock-dev clang-14 clang-format-14 clang-tidy-14 lld lld-14 mono-mcs
  wine64-tools libwine-dev libclang-rt-14-dev)
coverage_packages=("${test_packages[@]}" gcovr)
bench_packages=("${demo_packages[@]}" lrzsz python3)

case "${1:-}" in
  demo) packages=("${demo_packages[@]}") ;;
  release) packages=("${release_packages[@]}") ;;
  test) packages=("${test_packages[@]}") ;;
  coverage) packages=("${coverage_packages[@]}") ;;
  bench) packages=("${bench_packages[@]}") ;;
  *)
    echo "usage: setup.sh demo|release|test|coverage|bench" >&2
    exit 2
    ;;
esac

is_installed() {
  [ "$(dpkg-query -W -f '${db:Status-Status}' "$1" 2>/dev/null)" = installed ]
}

missing=()
for package in "${packages[@]}"; do
  is_installed "$package" || missing+=("$package")
done
if [ ${#missing[@]} -eq 0 ]; then
  exit 0
fi

if [ "$(id -u)" -ne 0 ]; then
  echo "Packages are missing, and only root can install them. Run this as root:" >&2
  echo "  apt-get install --no-install-recommends ${missing[*]}" >&2
  exit 1
fi

echo "installing ${missing[*]}"
export DEBIAN_FRONTEND=noninteractive
apt-get -qq update
apt-get -qq -y --no-install-recommends install "${missing[@]}" </dev/null
