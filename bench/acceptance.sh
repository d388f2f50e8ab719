#!/usr/bin/env bash
# By-hand acceptance check of the speed and memory targets (not a CTest test):
# runs bench_labelrun, bench_directlabels, bench_itemimport and
# bench_docimport one after the other, reads the RESULT line each prints, and
# compares the figures with the targets (the document import's rows are for
# information: it has no target). Exit status 0 when every target is met, 1 when one is missed, 2
# when a benchmark could not be run or printed no figures.
#
#   bench/acceptance.sh [BUILD_DIR]      (build/ by default; build it first)
#
# Each benchmark's own output goes to the terminal as it runs, and to
# acceptance-*.log in a temporary folder named at the end.
set -uo pipefail

ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)"
BUILD_DIR="${1:-${BUILD_DIR:-$ROOT/build}}"
BENCH="$BUILD_DIR/bench"
LOGS="$(mktemp -d "${TMPDIR:-/tmp}/tagora-acceptance-XXXXXX")"

# The targets. The import's memory is in MB of 1,000,000 bytes.
LABELRUN_WITHOUT_MIN=100000 # records/s, without the journal's writing
LABELRUN_WITH_MIN=50000     # records/s, with it
PICTURES_RATIO_MAX=1.0      # times zint --batch, on disk and on tmpfs
IMPORT_RATIO_MAX=2.0        # times the sqlite3 shell floor
IMPORT_ITEMS=100000
IMPORT_RSS_MAX_MB=30        # peak RSS of the import alone at IMPORT_ITEMS

broken=0

# run NAME ARGS...: runs the benchmark, shows and keeps its output.
run() {
    local name="$1"
    shift
    local exe="$BENCH/$name"
    echo "=== $name $*"
    if [[ ! -x "$exe" ]]; then
        echo "acceptance: $exe is missing (build first: scripts/build.sh)" >&2
        broken=1
        return
    fi
    stdbuf -oL "$exe" "$@" 2>&1 | tee "$LOGS/acceptance-$name.log"
    local rc=${PIPESTATUS[0]}
    if ((rc != 0)); then
        echo "acceptance: $name exited with status $rc" >&2
        broken=1
    fi
    echo
}

# value LOG SELECTOR KEY: KEY's value on the RESULT line of LOG that contains
# SELECTOR (a key=value pair, or "" for the first RESULT line); empty if none.
value() {
    local log="$LOGS/acceptance-$1.log" selector="$2" key="$3"
    [[ -f "$log" ]] || return 0
    awk -v sel="$selector" -v key="$key" '
        $1 == "RESULT" {
            hit = (sel == "")
            for (i = 2; i <= NF; i++) if ($i == sel) hit = 1
            if (!hit) next
            for (i = 2; i <= NF; i++) {
                n = index($i, "=")
                if (substr($i, 1, n - 1) == key) { print substr($i, n + 1); exit }
            }
        }' "$log"
}

run bench_labelrun
run bench_directlabels
run bench_itemimport "$IMPORT_ITEMS"
run bench_docimport

with=$(value bench_labelrun "" with_journal_rps)
without=$(value bench_labelrun "" without_journal_rps)
disk=$(value bench_directlabels place=disk ratio)
tmpfs=$(value bench_directlabels place=tmpfs ratio)
import=$(value bench_itemimport "" ratio)
rss_kib=$(value bench_itemimport "" import_rss_max_kib)
rss_mb=""
docs=$(value bench_docimport "" ratio)
docs_share=$(value bench_docimport "" line_queries_share)
[[ -n "$docs_share" ]] && docs_share=$(awk -v s="$docs_share" 'BEGIN { printf "%.0f", s * 100 }')
[[ -n "$rss_kib" ]] && rss_mb=$(awk -v k="$rss_kib" 'BEGIN { printf "%.1f", k * 1024 / 1e6 }')

missed=0
rows=()
# check WHAT MEASURED UNIT OP LIMIT: one row of the table.
check() {
    local what="$1" got="$2" unit="$3" op="$4" limit="$5" verdict
    if [[ -z "$got" ]]; then
        verdict="NO FIGURE"
        broken=1
        got="-"
    elif awk -v g="$got" -v l="$limit" -v op="$op" 'BEGIN { exit !(op == ">=" ? g >= l : g <= l) }'; then
        verdict="met"
    else
        verdict="MISSED"
        missed=1
    fi
    rows+=("$(printf '%-44s %16s   %-16s %s' "$what" "$got $unit" "$op $limit $unit" "$verdict")")
}

# info WHAT MEASURED UNIT: a row without a target, shown for comparison.
info() {
    local what="$1" got="$2" unit="$3" verdict="info"
    if [[ -z "$got" ]]; then
        verdict="NO FIGURE"
        broken=1
        got="-"
    fi
    rows+=("$(printf '%-44s %16s   %-16s %s' "$what" "$got $unit" "(no target)" "$verdict")")
}

check "label run, without the journal's writing" "$without" "rec/s" ">=" "$LABELRUN_WITHOUT_MIN"
check "label run, with the journal's writing" "$with" "rec/s" ">=" "$LABELRUN_WITH_MIN"
check "direct-label pictures / zint --batch, disk" "$disk" "x" "<=" "$PICTURES_RATIO_MAX"
check "direct-label pictures / zint --batch, tmpfs" "$tmpfs" "x" "<=" "$PICTURES_RATIO_MAX"
check "item import / sqlite3 shell floor" "$import" "x" "<=" "$IMPORT_RATIO_MAX"
check "item import peak RSS, $IMPORT_ITEMS items" "$rss_mb" "MB" "<=" "$IMPORT_RSS_MAX_MB"
info "document import / sqlite3 shell floor" "$docs" "x"
info "document import, per-document line queries" "$docs_share" "%"

echo "=== acceptance ($(date -u +%Y-%m-%dT%H:%MZ), $(nproc) cores, load $(cut -d' ' -f1-3 /proc/loadavg))"
printf '%-44s %16s   %-16s %s\n' "target" "measured" "limit" "verdict"
printf '%s\n' "${rows[@]}"
echo "(medians of five runs; the import's RSS is the largest of its five runs; logs in $LOGS)"

if ((broken)); then
    echo "acceptance: a benchmark did not run or print its figures" >&2
    exit 2
fi
if ((missed)); then
    echo "acceptance: targets missed" >&2
    exit 1
fi
echo "acceptance: all targets met"
