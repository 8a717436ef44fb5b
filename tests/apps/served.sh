# Sourced by tests that go through the web server, called as TEST SERVER BUILD: serves a demo appliance made for the test.
# Gives $demo, $port, $log, $pid, $build, $work, expect, password, root_of and finish.
server=$1
build=$(realpath "$2")
PATH=$PATH:/usr/sbin
for program in lighttpd curl; do
    command -v "$program" >/dev/null || { echo "FAILED: $program is not installed"; exit 1; }
done

# A process that took on another identity cannot be traced, which is how leaks are looked for.
export ASAN_OPTIONS=detect_leaks=0

work=$(mktemp -d)
chmod 755 "$work"
demo=$work/demo
log=$work/server.log
pid=
failures=0
cleanup() {
    [ -z "$pid" ] || { kill "$pid" 2>/dev/null; wait "$pid" 2>/dev/null; }
    [ ! -e "$demo" ] || "$build/bin/orvel-demo" "$demo" --remove >/dev/null
    rm -rf "$work"
}
trap cleanup EXIT

expect() { # what, wanted, got
    if [ "$2" != "$3" ]; then
        echo "FAILED: $1: wanted '$2', got '$3'"
        failures=$((failures + 1))
    fi
}

# A program that calls OPERATION is held while the file of that name is in $gates (see platform/linux/fault_gate.h).
gates=$work/gates
mkdir -m 777 "$gates"
for operation in VEXOFileCopy FILEIDXOutputDBInsert KTR::Task::beginUpdate; do
    VEXO_GATE_HOLD="${VEXO_GATE_HOLD:+$VEXO_GATE_HOLD;}$operation=$gates/$operation"
done
export VEXO_GATE_HOLD
# A PAM service that a test lays here judges the log-ins while it does.
export VEXO_GATE_PAM=$work/pam
mkdir "$VEXO_GATE_PAM"

# Below what the kernel gives to clients; by the process, so that two tests at once begin apart.
port=$((20000 + $$ * 4 % 12000))
while (exec 3<>"/dev/tcp/127.0.0.1/$port") 2>/dev/null; do port=$((port + 1)); done
"$server" --port "$port" --root "$demo" --build "$build" >"$log" 2>&1 &
pid=$!
limit=$((SECONDS + 300))
until (exec 3<>"/dev/tcp/127.0.0.1/$port") 2>/dev/null; do
    kill -0 "$pid" 2>/dev/null || { cat "$log"; echo "FAILED: the server ended"; exit 1; }
    [ "$SECONDS" -lt "$limit" ] || { cat "$log"; echo "FAILED: waited in vain for the server"; exit 1; }
    sleep 0.1
done

password() { awk -v user="$1" '$1 == "user" && $2 == user { print $4 }' "$log"; }
# The real folder of a share of the demo.
root_of() { "$build/apps/orvelctl/orvelctl" --root "$demo" ls / --user alice --json --additional real_path 2>/dev/null |
    grep -o "\"real_path\":\"[^\"]*-$1\"" | cut -d'"' -f4; }
finish() {
    [ "$failures" -eq 0 ] || { echo "--- server:"; cat "$log"; }
    exit "$((failures > 0))"
}
