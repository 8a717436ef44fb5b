# Sourced behind tests/apps/served.sh: one more web server before the same orveld, which hands on what proxies say of their
# clients' addresses, so that one machine can be many. Nobody is blocked. Gives $front, its port.
printf 'trusted_proxies="127.0.0.1"\nautoblock_enable="no"\n' >>"$demo/etc/vexoinfo.conf"
front=$((port + 1))
while (exec 3<>"/dev/tcp/127.0.0.1/$front") 2>/dev/null; do front=$((front + 1)); done
sed -e "s/^server.port = .*/server.port = $front/" -e '/HTTP_X_FORWARDED_FOR/d' "$demo/run/lighttpd/lighttpd.conf" >"$work/front.conf"
lighttpd -D -f "$work/front.conf" &
front_pid=$!
trap 'kill "$front_pid" 2>/dev/null; cleanup' EXIT
for _ in $(seq 600); do (exec 3<>"/dev/tcp/127.0.0.1/$front") 2>/dev/null && break; sleep 0.1; done
