#!/usr/bin/env bash
# A visitor who knows the password of a link while strangers try passwords, all of them through a trusted proxy's header.
#   guesses.sh script/server BUILD
#   ORVEL_TEST_GUESSERS: how many addresses try, 1,000 without it; ORVEL_TEST_GUESSES: at least so many requests, 10,000
set -uo pipefail
. "$(dirname "$0")/../tests/apps/served.sh"
command -v node >/dev/null || { echo "FAILED: node is not installed"; exit 1; }

addresses=${ORVEL_TEST_GUESSERS:-1000}
guesses=${ORVEL_TEST_GUESSES:-10000}
photo=$(root_of photo)
mkdir -p "$photo/shared"
echo one >"$photo/shared/one.txt"
link() { "$build/apps/orvelctl/orvelctl" --root "$demo" link create /photo/shared --user alice "$@" 2>/dev/null | head -1; }
guarded=$(link --password 'pass word')
other=$(link --password 'other word')
free=$(link)

# The same server, but for a web server that hands on what proxies say; nobody is blocked, so that all go on.
printf 'trusted_proxies="127.0.0.1"\nautoblock_enable="no"\n' >>"$demo/etc/vexoinfo.conf"
front=$((port + 1))
while (exec 3<>"/dev/tcp/127.0.0.1/$front") 2>/dev/null; do front=$((front + 1)); done
sed -e "s/^server.port = .*/server.port = $front/" -e '/HTTP_X_FORWARDED_FOR/d' "$demo/run/lighttpd/lighttpd.conf" >"$work/front.conf"
lighttpd -D -f "$work/front.conf" &
front_pid=$!
trap 'kill "$front_pid" 2>/dev/null; cleanup' EXIT
for _ in $(seq 600); do (exec 3<>"/dev/tcp/127.0.0.1/$front") 2>/dev/null && break; sleep 0.1; done

node "$(dirname "$0")/guesses.mjs" "http://127.0.0.1:$front/cgi-bin/share" "$guarded" "$other" "$free" "$addresses" "$guesses" ||
    failures=$((failures + 1))
finish
