#!/usr/bin/env bash
# orvel-web behind proxies that speak HTTPS, each with the lines that docs/install.md names for it.
#   proxies_test.sh SOURCE BUILD [PROXY...]
set -uo pipefail
source=$1
build=$2
shift 2
[ "$#" -gt 0 ] || set -- haproxy caddy
export ASAN_OPTIONS=detect_leaks=0
. "$(dirname "$0")/webserver.sh"

free_port() {
    while answers; do port=$((port + 1)); done
    echo "$port"
}
port=$((10000 + $$ % 9000)) # other tests look from 20000 on
web=$(free_port) && port=$((web + 1))
plain=$(free_port) && port=$((plain + 1))
behind=$(free_port) && port=$((behind + 1))

# orvel-web as its unit starts it.
server=orvel-web
export VEXO_ROOT=$demo ORVEL_SHARE=$work/share ORVEL_WEB_USER=$user
mkdir -p "$demo/etc/orvel" "$demo/run/vexo" "$work/share" "$work/home"
ln -s "$socket" "$demo/run/vexo/orveld.socket"
cp -r "$source/packaging/web" "$work/share/lighttpd"
mv "$work/web" "$work/share/web"
printf 'address="127.0.0.1"\nhttps_port="%s"\nhttp_port="%s"\nproxy_port="%s"\n' "$web" "$plain" "$behind" >"$demo/etc/orvel/web.conf"
chmod 755 "$demo" "$demo/run" "$demo/run/vexo"
chmod -R a+rX "$work/share"
"$build/packaging/web-prepare" start 2>>"$work/web.log" || expect "its configuration" made refused
[ "$(id -u)" -ne 0 ] || chown -R "$user" "$demo/run/orvel-web" "$demo/var/cache/orvel-web"
sed -i '1i server.username = "'"$user"'"' "$demo/run/orvel-web/lighttpd.conf"
lighttpd -D -f "$demo/run/orvel-web/lighttpd.conf" 2>>"$work/web.log" &
pids+=($!)
port=$behind
until_true "orvel-web" answers
echo 'trusted_proxies="127.0.0.1"' >>"$settings"

own=$demo/var/lib/orvel-web
cat "$own/certificate.pem" "$own/key.pem" >"$work/box.pem"
lines() { # first and last line of what the document shows
    sed -n "/^ *$1/,/^ *$2/p" "$source/docs/install.md" | sed 's/^  //'
}
configure_haproxy() {
    printf 'defaults\n    timeout client 60s\n    timeout server 60s\n    timeout connect 20s\n'
    lines 'frontend https' 'server box' | sed "s|bind :443 ssl crt .*|bind 127.0.0.1:$front ssl crt $work/box.pem|; s|:8641|:$behind|"
}
configure_caddy() {
    printf '{\n    admin off\n    auto_https off\n}\n'
    lines box.example.org '}' | sed "s|box.example.org|https://localhost:$front|; s|:8641|:$behind|; 1a tls $own/certificate.pem $own/key.pem"
}
start_proxy() {
    "configure_$server" >"$work/$server.conf"
    case "$server" in
        haproxy) exec haproxy -db -f "$work/haproxy.conf" ;;
        caddy) HOME=$work/home exec caddy run --adapter caddyfile --config "$work/caddy.conf" ;;
    esac >"$work/$server.log" 2>&1 &
    server_pid=$!
    port=$front
    until_true "start" answers
}

# The client has another address than the proxy.
ask() { curl -s --max-time 60 --interface 127.0.0.3 --cacert "$own/certificate.pem" -b "$work/jar" -c "$work/jar" "$@"; }
url() { echo "https://localhost:$front/cgi-bin/$1"; }
code() { ask -o /dev/null -w '%{http_code}' "$@"; }
one_runs() { status | grep -q '"running":1,'; }

check() {
    local words=(--data-urlencode user=alice --data-urlencode "password=$(password alice)" -d action=begin) at upload
    rm -f "$work/jar"
    expect "the page" 200 "$(code "https://localhost:$front/")"
    expect "another site's log-in" 403 "$(code -H 'Origin: https://elsewhere' "${words[@]}" "$(url login)")"
    expect "log-in" 1 "$(ask -H "Origin: https://localhost:$front" "${words[@]}" "$(url login)" | grep -c '"step":"done"')"
    expect "a cookie for HTTPS alone" 1 "$(grep -c $'\tTRUE\t[0-9]*\t__Host-id\t' "$work/jar")"
    expect "shares" 1 "$(ask "$(url 'list?action=shares')" | grep -c '"user":"alice"')"
    expect "the client's address" 1 "$(ask -H 'X-Forwarded-For: 192.0.2.9' "$(url sessions)" | grep -c '"address":"127.0.0.3"')"

    head -c 3000000 /dev/urandom >"$work/data"
    expect "upload" 200 "$(code -T "$work/data" "$(url "upload?path=/photo/$server/data")")"
    ask "$(url "download?path=/photo/$server/data")" | cmp -s - "$work/data" || expect "download" same different
    expect "part" "$(tail -c +1000001 "$work/data" | head -c 1000 | md5sum)" \
        "$(ask -r 1000000-1000999 "$(url "download?path=/photo/$server/data")" | md5sum)"
    at=$(url "tus$(ask -o /dev/null -D - -X POST -H 'Content-Length: 0' -H 'Tus-Resumable: 1.0.0' -H 'Upload-Length: 3000000' \
        "$(url "tus?path=/photo/$server/pieces")" | tr -d '\r' | sed -n 's/^[Ll]ocation: *\(.*\)/\1/p')")
    expect "a piece" 204 "$(code -X PATCH -H 'Tus-Resumable: 1.0.0' -H 'Upload-Offset: 0' -H 'Expect:' \
        -H 'Content-Type: application/offset+octet-stream' --data-binary "@$work/data" "$at")"

    # A body is passed on as it comes.
    mkfifo "$work/body"
    code -H 'Expect:' -H 'Transfer-Encoding:' -H 'Content-Length: 10' -T - "$(url "upload?path=/photo/$server/slow")" \
        <"$work/body" >"$work/code" &
    exec {upload}>"$work/body"
    printf 12 >&"$upload"
    until_true "an upload under way" one_runs
    printf 34567890 >&"$upload"
    exec {upload}>&-
    wait $!
    expect "a slow upload" 200 "$(cat "$work/code")"
    rm "$work/body"
    expect "log-out" 1 "$(ask -d scope=this "$(url logout)" | grep -c '"ended":1')"
    expect "nobody" 401 "$(code "$(url 'list?action=shares')")"
}

for server in "$@"; do
    if ! command -v "$server" >/dev/null; then
        echo "FAILED: $server is not installed"
        failures=$((failures + 1))
        continue
    fi
    before=$failures
    port=$((behind + 1))
    front=$(free_port)
    start_proxy
    check
    kill "$server_pid"
    wait "$server_pid" 2>/dev/null
    server_pid=
    [ "$failures" -eq "$before" ] || { echo "--- $server:"; cat "$work/$server.conf" "$work/$server.log" "$work/web.log" "$work/orveld.log"; }
done
exit "$((failures > 0))"
