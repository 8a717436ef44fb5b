#!/usr/bin/env bash
# Searches through the web server: the reply comes at once, the results while the search goes on and after.
#   search_test.sh SERVER BUILD
set -uo pipefail
. "$(dirname "$0")/served.sh"

search() { # user, action, fields...
    local user=$1 action=$2 fields=()
    shift 2
    for field; do fields+=(--data-urlencode "$field"); done
    curl -s -m 30 -u "$user:$(password "$user")" -d "action=$action" "${fields[@]}" "http://127.0.0.1:$port/cgi-bin/search"
}
field() { sed -n "s/.*\"$2\":\"\{0,1\}\([^\",}]*\).*/\1/p" <<<"$1"; }
finished() { # user, task
    local reply
    for _ in $(seq 300); do
        reply=$(search "$1" list "taskid=$2" limit=10000)
        [ "$(field "$reply" finished)" != true ] || break
        sleep 0.1
    done
    echo "$reply"
}
paths() { grep -o '"path":"[^"]*"' <<<"$1" | cut -d'"' -f4 | sort; }

photo=$(root_of photo)
id=$(field "$(search alice start path=/photo path=/music 'name=IMG_00*,track' type=file)" taskid)
reply=$(finished alice "$id")
wanted=$({ find "$photo" -type f -name 'IMG_00*' -printf '/photo/%P\n'; find "$(root_of music)" -type f -iname '*track*' -printf '/music/%P\n'; } | sort)
expect "what alice finds" "$wanted" "$(paths "$reply")"
if [ "$(id -u)" -eq 0 ]; then
    expect "who answered" '{"music":"walk","photo":"index"}' "$(grep -o '"shares":{[^}]*}' <<<"$reply" | cut -d: -f2-)"
    expect "alice's search for bob" 408 "$(field "$(search bob list "taskid=$id")" code)"
else
    echo "SKIPPED: indexes, users apart from each other: needs root"
fi
expect "bob in a share that shuts him out" 407 "$(field "$(search bob start path=/projects name=a)" code)"

# A page keeps being true while its files change.
curl -s -u "alice:$(password alice)" -d action=rename -d path=/photo/IMG_0001.png -d name=IMG_zzz.png -d "taskid=$id" \
    "http://127.0.0.1:$port/cgi-bin/operation" | grep -q '"success":true' || expect "a rename" done refused
expect "the last page" /photo/IMG_zzz.png "$(paths "$(search alice list "taskid=$id" filter=img sort_direction=desc limit=1)")"

expect "stopping one that has ended" true "$(field "$(search alice stop "taskid=$id")" finished)"
expect "cleaning" true "$(field "$(search alice clean "taskid=$id")" success)"
expect "what was cleaned" 408 "$(field "$(search alice list "taskid=$id")" code)"
finish
