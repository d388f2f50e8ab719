#!/usr/bin/env bash
# A throwaway PostgreSQL server on loopback for the integration tests.
#   pg-test-server.sh start DIR PORT   initialise DIR (anew) and start the server
#   pg-test-server.sh stop DIR         stop it and remove DIR
# As root the server runs as the postgres user, as PostgreSQL requires.
set -euo pipefail
cmd="${1:?start or stop}"
dir="${2:?folder}"
bindir="$(ls -d /usr/lib/postgresql/*/bin 2>/dev/null | sort -V | tail -n 1)"
[[ -x "$bindir/pg_ctl" ]] || { echo "pg-test-server: PostgreSQL server binaries not found" >&2; exit 1; }

as_owner() {
  if [[ $(id -u) -eq 0 ]]; then runuser -u postgres -- "$@"; else "$@"; fi
}

case "$cmd" in
  start)
    port="${3:?port}"
    if [[ -f "$dir/data/postmaster.pid" ]]; then as_owner "$bindir/pg_ctl" -D "$dir/data" -m immediate stop >/dev/null 2>&1 || true; fi
    rm -rf "$dir"
    mkdir -p "$dir"
    if [[ $(id -u) -eq 0 ]]; then chown postgres "$dir"; fi
    as_owner "$bindir/initdb" -D "$dir/data" -A trust -U postgres --encoding=UTF8 --locale=C >"$dir/initdb.log" 2>&1
    as_owner "$bindir/pg_ctl" -D "$dir/data" -l "$dir/server.log" -w -t 60 \
      -o "-p $port -k $dir -c listen_addresses=127.0.0.1 -c fsync=off" start >/dev/null
    echo "pg-test-server: running on 127.0.0.1:$port"
    ;;
  stop)
    if [[ -f "$dir/data/postmaster.pid" ]]; then as_owner "$bindir/pg_ctl" -D "$dir/data" -m fast -w stop >/dev/null || true; fi
    rm -rf "$dir"
    ;;
  *) echo "usage: $0 start DIR PORT | stop DIR" >&2; exit 2 ;;
esac
