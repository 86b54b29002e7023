#!/usr/bin/env bash
# Builds the benchmarks (release preset), generates the CDF files, runs the timing benchmarks
# and the peak-memory probe, and prints a summary of the ratios.
#
#   bench/run.sh                      60000 items, 3 iterations
#   KEST_BENCH_ITEMS=10000 KEST_BENCH_ITERS=5 bench/run.sh
#   KEST_BENCH_BUILD_DIR=build-x bench/run.sh   build elsewhere than build/release
#
# Extra arguments go to the benchmark program (e.g. --benchmark_filter=Read).
set -euo pipefail
cd "$(dirname "$0")/.."
root=$(pwd)

items=${KEST_BENCH_ITEMS:-60000}
iters=${KEST_BENCH_ITERS:-3}
export KEST_BENCH_ITEMS=$items KEST_BENCH_ITERS=$iters

if [ -n "${KEST_BENCH_BUILD_DIR:-}" ]; then
  build=$KEST_BENCH_BUILD_DIR
  cmake -S "$root" -B "$build" -G Ninja -DCMAKE_BUILD_TYPE=Release -DKEST_BUILD_BENCH=ON >/dev/null
  cmake --build "$build" -j "$(nproc)" --target cdfgen calmorph_bench peakmem
else
  build=build/release
  cmake --preset release >/dev/null
  cmake --build --preset release -j "$(nproc)" --target cdfgen calmorph_bench peakmem
fi
bin=$build/bench

work=$(mktemp -d "${TMPDIR:-/tmp}/kest-bench-run-XXXXXX")
trap 'rm -rf "$work"' EXIT

echo "== generating $items items"
"$bin/cdfgen" --items "$items" --no-schema "$work/plain.cdf"
"$bin/cdfgen" --items "$items" --schema "$work/validated.cdf"
cp schema/cdf.xsd "$work/cdf.xsd"

echo "== timing (each figure against a bare expat pass in the same iteration)"
KEST_BENCH_DIR=$work "$bin/calmorph_bench" "$@" | tee "$work/bench.txt"

echo
echo "== peak memory (one process per measurement)"
peak() {
  local label=$1 target=$2
  shift 2
  local line ratio verdict
  if ! line=$("$bin/peakmem" "$@" 2>&1); then
    printf "%-40s %s\n" "$label" "FAILED: $line"
    return
  fi
  ratio=$(sed -n 's/.* ratio=\([0-9.]*\).*/\1/p' <<<"$line")
  extra=$(sed -n 's/.* extra_kb=\([0-9-]*\).*/\1/p' <<<"$line")
  verdict="-"
  if [ "$target" != "-" ]; then
    verdict=$(awk -v r="$ratio" -v t="$target" 'BEGIN { print (r <= t) ? "met" : "MISSED" }')
  fi
  printf "%-40s %9.1f MiB %7s x file  target %-6s %s\n" "$label" \
    "$(awk -v k="$extra" 'BEGIN { print k / 1024 }')" "$ratio" "$target" "$verdict"
}
peak "DOM load (validate-on-parse off)" 3.0 dom-load "$work/plain.cdf"
peak "ConvertXMLtoCPP, no schema" 4.0 read "$work/plain.cdf"
peak "ConvertXMLtoCPP, validated" 4.0 read "$work/validated.cdf"
peak "ConvertCPPToXML (after the read)" - write "$work/validated.cdf" "$work/written.cdf"
echo "(peak resident size above the size just before the operation, divided by the file size:"
echo " $(stat -c %s "$work/plain.cdf") bytes)"
