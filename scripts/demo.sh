#!/usr/bin/env bash
# Builds calmorph and runs it on the sample file that ships with the repository.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/deps.sh
cmake --preset release -DKEST_BUILD_TESTS=OFF -DKEST_BUILD_FUZZ=OFF >/dev/null
cmake --build --preset release -j "$(nproc)" --target calmorph
tool=build/release/calmorph
out=$(mktemp -d)
trap 'rm -rf "$out"' EXIT
echo "== calmorph info examples/sample.cdf"
"$tool" info examples/sample.cdf
echo "== calmorph show examples/sample.cdf TorqueLimit"
"$tool" show examples/sample.cdf TorqueLimit
echo "== calmorph convert examples/sample.cdf -> $out/sample.cdf"
"$tool" convert examples/sample.cdf "$out/sample.cdf" --comment "converted by calmorph"
cp examples/cdf.xsd "$out/"
echo "== calmorph validate $out/sample.cdf"
"$tool" validate "$out/sample.cdf"
echo "== calmorph diff examples/sample.cdf $out/sample.cdf"
"$tool" diff examples/sample.cdf "$out/sample.cdf" && echo "(no differences)"
echo "== calmorph report examples/sample.cdf -o build/sample-report.html"
"$tool" report examples/sample.cdf -o build/sample-report.html
echo "open build/sample-report.html in a browser to see the items, curves and maps"
