#!/usr/bin/env bash
# Public links through the web server, from their making to their end.
#   links_test.sh SERVER BUILD
set -uo pipefail
. "$(dirname "$0")/served.sh"

site=http://127.0.0.1:$port
share=$site/cgi-bin/share
photo=$(root_of photo)
ctl() { "$build/apps/orvelctl/orvelctl" --root "$demo" "$@" 2>/dev/null; }
link() { ctl link create "$@" --user alice | head -1; }
jar() { echo "$work/jar"; }
status() { curl -s -o "$work/body" -w '%{http_code}' -b "$(jar)" -c "$(jar)" "$@"; } # of a request, its body in $work/body
visit() { status "$share?FOLDER_SHARING=$1&action=list&${2:-}" "${@:3}"; }             # link, more of the query, options
names() { grep -o '"name":"[^"]*"' "$work/body" | cut -d'"' -f4 | tr '\n' ' '; }
enter() { # link, password, options: comes again for as long as it is not its turn
    local code turn=
    for _ in $(seq 60); do
        code=$(status -d action=login --data-urlencode "password=$2" -d "turn=$turn" "$share?FOLDER_SHARING=$1" "${@:3}")
        turn=$(sed -n 's/.*"turn":"\([0-9a-f]*\)".*/\1/p' "$work/body")
        [ "$code" = 429 ] || break
        sleep "$(awk -v ms="$(sed -n 's/.*"wait":\([0-9]*\).*/\1/p' "$work/body")" 'BEGIN { print ms / 1000 }')"
    done
    echo "$code"
}

mkdir -p "$photo/shared/inner" "$photo/secret"
echo one >"$photo/shared/one.txt"
echo two >"$photo/shared/inner/two.txt"
echo hidden >"$photo/secret/hidden.txt"
ln -s inner "$photo/shared/within"
ln -s ../secret "$photo/shared/out"
mkdir "$photo/shared/<script>evil('&"
[ "$(id -u)" -ne 0 ] || chown -R 30001:30100 "$photo/shared" "$photo/secret"

# A folder without a password: nobody logs in, and no cookie is set.
free=$(link /photo/shared)
expect "listing before the page" 200 "$(visit "$free")"
expect "the page" 200 "$(status "$share?FOLDER_SHARING=$free")"
expect "its lines" 29 "$(wc -l <"$work/body")"
expect "its path" 1 "$(grep -c "var g_FolderPath = '/photo/shared';" "$work/body")"
expect "listing" 200 "$(visit "$free" sort_by=name)"
expect "what is shared" "shared <script>evil('& inner one.txt " "$(names)"
expect "the folder inside" 200 "$(visit "$free" path=/inner)"
expect "what is inside" "inner two.txt " "$(names)"
visit "$free" path=within >/dev/null
expect "through a link that stays within" "inner two.txt " "$(names)"
for path in out ../secret inner/../../secret /photo/secret .. ./../.. %2e%2e/secret; do
    visit "$free" "path=$path" >/dev/null
    expect "listing of $path" 0 "$(grep -c hidden "$work/body")"
    code=$(status "$share?FOLDER_SHARING=$free&action=download&path=$path/hidden.txt")
    expect "download of $path" "refused" "$([ "$code" = 200 ] && echo 200 || echo refused)"
done
expect "download" one "$(curl -s -b "$(jar)" "$share?FOLDER_SHARING=$free&action=download&path=one.txt")"
expect "its end" e "$(curl -s -b "$(jar)" -r 2-2 "$share?FOLDER_SHARING=$free&action=download&path=one.txt")"
curl -s -b "$(jar)" -o "$work/all.zip" "$share?FOLDER_SHARING=$free&action=download"
expect "everything as zip" "shared/inner/two.txt shared/one.txt" "$(grep -ao 'shared/[a-z/]*\.txt' "$work/all.zip" | sort -u | xargs)"
expect "a prefix that would end the script" 400 "$(status "$share?FOLDER_SHARING=$free&tunnel=/a'%3b")"

# A file behind a password, at the same time as the folder.
file=$(link /photo/shared/one.txt --password 'pass word')
expect "the page of a password" 200 "$(status "$share?FOLDER_SHARING=$file")"
expect "listing without it" 401 "$(visit "$file")"
expect "its state" 200 "$(status "$share?FOLDER_SHARING=$file&action=state")"
expect "that it takes one" 1 "$(grep -c '"logged_in":false,"password":true' "$work/body")"
expect "a wrong one" 403 "$(enter "$file" word)"
expect "the right one" 200 "$(enter "$file" 'pass word')"
expect "the file alone" 200 "$(visit "$file")"
expect "its name" "one.txt one.txt " "$(names)"
expect "the file itself" one "$(curl -s -b "$(jar)" "$share?FOLDER_SHARING=$file&action=download")"
expect "nothing beside it" 404 "$(status "$share?FOLDER_SHARING=$file&action=download&path=../one.txt")"
expect "the folder still" 200 "$(visit "$free")"
expect "cookies" 2 "$(grep -cE "$free|$file|$file-seal" "$(jar)")"

