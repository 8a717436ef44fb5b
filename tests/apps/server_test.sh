#!/usr/bin/env bash
# script/server from end to end: a demo appliance made for the test, lighttpd, and curl as the browser.
#   server_test.sh SERVER BUILD
set -uo pipefail
. "$(dirname "$0")/served.sh"

list() { # user, query...
    local user=$1 fields=()
    shift
    for field; do fields+=(--data-urlencode "$field"); done
    curl -s -u "$user:$(password "$user")" -G "http://127.0.0.1:$port/cgi-bin/list" "${fields[@]}"
}
names() { grep -o '"name":"[^"]*"' <<<"$1" | cut -d'"' -f4 | tr '\n' ' '; }
expect "without a password" 401 "$(curl -s -o /dev/null -w '%{http_code}' "http://127.0.0.1:$port/cgi-bin/list?action=shares")"
expect "with a wrong one" 401 "$(curl -s -o /dev/null -w '%{http_code}' -u alice:x "http://127.0.0.1:$port/cgi-bin/list?action=shares")"
expect "the page" 200 "$(curl -s -o /dev/null -w '%{http_code}' -u "alice:$(password alice)" "http://127.0.0.1:$port/")"

shares_alice=$(names "$(list alice action=shares)")
shares_bob=$(names "$(list bob action=shares)")
expect "shares of alice" "home homes photo music projects worldwide warehouse sealed archive preview " "$shares_alice"
expect "shares of bob" "home homes photo music worldwide warehouse sealed archive preview " "$shares_bob"

expect "warehouse, all of it" 20000 "$(grep -o '"name":' <<<"$(list bob action=folder path=/warehouse)" | wc -l)"

if [ "$(id -u)" -eq 0 ]; then
    expect "an administrator enters" 1 "$(list admin action=folder path=/projects/board | grep -c '"success":true')"
else
    echo "SKIPPED: folders that only an administrator enters: needs root, to act as other users"
fi

why=$("$build/apps/orvelctl/orvelctl" --root "$demo" why /projects --user bob 2>/dev/null)
grep -q '^decided by *the no-access list' <<<"$why" || expect "why" "the no-access list" "$why"

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
