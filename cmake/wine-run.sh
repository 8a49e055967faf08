#!/usr/bin/env bash
# Runs a Windows program under wine in the wine prefix PREFIX, creating the prefix
# on first use:  wine-run.sh PREFIX PROGRAM [ARGUMENTS...]
# Console output loses the carriage returns of the C runtime's text mode, so that
# tools reading it (GoogleTest's test discovery) see plain lines.
set -euo pipefail

if [ $# -lt 2 ]; then
    echo "usage: $0 PREFIX PROGRAM [ARGUMENTS...]" >&2
    exit 2
fi
prefix=$1
shift

if command -v wine >/dev/null 2>&1; then
    wine=$(command -v wine)
elif command -v wine64 >/dev/null 2>&1; then
    wine=$(command -v wine64)
elif [ -x /usr/lib/wine/wine64 ]; then
    wine=/usr/lib/wine/wine64
    export WINELOADER=$wine
else
    echo "$0: wine is not installed (scripts/deps.sh windows installs it)" >&2
    exit 127
fi

export WINEPREFIX=$prefix
export WINEDEBUG=-all
export WINEARCH=win64
# No desktop integration, and no offer to install the .NET and HTML engines.
export WINEDLLOVERRIDES="mscoree,mshtml=;winemenubuilder.exe=d"
unset DISPLAY WAYLAND_DISPLAY

# Tests run in parallel: one of them creates the prefix while the others wait.
ready=$prefix/.anno-ready
if [ ! -f "$ready" ]; then
    mkdir -p "$prefix"
    (
        flock 9
        if [ ! -f "$ready" ]; then
            "$wine" wineboot --init >/dev/null 2>&1
            touch "$ready"
        fi
    ) 9>"$prefix.lock"
fi

"$wine" "$@" | tr -d '\r'
