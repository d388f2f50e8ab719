#!/usr/bin/env bash
# The main job: builds, then shows the control in a window when a display is
# available; otherwise runs it headless, pictures each of its ten tabs into
# build/screens/ and prints what it did.
set -euo pipefail
ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
BUILD_DIR="${BUILD_DIR:-$ROOT/build}"
"$ROOT/scripts/build.sh"

if [[ -n "${DISPLAY:-}${WAYLAND_DISPLAY:-}" ]]; then
  exec "$BUILD_DIR/app/tagora" "$@"
fi

mkdir -p "$BUILD_DIR/screens"
args=()
for tab in 0 1 2 3 4 5 6 7 8 9; do
  args+=(set MainTab "$tab" grab "$BUILD_DIR/screens/tab$tab.png")
done
"$BUILD_DIR/app/tagora-cli" "$@" "${args[@]}" get txtDBPath call GetOLEOption
echo "screens of the ten tabs: $BUILD_DIR/screens/"
