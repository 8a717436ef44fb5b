# Sourced by what serves a demo appliance with orveld behind a web server, with $source and $build set.
# Gives $demo, $settings, $socket, $user, $work, $pids, expect, until_true, password, status, serve and stop.
PATH=$PATH:/usr/sbin
work=$(mktemp -d)
chmod 755 "$work"
demo=$work/demo
settings=$demo/etc/vexoinfo.conf
failures=0
pids=()
server_pid=
cleanup() {
    [ -z "$server_pid" ] || kill "$server_pid" 2>/dev/null
    [ "${#pids[@]}" -eq 0 ] || kill "${pids[@]}" 2>/dev/null
    wait 2>/dev/null
    [ ! -e "$demo" ] || "$build/bin/orvel-demo" "$demo" --remove >/dev/null 2>&1
    rm -rf "$work"
}
trap cleanup EXIT
expect() { # what, wanted, got
    [ "$2" = "$3" ] && return
    echo "FAILED: $server: $1: wanted '$2', got '$3'"
    failures=$((failures + 1))
}
until_true() { # what, command...
    local what=$1
    shift
    for _ in $(seq 1200); do
        "$@" >/dev/null 2>&1 && return
        sleep 0.1
    done
    expect "$what" "in two minutes" never
}

user=$(id -un)
user_lighttpd='' user_nginx='' user_apache=''
if [ "$(id -u)" -eq 0 ]; then
    user=www-data
    user_lighttpd='server.username = "www-data"' user_nginx='user www-data;' user_apache=$'User www-data\\\nGroup www-data'
fi
accounts=$("$build/bin/orvel-demo" "$demo") || exit 1
password() { awk -v user="$1" '$1 == "user" && $2 == user { print $4 }' <<<"$accounts"; }
printf 'orveld_web_servers="%s"\norveld_trusted_logins="%s"\n' "$user" "$user" >>"$settings"
"$source/packaging/web/make-page" "$source/apps/web" "$work/web"
cp "$demo/etc/vexo/users.htpasswd" "$work/logins"
chmod -R a+rX "$work/web" "$work/logins"
socket=$work/orveld.socket
VEXO_ROOT=$demo VEXO_LOGIN_PROGRAM=$build/bin/vexo-login "$build/bin/orveld-keeper" "$socket" "$build/bin/orveld" 2>"$work/orveld.log" &
pids+=($!)
status() { "$build/apps/orvelctl/orvelctl" --root "$demo" status --socket "$socket" --json; }
server=orveld
until_true "orveld" status

fill() { printf 's|@%s@|%s|g\n' "$1" "$(printf '%s' "$2" | sed 's/[|&]/\\&/g')"; }
configure() { # template, user line
    sed -f <(fill ADDRESS 127.0.0.1; fill PORT "$port"; fill WEB "$work/web"; fill STATE "$state"; fill LOGINS "$work/logins"
             fill SOCKET "$socket"; fill USER "$2"; fill MODULES /usr/lib/apache2/modules
             fill COMMON "$source/packaging/web/lighttpd.common.conf") "$source/packaging/$1" >"$state/$1"
}
start() {
    case "$server" in
        lighttpd) exec lighttpd -D -f "$state/lighttpd.conf.in" ;;
        nginx) exec nginx -p "$state" -c "$state/nginx.conf.in" ;;
        apache) exec apache2 -D FOREGROUND -f "$state/apache.conf.in" ;;
    esac >>"$work/$server.log" 2>&1 &
    server_pid=$!
    until_true "start" answers
}
answers() { (exec 3<>"/dev/tcp/127.0.0.1/$port") 2>/dev/null; }
stop() { # signal
    local workers
    workers=$(cat "/proc/$server_pid/task/$server_pid/children")
    # shellcheck disable=SC2086
    if [ "$1" = KILL ]; then kill -KILL "$server_pid" $workers; else kill "-$1" "$server_pid"; fi
    wait "$server_pid" 2>/dev/null
    server_pid=
}
# Starts $server with its configuration on a port of its own.
serve() {
    local user_line=user_$server
    port=$((20000 + $$ * 4 % 12000))
    while answers; do port=$((port + 1)); done
    state=$work/$server
    mkdir -p "$state"
    configure "$server.conf.in" "${!user_line}"
    [ "$(id -u)" -ne 0 ] || chown "$user" "$state"
    start
}
