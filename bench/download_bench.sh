#!/usr/bin/env bash
# What a large download costs behind a web server: through nginx beside nginx that sends the file itself, and through
# lighttpd beside a bare SCGI server that does nothing but send it.
#   download_bench.sh BUILD [ROUNDS [MIB]]
set -uo pipefail
source=$(cd "$(dirname "$0")/.." && pwd)
build=$(realpath "$1")
rounds=${2:-10}
mib=${3:-2048}
. "$source/tests/apps/webserver.sh"

large=$("$build/apps/orvelctl/orvelctl" --root "$demo" ls / --user alice --json --additional real_path 2>/dev/null |
    grep -o '"real_path":"[^"]*-photo"' | cut -d'"' -f4)/large
head -c "${mib}M" /dev/zero >"$large"
floor=$work/floor.socket
"$build/bench/floor_request" sendfile "$floor" "$large" &
pids+=($!)

rate() { # url: bytes a second
    curl -s -o /dev/null -w '%{http_code} %{size_download} %{speed_download}\n' -u "alice:$(password alice)" "$1" |
        awk -v size=$((mib << 20)) '$1 != 200 || $2 != size { print "wrong reply: " $0 > "/dev/stderr"; exit 1 } { print $3 }'
}
median() { sort -g | awk '{ v[NR] = $1 } END { print NR % 2 ? v[(NR + 1) / 2] : (v[NR / 2] + v[NR / 2 + 1]) / 2 }'; }
compete() { # what, url of the peer, url of ours
    local ours peer ratios=() peers=()
    for ((i = 0; i <= rounds; ++i)); do
        peer=$(rate "$2") && ours=$(rate "$3") || exit 1
        [ "$i" -gt 0 ] || continue # the first fills the caches
        peers+=("$peer")
        ratios+=("$(awk -v a="$ours" -v b="$peer" 'BEGIN { print a / b }')")
    done
    printf '%-60s %6.2f   (%s MiB/s)\n' "$1" "$(printf '%s\n' "${ratios[@]}" | median)" \
        "$(printf '%s\n' "${peers[@]}" | median | awk '{ printf "%d", $1 / 1048576 }')"
}

server=nginx
serve
peer_port=$((port + 1))
mkdir "$work/peer"
chmod 755 "$work/peer"
cat >"$work/peer/nginx.conf" <<END
$user_nginx
worker_processes auto;
daemon off;
pid $work/peer/pid;
error_log stderr;
events { }
http {
    access_log off;
    sendfile on;
    server { listen 127.0.0.1:$peer_port; root $(dirname "$large"); }
}
END
chmod 644 "$large"
nginx -p "$work/peer" -c "$work/peer/nginx.conf" &
pids+=($!)
ours=http://127.0.0.1:$port/cgi-bin/download?path=/photo/large
until_true "the peer" curl -sf -o /dev/null -r 0-0 "http://127.0.0.1:$peer_port/large"
compete "through nginx, beside nginx that sends the file itself" "http://127.0.0.1:$peer_port/large" "$ours"
stop TERM

# The same web server, with the bare server where orveld would be.
server=lighttpd
serve
first=$server_pid
pids+=("$first")
ours=http://127.0.0.1:$port/cgi-bin/download?path=/photo/large
chmod 666 "$floor"
socket=$floor
serve
compete "through lighttpd, beside a bare server that sends it" "http://127.0.0.1:$port/cgi-bin/download" "$ours"
exit "$((failures > 0))"
