#!/usr/bin/env bash
# Makes the README's report screenshots from examples/sample.cdf: a map, and a diff against a
# copy with a changed curve and map. Usage: scripts/report_screenshots.sh [BUILD_DIR]
set -euo pipefail
cd "$(dirname "$0")/.."
calmorph=${1:-build/dev}/calmorph
browser=$(command -v chromium || command -v chromium-browser || command -v google-chrome)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
# The older data set: cold idle 50 rpm lower, two torque limits lower, a map of load and speed.
sed -e 's/>1200 980 850 780 760</>1150 980 850 780 760</' \
    -e 's/45.5 98 120.25 52 110.5 145/45.5 98 115 52 110.5 140/' examples/sample.cdf > "$work/old.cdf"
"$calmorph" report examples/sample.cdf -o "$work/map.html"
"$calmorph" report examples/sample.cdf --against "$work/old.cdf" -o "$work/diff.html"
shoot() {
  "$browser" --headless --no-sandbox --disable-gpu --disable-quic --no-first-run \
    --disable-background-networking --disable-component-update --disable-sync \
    --user-data-dir="$work/profile" --hide-scrollbars --window-size=1400,860 \
    --screenshot="$2" "file://$1" 2>/dev/null
}
shoot "$work/map.html#item=TorqueLimit" docs/images/report-map.png
shoot "$work/diff.html#item=IdleSpeedTarget" docs/images/report-diff.png
echo "wrote docs/images/report-map.png and docs/images/report-diff.png"
