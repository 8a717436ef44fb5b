#!/usr/bin/env bash
# orveld behind each web server with its configuration of packaging/.
#   webservers_test.sh SOURCE BUILD [SERVER...]
set -uo pipefail
source=$1
build=$2
shift 2
[ "$#" -gt 0 ] || set -- lighttpd nginx apache
export ASAN_OPTIONS=detect_leaks=0
slow=20 # connections that dawdle
[ -z "${ORVEL_TEST_LONG:-}" ] || slow=4000
ulimit -n 8192 2>/dev/null

. "$(dirname "$0")/webserver.sh"

ask() { curl -s --max-time 60 -u "alice:$(password alice)" "$@"; }
code() { ask -o /dev/null -w '%{http_code}' "$@"; }
url() { echo "http://127.0.0.1:$port/cgi-bin/$1"; }

# What is sent packed is what is sent plainly; that something is not there is kept by nobody.
check_page() {
    local host=http://127.0.0.1:$port page best=br kept='max-age=31536000, immutable' none named path accepted wanted file
    page=page/$(ls "$work/web/page")
    case "$server" in
        lighttpd) none=immutable ;; # which means nothing without a time
        nginx) none='' best=gzip ;;
        apache) none=no-cache ;;
    esac
    named='/webman/modules/Pexlander/FolderSharingLoader.js?v=1'
    while IFS='|' read -r path accepted wanted; do
        ask -D "$work/headers" -o "$work/sent" -H "Accept-Encoding: $accepted" "$host$path"
        expect "$path as $accepted" "$wanted" "$(tr -d '\r' <"$work/headers" | awk '
            { name = tolower($1); value = substr($0, index($0, " ") + 1) }
            NR == 1 { status = $2 }
            name == "content-encoding:" { packed = value }
            name == "cache-control:" { kept = kept (kept == "" ? "" : ", ") value }
            END { print status, packed, kept }')"
        [ "${wanted%% *}" = 200 ] || continue
        file=$work/web${path/"$named"/\/visitor\/FolderSharingLoader.js}
        case "$wanted" in
            *' br '*) brotli -dc "$work/sent" ;;
            *' gzip '*) gzip -dc "$work/sent" ;;
            *) cat "$work/sent" ;;
        esac | cmp - "${file/%\//\/index.html}" || expect "$path as $accepted" same different
    done <<END
/|gzip, deflate, br|200 $best no-store
/index.html|gzip|200 gzip no-store
/index.html|br;q=0|200  no-store
/$page/js/main.js|gzip, br|200 $best $kept
/$page/css/base.css|br;q=0, gzip;q=0.5|200 gzip $kept
/$page/icons.svg|identity|200  $kept
/$page/images/folder.png|br|200  $kept
/$page/js/nothing.js|identity|404  $none
$named|br, gzip|200 $best no-cache
END
}
check_requests() {
    expect "nobody" 401 "$(curl -s -o /dev/null -w '%{http_code}' "$(url 'list?action=shares')")"
    expect "the page" 200 "$(code "http://127.0.0.1:$port/")"
    check_page
    expect "a picture for visitors" 200 "$(curl -s -o /dev/null -w '%{http_code}' "http://127.0.0.1:$port/favicon.ico")"
    expect "shares" 1 "$(ask "$(url 'list?action=shares')" | grep -c '"user":"alice"')"
    expect "no program" 404 "$(code "$(url nothing)")"
    expect "a method" 405 "$(code -X DELETE "$(url 'list?action=shares')")"
    expect "the figures" 404 "$(code "http://127.0.0.1:$port/orveld/status")"
    expect "a link that is not one" 404 "$(curl -s -o /dev/null -w '%{http_code}' "$(url 'share?FOLDER_SHARING=x')")"
    head -c 3000000 /dev/urandom >"$work/data"
    expect "upload" 200 "$(code -T "$work/data" "$(url "upload?path=/photo/$server/data")")"
    expect "upload by form" 200 "$(code -F path=/photo/$server -F "file=@$work/data;filename=form" "$(url upload)")"
    expect "too long a form" 413 "$(head -c 2000000 /dev/zero | code -H 'Expect:' --data-binary @- "$(url operation)")"
    # A length that nobody says is refused, or found out; the file is whole or not there.
    if [ "$(code -H 'Transfer-Encoding: chunked' -T "$work/data" "$(url "upload?path=/photo/$server/chunked")")" = 200 ]; then
        ask "$(url "download?path=/photo/$server/chunked")" | cmp -s - "$work/data" || expect "chunked" whole cut
    fi
    for name in data form; do
        ask "$(url "download?path=/photo/$server/$name")" | cmp -s - "$work/data" || expect "download of $name" same different
    done
    expect "part" "$(tail -c +1000001 "$work/data" | head -c 1000 | md5sum)" \
        "$(ask -r 1000000-1000999 "$(url "download?path=/photo/$server/data")" | md5sum)"
    expect "a zip" 200 "$(code "$(url "download?path=/photo/$server")")"
}

