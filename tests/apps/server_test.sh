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
sizes() { grep -o '"size":[0-9.e+]*' <<<"$1" | cut -d: -f2 | sed 's/\.0$//'; }

expect "without a password" 401 "$(curl -s -o /dev/null -w '%{http_code}' "http://127.0.0.1:$port/cgi-bin/list?action=shares")"
expect "with a wrong one" 401 "$(curl -s -o /dev/null -w '%{http_code}' -u alice:x "http://127.0.0.1:$port/cgi-bin/list?action=shares")"
expect "the page" 200 "$(curl -s -o /dev/null -w '%{http_code}' -u "alice:$(password alice)" "http://127.0.0.1:$port/")"

shares_alice=$(names "$(list alice action=shares)")
shares_bob=$(names "$(list bob action=shares)")
expect "shares of alice" "home homes photo music projects worldwide warehouse sealed archive preview " "$shares_alice"
expect "shares of bob" "home homes photo music worldwide warehouse sealed archive preview " "$shares_bob"

photo=$(root_of photo)
page=$(list alice action=folder path=/photo sort_by=size sort_direction=desc offset=50 limit=50 additional=size)
wanted=$(find "$photo" -maxdepth 1 -type f -printf '%s\n' | sort -rn | sed -n 51,100p)
expect "page of 50" 50 "$(sizes "$page" | wc -l)"
expect "sizes of the second page" "$wanted" "$(sizes "$page")"
expect "warehouse, all of it" 20000 "$(grep -o '"name":' <<<"$(list bob action=folder path=/warehouse)" | wc -l)"

refused() { # user, path, code, key
    local reply
    reply=$(list "$1" action=folder "path=$2")
    expect "$2 for $1" "$3 $4" "$(sed -n 's/.*"code":\([0-9]*\),"key":"\([^"]*\)".*"success":false.*/\1 \2/p' <<<"$reply")"
}
refused bob /projects 407 error:error_privilege_not_enough
refused alice /projects/board 407 error:error_privilege_not_enough
refused alice "/projects/way out" 407 error:error_privilege_not_enough
refused bob /sealed 407 error:error_privilege_not_enough
refused alice /nowhere 408 error:error_no_path
refused alice /photo/nowhere 408 error:error_no_path
refused alice photo 401 error:error_error_system

home=$(root_of homes)/alice
rm -rf "$home"
list alice action=folder path=/home | grep -q '"success":true' || expect "home" listed refused
expect "mode of the home" 755 "$(stat -c %a "$home")"
if [ "$(id -u)" -eq 0 ]; then
    expect "owner of the home" 30001:30100 "$(stat -c %u:%g "$home")"
    expect "an administrator enters" 1 "$(list admin action=folder path=/projects/board | grep -c '"success":true')"
else
    echo "SKIPPED: owner of the home, folders that only an administrator enters: needs root, to act as other users"
fi

why=$("$build/apps/orvelctl/orvelctl" --root "$demo" why /projects --user bob 2>/dev/null)
grep -q '^decided by *the no-access list' <<<"$why" || expect "why" "the no-access list" "$why"

kill "$pid"
wait "$pid" 2>/dev/null
pid=
roots=$(grep -o '/tmp/orvel-demo-[^"]*' "$demo/etc/vexo/demo.json")
touch "$demo/mine"
"$build/apps/orvelctl/orvelctl" demo "$demo" --remove >/dev/null 2>&1 || expect "removal" 0 $?
for root in $roots; do [ ! -e "$root" ] || expect "$root" removed there; done
expect "what is left" mine "$(ls "$demo")"
"$build/apps/orvelctl/orvelctl" demo "$demo" >/dev/null 2>&1 && expect "a folder in use" refused "made a demo"
rm -r "$demo"

finish
