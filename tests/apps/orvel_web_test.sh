#!/usr/bin/env bash
# What orvel-web is prepared with: certificates, ports, and a configuration that lighttpd serves by HTTPS.
#   orvel_web_test.sh SOURCE BUILD
set -uo pipefail
source=$1
prepare=$2/packaging/web-prepare
PATH=$PATH:/usr/sbin
work=$(mktemp -d)
chmod 755 "$work"
pid=
cleanup() {
    [ -z "$pid" ] || { kill "$pid" 2>/dev/null; wait "$pid" 2>/dev/null; }
    rm -rf "$work"
}
trap cleanup EXIT
failures=0
expect() { # what, wanted, got
    [ "$2" = "$3" ] || { echo "FAILED: $1: wanted '$2', got '$3'"; failures=$((failures + 1)); }
}

port=$((20000 + $$ * 4 % 12000))
taken() { (exec 3<>"/dev/tcp/127.0.0.1/$1") 2>/dev/null; }
while taken "$port" || taken "$((port + 1))" || taken "$((port + 2))"; do port=$((port + 3)); done
# Nothing resolves the machine's name, and it has no address.
mkdir "$work/bin"
printf '#!/bin/sh\n[ $# -eq 0 ] && echo box\n' >"$work/bin/hostname"
chmod 755 "$work/bin/hostname"
PATH=$work/bin:$PATH
export VEXO_ROOT=$work ORVEL_SHARE=$work/share ORVEL_WEB_USER=nobody
mkdir -p "$work/etc/orvel" "$work/share" "$work/run" "$work/var/lib" "$work/var/cache"
cp -r "$source/packaging/web" "$work/share/lighttpd"
"$source/packaging/web/make-page" "$source/apps/web" "$work/share/web"
settings=$work/etc/orvel/web.conf
settings() {
    printf 'address="127.0.0.1"\nhttps_port="%s"\nhttp_port="%s"\nproxy_port="%s"\n' "$port" $((port + 1)) $((port + 2)) >"$settings"
    [ "$#" -eq 0 ] || printf '%s\n' "$@" >>"$settings"
}
own=$work/var/lib/orvel-web
make_pair() { openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:prime256v1 -nodes -subj /CN=x -days 9 -keyout "$1.key" -out "$1.pem" 2>/dev/null; }
make_pair "$work/a"
make_pair "$work/b"
cat "$work/a.pem" "$work/a.key" >"$work/both.pem"
openssl pkey -in "$work/a.key" -aes128 -passout pass:secret -out "$work/locked.key"

# setting lines | what is said; "" for nothing wrong
while IFS='|' read -r lines said; do
    # shellcheck disable=SC2086
    settings $lines
    words=$("$prepare" start 2>&1)
    status=$?
    expect "status with $lines" "$([ -z "$said" ] && echo 0 || echo 1)" "$status"
    [ -z "$said" ] || grep -q "$said" <<<"$words" || expect "words with $lines" "$said" "$words"
done <<END
certificate="$work/a.pem" key="$work/a.key"|
certificate="$work/both.pem"|
certificate="$work/a.pem"|comes without its key
certificate="$work/a.pem" key="$work/b.key"|does not belong to the certificate
certificate="$work/a.pem" key="$work/nothing"|is not there
certificate="$work/a.pem" key="$work/locked.key"|locked by a password
certificate="$work/nothing" key="$work/a.key"|is not there
certificate="$settings" key="$work/a.key"|no certificate in PEM form
key="$work/a.key"|no certificate
END
sed -i 's/^http_port=.*/http_port="80x"/' "$settings"
expect "a port" 1 "$("$prepare" start 2>&1 | grep -c 'is not a port')"

# Its own certificate: made once, anew when it ends soon or its key is another's.
settings
"$prepare" start 2>/dev/null
first=$(md5sum "$own"/*.pem)
"$prepare" start
expect "the second start" "$first" "$(md5sum "$own"/*.pem)"
expect "modes" "600 644 640" "$(stat -c %a "$own/key.pem" "$own/certificate.pem" "$work/run/orvel-web/key.pem" | tr '\n' ' ' | sed 's/ $//')"
cp "$work/a.pem" "$own/certificate.pem"
"$prepare" check 2>/dev/null && expect "a certificate that ends soon" refused taken
"$prepare" reload 2>/dev/null
expect "names" 1 "$(openssl x509 -in "$own/certificate.pem" -noout -ext subjectAltName | grep -c 'DNS:box, DNS:localhost, IP Address:127.0.0.1')"

[ "$(id -u)" -ne 0 ] || chown -R nobody "$work/var/cache" "$work/run/orvel-web"
lighttpd -D -f "$work/run/orvel-web/lighttpd.conf" 2>"$work/log" &
pid=$!
ask() { curl -s --max-time 60 --cacert "$own/certificate.pem" "$@"; }
for _ in $(seq 600); do taken "$port" && break; sleep 0.1; done
expect "the page" 200 "$(ask -o /dev/null -w '%{http_code}' "https://localhost:$port/")"
expect "plain HTTP" "307 https://localhost:$port/a?b" "$(ask -o /dev/null -w '%{http_code} %{redirect_url}' "http://localhost:$((port + 1))/a?b")"
expect "a proxy" 200 "$(ask -o /dev/null -w '%{http_code}' "http://127.0.0.1:$((port + 2))/")"
expect "packed and kept" "cache-control: immutable
cache-control: max-age=31536000
content-encoding: br" "$(ask -D - -o /dev/null -H 'Accept-Encoding: gzip, br' "https://localhost:$port/page/$(ls "$work/share/web/page")/js/main.js" |
    tr -d '\r' | grep -i '^cache-control\|^content-encoding' | sort)"
expect "a year of HTTPS" 0 "$(ask -D - -o /dev/null "https://localhost:$port/" | grep -ci '^strict-transport')"
expect "a taken port" 1 "$("$prepare" start 2>&1 | grep -c "cannot listen on 127.0.0.1:$port")"
[ "$failures" -eq 0 ] || cat "$work/log"
exit "$((failures > 0))"
