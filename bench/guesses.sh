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

. "$(dirname "$0")/front.sh"
node "$(dirname "$0")/guesses.mjs" "http://127.0.0.1:$front/cgi-bin/share" "$guarded" "$other" "$free" "$addresses" "$guesses" ||
    failures=$((failures + 1))
finish
