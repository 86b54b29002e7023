#!/usr/bin/env bash
# Function-level profiles of the DOM load, the read and the write, for finding where the time
# goes. Uses perf with DWARF call graphs when the kernel allows it, otherwise callgrind (then on
# a smaller file, since it runs some fifty times slower).
#
#   bench/profile.sh [BUILD_DIR] [ITEMS]      defaults: build/release, 60000 (callgrind: 2000)
#
# Prints, per operation, the functions with the largest inclusive share of the samples taken
# inside the operation.
set -euo pipefail
cd "$(dirname "$0")/.."
build=${1:-build/release}
bin=$build/bench
[ -x "$bin/peakmem" ] || { echo "build $bin/peakmem first (bench/run.sh does)" >&2; exit 1; }

work=$(mktemp -d "${TMPDIR:-/tmp}/kest-profile-XXXXXX")
trap 'rm -rf "$work"' EXIT
cp schema/cdf.xsd "$work/"

use_perf=false
if command -v perf >/dev/null && perf record -o "$work/probe.data" -- true >/dev/null 2>&1; then
  use_perf=true
fi
items=${2:-$($use_perf && echo 60000 || echo 2000)}
"$bin/cdfgen" --items "$items" --no-schema "$work/plain.cdf" >/dev/null
"$bin/cdfgen" --items "$items" --schema "$work/validated.cdf" >/dev/null

# name | peakmem arguments | function whose subtree is the operation
runs=(
  "dom-load|dom-load $work/plain.cdf|kest::IXMLDOMDocument::load"
  "read|read $work/plain.cdf|kest::KestCalmorph::ConvertXMLtoCPP"
  "read-validated|read $work/validated.cdf|kest::KestCalmorph::ConvertXMLtoCPP"
  "write|write $work/validated.cdf $work/out.cdf|kest::KestCalmorph::ConvertCPPToXML"
)
for run in "${runs[@]}"; do
  IFS='|' read -r name args root <<<"$run"
  echo "== $name ($items items)"
  # shellcheck disable=SC2086
  if $use_perf; then
    if ! perf record -q -F 2000 --call-graph dwarf,16384 -o "$work/$name.data" -- \
      "$bin/peakmem" $args >"$work/$name.log" 2>&1; then
      echo "peakmem $args failed:"; cat "$work/$name.log"; continue
    fi
    # Inclusive shares within the operation: of the samples whose call chain passes through
    # the operation's function, the share in which each function appears.
    perf script -i "$work/$name.data" -F ip,sym 2>/dev/null |
      awk -v root="$root" '
        function flush(   s) {
          if (inside) { total++; for (s in seen) count[s]++ }
          delete seen; inside = 0
        }
        /^$/ { flush(); next }
        {
          sym = $0; sub(/^[ \t]*[0-9a-f]+ /, "", sym); sub(/ \(inlined\)$/, "", sym)
          gsub(/\(anonymous namespace\)/, "{anon}", sym); sub(/\(.*/, "", sym)
          seen[sym] = 1
          if (index(sym, root) == 1) inside = 1
        }
        END {
          flush()
          for (s in count) printf "%6.1f%%  %s\n", 100 * count[s] / total, substr(s, 1, 150)
        }' | sort -rn |
      grep -vE '  (main|_start|__libc_start_main_impl|__libc_start_call_main|\[unknown\])$' |
      awk 'NR <= 40'
  else
    if ! valgrind -q --tool=callgrind --callgrind-out-file="$work/$name.out" \
      --toggle-collect="${root}*" "$bin/peakmem" $args >"$work/$name.log" 2>&1; then
      echo "peakmem $args failed:"; cat "$work/$name.log"; continue
    fi
    callgrind_annotate --inclusive=yes "$work/$name.out" 2>/dev/null |
      grep -E '^ *[0-9,]+ +\(' | awk 'NR <= 40' | cut -c1-170
  fi
done
