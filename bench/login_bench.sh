#!/usr/bin/env bash
# How long wrong passwords take for a name that exists and for one that does not: the two must not differ.
#   login_bench.sh script/server BUILD [ROUNDS]
set -uo pipefail
. "$(dirname "$0")/../tests/apps/served.sh"
rounds=${3:-500}
echo 'autoblock_enable="no"' >>"$demo/etc/vexoinfo.conf"
guess() { # user
    curl -s -o /dev/null -w "$1 %{http_code} %{time_total}\n" -d action=begin -d "user=$1" -d password=wrong "http://localhost:$port/cgi-bin/login"
}
for _ in $(seq "$rounds"); do
    guess alice
    guess alina
done >"$work/times"
for user in alice alina; do
    awk -v user="$user" '$1 == user && $2 == 403 { print $3 * 1000 }' "$work/times" | sort -g |
        awk -v user="$user" '{ t[NR] = $1 } END { printf "%s: %d guesses, median %.2f ms, quartiles %.2f and %.2f\n",
            user, NR, t[int(NR / 2) + 1], t[int(NR / 4) + 1], t[int(NR * 3 / 4) + 1] }'
done
finish
