#!/usr/bin/env bash
# docs/openapi.yaml against the programs behind the web server.
#   openapi_test.sh SERVER BUILD
here=$(cd "$(dirname "$0")" && pwd)
. "$here/served.sh"
for user in alice bob admin; do export "ORVEL_TEST_${user^^}=$(password "$user")"; done
projects=$(root_of projects)
mkdir "$projects"/$'not\xFFtext'
chown --reference="$projects" "$projects"/$'not\xFFtext'
mkdir -m 700 "$projects"/$'not\xFFtext'/closed
for snapshot in @GMT-2026.11.01-12.00.00 $'2026-10-01\xFF'; do
    mkdir -p "$projects/.snapshots/$snapshot"
    cp "$projects/notes.md" "$projects/.snapshots/$snapshot/"
done
/usr/bin/python3 "$here/openapi.py" "$here/../.." "$build" "http://127.0.0.1:$port" || failures=$((failures + 1))
finish
