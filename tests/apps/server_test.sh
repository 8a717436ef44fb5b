#!/usr/bin/env bash
# script/server from end to end: a demo appliance made for the test, lighttpd, and curl as the browser.
#   server_test.sh SERVER BUILD
set -uo pipefail
. "$(dirname "$0")/served.sh"

page() { curl -s -o /dev/null -w '%{http_code}' -u "$1" "http://127.0.0.1:$port/"; }
expect "with a wrong password" 401 "$(page alice:x)"
expect "the page" 200 "$(page "alice:$(password alice)")"

kill "$pid"
wait "$pid" 2>/dev/null
pid=
roots=$(grep -o '/tmp/orvel-demo-[^"]*' "$demo/etc/vexo/demo.json")
touch "$demo/mine"
"$build/bin/orvel-demo" "$demo" --remove >/dev/null 2>&1 || expect "removal" 0 $?
for root in $roots; do [ ! -e "$root" ] || expect "$root" removed there; done
expect "what is left" mine "$(ls "$demo")"
"$build/bin/orvel-demo" "$demo" >/dev/null 2>&1 && expect "a folder in use" refused "made a demo"
rm -r "$demo"

finish
