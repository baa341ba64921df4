#!/bin/sh
# Times xxd and the library's Bin2Text on the same 16 MB of random bytes.
#   bench/run_bin2text_vs_xxd.sh [BUILD_DIR]     (default: build)
set -eu
build="$(cd "${1:-build}" && pwd)"
command -v xxd >/dev/null || { echo "xxd is missing (apt-get install xxd)" >&2; exit 1; }
work="$(mktemp -d)"
trap 'rm -rf "$work"' EXIT
head -c 16777216 /dev/urandom >"$work/input.bin"
xxd "$work/input.bin" >/dev/null # warm the page cache
# Best of three, like the benchmark.
best=""
for i in 1 2 3; do
    t=$(python3 -c 'import subprocess,sys,time; t=time.perf_counter(); subprocess.run(["xxd",sys.argv[1]],stdout=subprocess.DEVNULL,check=True); print(time.perf_counter()-t)' "$work/input.bin")
    best=$(python3 -c 'import sys; a=sys.argv[1]; b=float(sys.argv[2]); print(b if a=="" else min(float(a),b))' "$best" "$t")
done
echo "xxd: $best s for 16 MB"
OSTRAND_BENCH_BIN2TEXT_FILE="Z:$(echo "$work/input.bin" | tr / '\\')" OSTRAND_BENCH_XXD_SECONDS="$best" \
    "$build/wine-env.sh" run "$build/bin/ostrand-bench.exe" "logging: Bin2Text"