# A password that the tool proposes: 80 bits.
{ read -r proposed; read -r _; read -r word; } < <(ctl link create /photo/shared --propose --user alice)
expect "its length" 20 "${#word}"
expect "it opens" 200 "$(enter "$proposed" "$word" --interface 127.0.0.4)"

# A session belongs to its address.
expect "from another address" 401 "$(visit "$file" "" --interface 127.0.0.3)"
echo 'skip_checksrcip="yes"' >>"$demo/etc/vexoinfo.conf"
expect "where that does not count" 200 "$(visit "$file" "" --interface 127.0.0.3)"

# Before and after their time; what that means to the second is tested where it is judged.
now=$(date +%s)
page() { status "$share?FOLDER_SHARING=$1&action=list"; }
expect "too early" 404 "$(page "$(link /photo/shared --from "$((now + 100000))" --until "$((now + 200000))")")"
expect "too late" 404 "$(page "$(link /photo/shared --until "$((now - 200000))")")"

# Ends of links: revoked, the account ended, the owner another one.
expect "one's own links" 5 "$(curl -s -u "alice:$(password alice)" "$site/cgi-bin/link?action=list" | grep -o '"id"' | wc -l)"
revoke() { curl -s -u "$1:$(password "$1")" -d action=revoke -d "id=$2" "$site/cgi-bin/link"; }
expect "another's link" 1 "$(revoke bob "$file" | grep -c '"success":false')"
expect "revoking it" 1 "$(revoke alice "$file" | grep -c '"success":true')"
expect "a revoked link" 404 "$(visit "$file")"
cp "$demo/etc/shadow" "$work/shadow"
sed -i 's/^alice:.*/alice:x:1:0:9:7::7:/' "$demo/etc/shadow"
expect "an account that ended" 404 "$(visit "$free")"
cp "$work/shadow" "$demo/etc/shadow"
expect "and goes on" 200 "$(visit "$free")"
cp "$demo/etc/passwd" "$work/passwd"
sed -i 's/^alice:x:[0-9]*/alice:x:30077/' "$demo/etc/passwd"
expect "an owner made anew" 404 "$(visit "$free")"
sed -i '/^alice:/d' "$demo/etc/passwd"
expect "a deleted owner" 404 "$(visit "$free")"
cp "$work/passwd" "$demo/etc/passwd"

# Who may make links, and of what.
make() { curl -s -u "$1:$(password "$1")" -d action=create --data-urlencode "path=$2" "$site/cgi-bin/link" | sed -n 's/.*"code":\([0-9]*\).*/\1/p'; }
expect "by anybody" "" "$(make bob /photo)"
expect "of a foreign share" 407 "$(make bob /projects)"
expect "of what is not there" 408 "$(make alice /photo/none)"
ctl sharing set admin_only
expect "by administrators" 407 "$(make bob /photo)"
ctl sharing set everybody

# Too many wrong passwords: the address is out, others are not.
guarded=$(link /photo/shared --password x)
echo 'autoblock_attempts="2"' >>"$demo/etc/vexoinfo.conf"
for _ in 1 2; do enter "$guarded" wrong --interface 127.0.0.2 >/dev/null; done
expect "the right password, too late" 403 "$(enter "$guarded" x --interface 127.0.0.2)"
expect "any page" 403 "$(status "$share?FOLDER_SHARING=$free" --interface 127.0.0.2)"
expect "from another address" 200 "$(enter "$guarded" x)"

# What the page names is there for everybody, and nothing else is.
status "$share?FOLDER_SHARING=$free" -H 'Accept-Language: de' >/dev/null
grep -oE "(src|href)='[^']*'" "$work/body" | cut -d"'" -f2 >"$work/named"
expect "addresses" 15 "$(wc -l <"$work/named")"
while read -r address; do
    type=$(curl -s -o "$work/part" -w '%{http_code} %{content_type}' "$site$address")
    case "$address" in
        *.css*) expect "$address" "200 text/css; charset=utf-8" "$type" ;;
        *) expect "$address" "200 text/javascript; charset=utf-8" "$type" ;;
    esac
    cat "$work/part" >>"$work/parts"
done <"$work/named"
expect "German" 1 "$(grep -c 'Größe' "$work/parts")"
view=$(grep -oE 'import\(g_Tunnel \+ "[^"]*"' "$work/parts" | cut -d'"' -f2)
expect "the view" 1 "$(curl -s "$site$view" | grep -c 'export function start')"
for address in / /cgi-bin/list /cgi-bin/link /visitor/../index.html /visitor/..%2fcgi-bin/list /cgi-bin/share/../list; do
    expect "$address" 401 "$(curl -s --path-as-is -o /dev/null -w '%{http_code}' "$site$address")"
done
expect "an unknown link" 404 "$(status "$share?FOLDER_SHARING=%27%20OR%201%20--")"
: >"$demo/usr/vexo/etc/pexlander/pxsharing.db"
expect "a broken database" 500 "$(visit "$free")"
finish
