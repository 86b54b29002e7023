#!/usr/bin/env bash
# calmorph report on a generated file: time against info, size against the CDF, and the time
# headless Chromium takes to the first item drawn. Usage: bench/report_bench.sh [BUILD_DIR]
# (default build/release; KEST_BENCH_ITEMS items, default 60000).
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:-build/release}
items=${KEST_BENCH_ITEMS:-60000}
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
"$build/bench/cdfgen" --items "$items" "$work/new.cdf" >/dev/null
"$build/bench/cdfgen" --items "$items" --seed 2 "$work/old.cdf" >/dev/null
cp schema/cdf.xsd "$work/" 2>/dev/null || true
seconds() { local s e; s=$(date +%s.%N); "$@" >/dev/null 2>&1; e=$(date +%s.%N); echo "$e - $s" | bc; }
best() { local b=999 t; for _ in 1 2 3; do t=$(seconds "$@"); b=$(echo "if ($t < $b) $t else $b" | bc); done; echo "$b"; }
info=$(best "$build/calmorph" info "$work/new.cdf")
info2=$(best "$build/calmorph" info "$work/old.cdf")
report=$(best "$build/calmorph" report "$work/new.cdf" -o "$work/r.html")
against=$(best "$build/calmorph" report "$work/new.cdf" --against "$work/old.cdf" -o "$work/d.html")
size() { stat -c %s "$1"; }
echo "items: $items"
echo "info: ${info}s (old file: ${info2}s)"
echo "report: ${report}s ($(echo "scale=2; $report / $info" | bc)x info)"
echo "report --against: ${against}s ($(echo "scale=2; $against / ($info + $info2)" | bc)x info of both)"
echo "size: CDF $(size "$work/new.cdf"), report $(size "$work/r.html") ($(echo "scale=2; $(size "$work/r.html") / $(size "$work/new.cdf")" | bc)x)"
echo "size --against: report $(size "$work/d.html") ($(echo "scale=2; $(size "$work/d.html") / ($(size "$work/new.cdf") + $(size "$work/old.cdf"))" | bc)x both CDFs)"
browser=$(command -v chromium || command -v chromium-browser || command -v google-chrome || true)
[ -n "$browser" ] || { echo "no Chromium: time to first item not measured"; exit 0; }
for page in r d; do
  s=$(date +%s.%N)
  drawn=$("$browser" --headless --no-sandbox --disable-gpu --disable-quic --no-first-run \
    --disable-background-networking --disable-component-update --disable-sync \
    --user-data-dir="$work/profile" --dump-dom "file://$work/$page.html" 2>/dev/null |
    grep -o 'data-drawn-ms="[0-9]*"' | head -1)
  e=$(date +%s.%N)
  echo "Chromium, $page.html: first item drawn at ${drawn#data-drawn-ms=} ms after navigation; whole run $(echo "$e - $s" | bc)s"
done
