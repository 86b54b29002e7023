#!/usr/bin/env bash
# Builds the library and runs the whole test suite. Usage: scripts/test.sh [dev|asan|tsan|release]
set -euo pipefail
cd "$(dirname "$0")/.."
preset=${1:-dev}
bash scripts/deps.sh
cmake --preset "$preset" >/dev/null
cmake --build --preset "$preset" -j "$(nproc)"
ctest --preset "$preset" -j "$(nproc)"