# An upload in pieces: methods, statuses and headers that nothing else uses.
check_pieces() {
    local at piece=(-H 'Tus-Resumable: 1.0.0' -H 'Expect:' -H 'Content-Type: application/offset+octet-stream' -X PATCH --data-binary @-)
    expect "abilities" 204 "$(code -X OPTIONS "$(url tus)")"
    at=$(url "tus$(ask -o /dev/null -D - -X POST -H 'Content-Length: 0' -H 'Tus-Resumable: 1.0.0' -H 'Upload-Length: 3000000' \
        "$(url "tus?path=/photo/$server/pieces")" | tr -d '\r' | sed -n 's/^[Ll]ocation: *\(.*\)/\1/p')")
    expect "first piece" 204 "$(head -c 1000000 "$work/data" | code "${piece[@]}" -H 'Upload-Offset: 0' "$at")"
    expect "a wrong sum" 460 "$(echo x | code "${piece[@]}" -H 'Upload-Offset: 1000000' -H 'Upload-Checksum: md5 kAFQmDzST7DWlj99KOF/cg==' "$at")"
    expect "how much" 1000000 "$(ask -I -H 'Tus-Resumable: 1.0.0' "$at" | tr -d '\r' | sed -n 's/^[Uu]pload-[Oo]ffset: //p')"
    expect "the rest" 204 "$(tail -c +1000001 "$work/data" | code "${piece[@]}" -H 'Upload-Offset: 1000000' "$at")"
    ask "$(url "download?path=/photo/$server/pieces")" | cmp -s - "$work/data" || expect "pieces" same different
    expect "its end" "204 404" "$(code -X DELETE -H 'Tus-Resumable: 1.0.0' "$at") $(code -X DELETE -H 'Tus-Resumable: 1.0.0' "$at")"
}

begin_upload() { # fd variable, name
    local login
    login=$(printf 'alice:%s' "$(password alice)" | base64 -w 0)
    printf 'PUT /cgi-bin/upload?path=/photo/%s/%s HTTP/1.1\r\nHost: x\r\nAuthorization: Basic %s\r\nContent-Length: 10\r\n\r\n12' \
        "$server" "$2" "$login" >&"$1"
}
reload() { kill -HUP "${pids[0]}"; }
one_runs() { status | grep -q '"running":1,'; }
is_refused() { [ "$(code "$(url 'list?action=shares')")" = 503 ]; }

# The first hop is the web server's, where orveld takes REMOTE_ADDR from; the next a proxy that the setting names. A
# client that has all it may have at a time shows whom orveld takes for the client.
check_address() {
    local fd other=(-H 'X-Forwarded-For: 9.9.9.9, 192.0.2.1')
    echo 'orveld_children_per_address="1"' >>"$settings"
    reload
    exec {fd}<>"/dev/tcp/127.0.0.1/$port"
    begin_upload "$fd" address
    until_true "the upload" one_runs
    until_true "the limit" is_refused
    expect "what nobody trusts" 503 "$(code "${other[@]}" "$(url 'list?action=shares')")"
    echo 'trusted_proxies="127.0.0.1"' >>"$settings"
    expect "a trusted proxy's word" 200 "$(code "${other[@]}" "$(url 'list?action=shares')")"
    sed -i '/^trusted_proxies/d; /^orveld_children_per_address/d' "$settings"
    exec {fd}>&-
    reload
}

# While many dawdle with their headers and bodies others are served.
check_slow() {
    local fds=() fd
    for i in $(seq "$slow"); do
        exec {fd}<>"/dev/tcp/127.0.0.1/$port" || break
        if [ $((i % 2)) -eq 0 ]; then
            printf 'GET /cgi-bin/list?action=shares HTTP/1.1\r\nHost: x\r\n' >&"$fd"
        else
            begin_upload "$fd" "slow$i"
        fi
        fds+=("$fd")
    done
    until_true "those beyond the limit to be turned away" none_waits
    local took
    took=$(ask -o /dev/null -w '%{http_code} %{time_total}' --interface 127.0.0.2 "$(url 'list?action=shares')")
    expect "beside slow ones" 200 "${took% *}"
    [ -z "${ORVEL_TEST_LONG:-}" ] || echo "$server: beside $slow slow ones: ${took#* } s"
    for fd in "${fds[@]}"; do exec {fd}>&-; done
    until_true "the end of the slow ones" idle
    expect "what they left" "" "$(ask "$(url "list?action=folder&path=/photo/$server")" | grep -o '"slow[0-9]*"')"
}
none_waits() { status | grep -q '"queued":0,'; }
idle() { status | grep -q '"running":0'; }

for server in "$@"; do
    if ! command -v "${server/%apache/apache2}" >/dev/null; then
        echo "FAILED: $server is not installed"
        failures=$((failures + 1))
        continue
    fi
    before=$failures
    serve
    check_requests
    check_pieces
    check_address
    check_slow
    stop KILL
    start
    expect "after a kill" 200 "$(code "$(url 'list?action=shares')")"
    stop TERM
    [ "$failures" -eq "$before" ] || { echo "--- $server:"; cat "$work/$server.log" "$work/orveld.log"; cat "$state/error.log" 2>/dev/null; }
done
expect "crashes" '"crashed":0' "$(status | grep -o '"crashed":[0-9]*')"
exit "$((failures > 0))"
