#!/usr/bin/env bash
# A throwaway CUPS server on loopback for the printing tests.
#   cups-test-server.sh start DIR PORT   configure DIR (anew), start cupsd, add the queues
#   cups-test-server.sh stop DIR         stop it and remove DIR
#
# Queues:
#   tagora-pdf     a queue on a file: device, DIR/out/tagora-pdf, whose one
#                  filter copies the job through, so the file holds a job's
#                  bytes exactly as they were sent (a PDF stays the PDF, ZPL
#                  stays ZPL), whether or not the job was sent raw.
#   tagora-reject  the same kind of queue, disabled and refusing jobs.
# What the file: device does: each job truncates the file and writes its bytes
# (cupsd opens it O_TRUNC), so the file holds the last job only. Tests that
# use the queue therefore run one at a time (CTest RESOURCE_LOCK), remove the
# file before a job and wait for the job to finish before reading it.
# cups-pdf (one PDF per job) would avoid that, but it rewrites the PDF through
# Ghostscript, so the bytes that arrive are no longer the ones sent.
# The job itself is written by cupsd's user (lp), so DIR/out is open to it.
set -euo pipefail
cmd="${1:?start or stop}"
dir="${2:?folder}"
# Without cupsd (a developer machine) start does nothing and the printing
# tests skip; scripts/setup.sh installs it for CI.
if ! command -v cupsd >/dev/null; then
  echo "cups-test-server: cupsd not found (install cups); printing tests will skip" >&2
  [[ "$cmd" == start ]] && mkdir -p "$dir"
  exit 0
fi

stop_server() {
  if [[ -f "$dir/run/cupsd.pid" ]]; then
    local pid
    pid="$(cat "$dir/run/cupsd.pid" 2>/dev/null || true)"
    # Only our cupsd: a pid from an old run may belong to another program now.
    if [[ -n "$pid" ]] && [[ "$(cat "/proc/$pid/comm" 2>/dev/null)" == cupsd ]]; then
      kill "$pid" 2>/dev/null || true
      for _ in $(seq 1 50); do kill -0 "$pid" 2>/dev/null || break; sleep 0.1; done
      kill -9 "$pid" 2>/dev/null || true
    fi
  fi
}

case "$cmd" in
  start)
    port="${3:?port}"
    stop_server
    # Another server on the port (another checkout's tests) would take our
    # jobs or refuse our queues: say so rather than test against it.
    if lpstat -h "127.0.0.1:$port" -r 2>/dev/null | grep -q 'is running'; then
      echo "cups-test-server: 127.0.0.1:$port is taken by another CUPS server; configure with -DTAGORA_CUPS_PORT=N" >&2
      exit 1
    fi
    rm -rf "$dir"
    mkdir -p "$dir"/{conf,spool/tmp,cache,state,log,run,out}
    chmod 0755 "$dir"
    chmod 1777 "$dir/out" "$dir/spool/tmp"
    cat >"$dir/conf/cupsd.conf" <<CONF
Listen 127.0.0.1:$port
Browsing No
BrowseLocalProtocols none
DefaultAuthType None
DefaultEncryption Never
WebInterface No
LogLevel info
PreserveJobHistory Yes
PreserveJobFiles No
MaxJobs 0
<Location />
  Order allow,deny
  Allow all
</Location>
<Location /admin>
  Order allow,deny
  Allow all
</Location>
<Policy default>
  <Limit All>
    Order allow,deny
    Allow all
  </Limit>
</Policy>
CONF
    cat >"$dir/conf/cups-files.conf" <<CONF
ServerRoot $dir/conf
RequestRoot $dir/spool
CacheDir $dir/cache
StateDir $dir/state
TempDir $dir/spool/tmp
LogFilePerm 0644
AccessLog $dir/log/access_log
ErrorLog $dir/log/error_log
PageLog $dir/log/page_log
FileDevice Yes
Sandboxing Relaxed
CONF
    # A "-m raw" queue on a file: device completes its jobs without writing
    # anything (no filter runs, and the file device needs one), so the queues
    # get a PPD whose only filter copies the job's bytes as they are.
    cat >"$dir/conf/passthru" <<'SH'
#!/bin/sh
# filter arguments: job user title copies options [file]
if [ -n "$6" ]; then exec cat "$6"; else exec cat; fi
SH
    chmod 0755 "$dir/conf/passthru"
    cat >"$dir/conf/passthru.ppd" <<PPD
*PPD-Adobe: "4.3"
*FormatVersion: "4.3"
*FileVersion: "1.0"
*LanguageVersion: English
*LanguageEncoding: ISOLatin1
*PCFileName: "TAGORA.PPD"
*Manufacturer: "Tagora"
*Product: "(Tagora test queue)"
*ModelName: "Tagora test queue"
*ShortNickName: "Tagora test queue"
*NickName: "Tagora test queue"
*cupsVersion: 2.4
*cupsFilter: "application/pdf 0 $dir/conf/passthru"
*cupsFilter: "application/vnd.cups-raw 0 $dir/conf/passthru"
*cupsFilter: "application/octet-stream 0 $dir/conf/passthru"
*cupsFilter: "text/plain 0 $dir/conf/passthru"
PPD
    # In the foreground behind &, so the pid is ours to stop.
    cupsd -f -c "$dir/conf/cupsd.conf" -s "$dir/conf/cups-files.conf" >"$dir/log/stdout" 2>&1 &
    echo $! >"$dir/run/cupsd.pid"
    server="127.0.0.1:$port"
    for _ in $(seq 1 100); do
      if lpstat -h "$server" -r 2>/dev/null | grep -q 'is running'; then break; fi
      sleep 0.1
    done
    lpstat -h "$server" -r 2>/dev/null | grep -q 'is running' || {
      echo "cups-test-server: cupsd did not start; see $dir/log" >&2
      cat "$dir/log/stdout" "$dir/log/error_log" >&2 2>/dev/null || true
      stop_server; exit 1; }
    for q in tagora-pdf tagora-reject; do
      lpadmin -h "$server" -p "$q" -E -v "file://$dir/out/$q" -P "$dir/conf/passthru.ppd" 2>>"$dir/log/lpadmin"
    done
    cupsreject -h "$server" -r "test queue refuses jobs" tagora-reject
    cupsdisable -h "$server" tagora-reject
    echo "cups-test-server: running on $server"
    ;;
  stop)
    stop_server
    rm -rf "$dir"
    ;;
  *) echo "usage: $0 start DIR PORT | stop DIR" >&2; exit 2 ;;
esac
