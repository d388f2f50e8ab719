#!/usr/bin/env bash
# Builds, then runs the whole test suite through CTest.
set -euo pipefail
ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
BUILD_DIR="${BUILD_DIR:-$ROOT/build}"
"$ROOT/scripts/build.sh"
ctest --test-dir "$BUILD_DIR" --output-on-failure --parallel "$(nproc)" "$@"
