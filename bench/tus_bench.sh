#!/usr/bin/env bash
# A large upload by tus-js-client through a network that is cut off again and again, while the web server and orveld are
# started anew and orveld is killed; beside the same upload undisturbed. The bytes are compared.
#   tus_bench.sh BUILD [MIB]
# 2048 MiB without it: 20 cuts, 3 restarts of both servers, one kill -9 of orveld and of what it has started.
set -uo pipefail
source=$(realpath "$(dirname "$0")/..")
build=$(realpath "$1")
mib=${2:-2048}
. "$source/tests/apps/webserver.sh"
server=lighttpd
serve
keeper=${pids[0]}
[ -d "$source/tests/web/node_modules/tus-js-client" ] || (cd "$source/tests/web" && npm ci --no-audit --no-fund --loglevel=error)

# A word on standard input, an answer when it is done.
control() {
    local word one
    while read -r word; do
        one=$(cat "/proc/$keeper/task/$keeper/children")
        case "$word" in
            restart) # as an upgrade does it: what has begun may end
                stop TERM
                # shellcheck disable=SC2086
                kill -TERM $one
                start ;;
            kill)
                # shellcheck disable=SC2046,SC2086
                kill -KILL $(cat "/proc/${one%% *}/task/${one%% *}/children") $one ;;
        esac
        echo "$word"
    done
}
mkfifo "$work/words" "$work/answers"
projects=$("$build/apps/orvelctl/orvelctl" --root "$demo" ls / --user alice --json --additional real_path | grep -o '"real_path":"[^"]*-projects"' | cut -d'"' -f4)
node "$source/bench/tus_bench.mjs" "http://127.0.0.1:$port/" "$(password alice)" "$projects" "$mib" "$work" 3>"$work/words" 4<"$work/answers" &
client=$!
control <"$work/words" >"$work/answers"
wait "$client" || failures=$((failures + 1))
exit "$((failures > 0))"
