#!/usr/bin/env bash
# Times calmorph diff against info on two 60,000-parameter files, and check on 8 files with
# -j 2 against -j 1. Builds calmorph and cdfgen in the release preset. Keep it short: the
# median of KEST_BENCH_RUNS (default 3) runs each.
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
build=${KEST_BENCH_BUILD_DIR:-$root/build/release}
items=${KEST_BENCH_ITEMS:-60000}
runs=${KEST_BENCH_RUNS:-3}
cmake --preset release >/dev/null
cmake --build "$build" -j2 --target calmorph cdfgen >/dev/null
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cp "$root/schema/cdf.xsd" "$work/"
"$build/bench/cdfgen" --items "$items" "$work/a.cdf"
# b.cdf: the same data with one value in a hundred lines changed.
awk '/<VALUE/ && ++n % 100 == 0 { sub(/[0-9]<\/VALUE>/, "7</VALUE>") } { print }' "$work/a.cdf" >"$work/b.cdf"
median() {  # command... : prints the median wall time in seconds of $runs runs
  local times=()
  for _ in $(seq "$runs"); do
    local start end
    start=$(date +%s.%N)
    "$@" >/dev/null 2>&1 || true
    end=$(date +%s.%N)
    times+=("$(echo "$end - $start" | bc)")
  done
  printf '%s\n' "${times[@]}" | sort -n | sed -n "$(((runs + 1) / 2))p"
}
cm="$build/calmorph"
info=$(median sh -c "'$cm' info '$work/a.cdf' && '$cm' info '$work/b.cdf'")
diff=$(median "$cm" diff "$work/a.cdf" "$work/b.cdf")
echo "info on both: ${info}s  diff: ${diff}s  ratio: $(echo "scale=2; $diff / $info" | bc)"
files=()
for i in 1 2 3 4 5 6 7 8; do
  "$build/bench/cdfgen" --items $((items / 8)) --seed "$i" "$work/f$i.cdf"
  files+=("$work/f$i.cdf")
done
one=$(median "$cm" check -j 1 "${files[@]}")
two=$(median "$cm" check -j 2 "${files[@]}")
echo "check 8 files: -j 1 ${one}s  -j 2 ${two}s  speed-up: $(echo "scale=2; $one / $two" | bc)"
