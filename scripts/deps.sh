#!/usr/bin/env bash
# Installs the Debian packages a build needs when they are missing.
#   scripts/deps.sh            the Linux build and tests
#   scripts/deps.sh windows    also the mingw-w64 cross compiler and wine
#   scripts/deps.sh tools      also what the viewer tool and benchmarks need
set -euo pipefail

packages=(cmake ninja-build g++ binutils libgtest-dev libgmock-dev googletest
          nlohmann-json3-dev pkg-config)
for extra in "$@"; do
  case "$extra" in
    windows) packages+=(g++-mingw-w64-x86-64-posix wine64) ;;
    tools) packages+=(libbenchmark-dev libboost-dev) ;;
    clang) packages+=(clang libclang-rt-14-dev) ;;
    *) echo "deps.sh: unknown group '$extra'" >&2; exit 2 ;;
  esac
done

missing=()
for p in "${packages[@]}"; do
  if ! dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed"; then
    missing+=("$p")
  fi
done
[ ${#missing[@]} -eq 0 ] && exit 0

echo "deps.sh: installing ${missing[*]}"
sudo_cmd=()
if [ "$(id -u)" -ne 0 ]; then sudo_cmd=(sudo); fi
export DEBIAN_FRONTEND=noninteractive
"${sudo_cmd[@]}" apt-get update -qq
"${sudo_cmd[@]}" apt-get install -y -qq --no-install-recommends "${missing[@]}"
