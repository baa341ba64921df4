#!/bin/sh
# usage: run-demo.sh BUILD_DIR [--tcp]
# Starts the simulated instrument (on COM5 of the build's Wine prefix, or with --tcp on a loopback
# port), runs ostrand-demo.exe against it under Wine and stops the instrument again. The Wine
# environment (prefix, wineserver) must be set up: `BUILD_DIR/wine-env.sh setup`.
set -eu
build="$1"
mode="${2:-}"
here="$(cd "$(dirname "$0")" && pwd)"
ready="$(mktemp)"
trap 'rm -f "$ready"' EXIT

if [ "$mode" = "--tcp" ]; then
    python3 "$here/instrument/instrument.py" --tcp 0 --timeout 20 >"$ready" 2>/dev/null &
else
    python3 "$here/instrument/instrument.py" --prefix "$build/wine/prefix" --port COM5 --timeout 20 \
        >"$ready" 2>/dev/null &
fi
instrument=$!
i=0
while ! grep -q READY "$ready" 2>/dev/null && [ $i -lt 100 ]; do sleep 0.1; i=$((i + 1)); done
where=$(sed -n 's/^READY //p' "$ready")

status=0
# Wine's own diagnostics go to stderr; keep them out of the transcript.
if [ "$mode" = "--tcp" ]; then
    "$build/wine-env.sh" run "$build/bin/ostrand-demo.exe" --tcp "$where" 2>/dev/null || status=$?
else
    "$build/wine-env.sh" run "$build/bin/ostrand-demo.exe" --port "$where" 2>/dev/null || status=$?
fi
kill "$instrument" 2>/dev/null || true
wait "$instrument" 2>/dev/null || true
exit $status
