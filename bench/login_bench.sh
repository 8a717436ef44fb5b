#!/usr/bin/env bash
# Wrong passwords at the log-in, for a name that exists and for one that does not, in turns and from many addresses at once:
# the times of the two must not differ.
#   login_bench.sh script/server BUILD [GUESSES]
set -uo pipefail
. "$(dirname "$0")/../tests/apps/served.sh"
command -v node >/dev/null || { echo "FAILED: node is not installed"; exit 1; }
. "$(dirname "$0")/front.sh"
sed -i '/^trusted_log_in=/d' "$demo/etc/vexoinfo.conf"
node "$(dirname "$0")/login_bench.mjs" "http://127.0.0.1:$front/cgi-bin/login" "${3:-10000}" || failures=$((failures + 1))
finish
