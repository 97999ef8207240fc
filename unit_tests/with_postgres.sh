#!/bin/sh
# Runs a command beside a PostgreSQL server of its own, which lives as long as the command.   with_postgres.sh COMMAND...
# The command finds the server's address without the database in QV_SERVER, and in QV_PG_CTL what restarts it.
set -eu
bin=$(ls -d /usr/lib/postgresql/*/bin 2>/dev/null | tail -n 1)
[ -x "${bin:-none}/initdb" ] || { echo "skipped: no PostgreSQL server (Debian's package postgresql) on this machine"; exit 77; }
folder=$(mktemp -d)
owner=
if [ "$(id -u)" = 0 ]; then  # a server never runs as root
  owner='runuser -u postgres --'
  chown postgres "$folder"
fi
QV_PG_CTL="$owner $bin/pg_ctl --wait --silent -D $folder/data -l $folder/log"
trap '$QV_PG_CTL stop -m immediate; rm -rf "$folder"' EXIT
trap 'exit 1' INT TERM
cd "$folder"
$owner "$bin/initdb" -D "$folder/data" -U qv -A trust -E UTF8 --locale=C --no-sync >initdb.log || { cat initdb.log >&2; exit 1; }
$QV_PG_CTL start -o "-k $folder -c listen_addresses='' -c fsync=off" || { cat "$folder/log" >&2; exit 1; }
QV_SERVER="postgresql://qv@$(printf %s "$folder" | sed 's,/,%2F,g')"
export QV_SERVER QV_PG_CTL
cd "$OLDPWD"
"$@"
