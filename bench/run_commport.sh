#!/bin/sh
# Runs the serial-port benchmark: starts the serial peer echoing on a pseudo-terminal linked as COM6 of
# the build's Wine prefix, runs the "CCommPort" benchmarks of ostrand-bench against it, and stops the
# peer again.
#
#   bench/run_commport.sh [BUILD_DIR]      (default: build)
set -eu

here="$(cd "$(dirname "$0")" && pwd)"
build="$(cd "${1:-$here/../build}" && pwd)"
port=com6
prefix="$build/wine/prefix"
work="$(mktemp -d)"
peer=""

cleanup() {
    if [ -n "$peer" ]; then
        kill "$peer" 2>/dev/null || true
        wait "$peer" 2>/dev/null || true
    fi
    rm -rf "$work"
}
trap cleanup EXIT INT TERM

# The peer links into dosdevices, which must exist before the prefix is first used; Wine fills in the rest.
mkdir -p "$prefix/dosdevices"
python3 "$here/../tests/peers/serial_peer.py" --port "$port" --prefix "$prefix" --dir "$work" \
    --record /dev/null --timeout 900 -e echo >"$work/peer.out" 2>&1 &
peer=$!

i=0
until grep -q '^READY' "$work/status" 2>/dev/null; do
    i=$((i + 1))
    if [ $i -gt 100 ] || ! kill -0 "$peer" 2>/dev/null; then
        echo "the serial peer did not start:" >&2
        cat "$work/peer.out" "$work/peer.log" >&2 2>/dev/null
        exit 1
    fi
    sleep 0.1
done

# wine-env.sh keeps stderr apart: a port whose peer goes away makes wineserver talk a lot there.
OSTRAND_COMM_PORT=$(echo "$port" | tr a-z A-Z) "$build/wine-env.sh" run "$build/bin/ostrand-bench.exe" CCommPort \
    2>"$work/wine.err"
