#!/usr/bin/env bash
# Installs the Debian packages the build needs, when missing. Sourced by the other scripts.
set -euo pipefail
KEST_PACKAGES=(build-essential cmake ninja-build pkg-config libexpat1-dev libxml2-dev
               libxml2-utils libcurl4-openssl-dev libgtest-dev libgmock-dev libbenchmark-dev
               python3 locales nlohmann-json3-dev python3-jsonschema libcli11-dev zlib1g-dev
               chromium pybind11-dev python3-dev python3-numpy python3-pytest)
missing=()
for p in "${KEST_PACKAGES[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
  if [ "$(id -u)" -ne 0 ]; then
    echo "Missing Debian packages. Run as root:" >&2
    echo "  apt-get update && apt-get install -y ${missing[*]}" >&2
    exit 1
  fi
  echo "Installing: ${missing[*]}" >&2
  apt-get update -qq
  DEBIAN_FRONTEND=noninteractive apt-get install -y -qq "${missing[@]}" >/dev/null
fi
