#!/usr/bin/env bash
# The main job: builds, makes the demo company (an ERP database registered as
# the ODBC data source "TagoraDemo", with the control's settings pointing at it
# and at a data folder beside it), then shows the control in a window when a
# display is available. Without one it runs the control headless: imports the
# demo company's items with a price list, part numbers, special prices and all
# price lists, marks them all in the item selection, prints them as direct
# labels (the page's path is printed), saves a picture of each tab to
# build/screens/ and says what it did.
set -euo pipefail
ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
BUILD_DIR="${BUILD_DIR:-$ROOT/build}"
DEMO_DIR="${TAGORA_DEMO_DIR:-$BUILD_DIR/demo}"
SETTINGS="$DEMO_DIR/tagora.ini"
"$ROOT/scripts/build.sh"

mkdir -p "$DEMO_DIR"
"$BUILD_DIR/app/tagora-cli" --settings "$SETTINGS" --demo "$DEMO_DIR" 2>/dev/null | head -n 1

if [[ -n "${DISPLAY:-}${WAYLAND_DISPLAY:-}" ]]; then
  exec "$BUILD_DIR/app/tagora" --settings "$SETTINGS" "$@"
fi

mkdir -p "$BUILD_DIR/screens"
args=(set cmbPriceField 1 set ChkImportAlterKeys 1 set ChkImportAltKeySup 1 set ChkImportAlterPrices 1
      set chkReadPriceList 1 set chkReadItemParam 1 click cmdSaveDef2 click CmdImportItems
      click cmdSelectItems click CmdAllItems grab "$BUILD_DIR/screens/selection.png" click cmdClose
      set "OptOLE(3)" True click cmdPrintItmes)
for tab in 0 1 2 3 4 5 6 7 8 9; do
  args+=(set MainTab "$tab" grab "$BUILD_DIR/screens/tab$tab.png")
done
"$BUILD_DIR/app/tagora-cli" --settings "$SETTINGS" "$@" "${args[@]}"
echo "items imported into $DEMO_DIR/data/tgrmitm.tdb: $(sqlite3 "$DEMO_DIR/data/tgrmitm.tdb" 'SELECT count(*) FROM tItems')"
echo "screens of the ten tabs: $BUILD_DIR/screens/"
