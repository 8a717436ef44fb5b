#!/usr/bin/env bash
# Uploads and downloads through the web server: sizes, clients that go away, programs that are killed.
#   files_test.sh SERVER BUILD
# ORVEL_TEST_UPLOAD_MIB: size of the large upload, 256 without it.
set -uo pipefail
# The temporary place of the volume, /tmp/@tmp, is the machine's otherwise.
if [ "$(id -u)" -eq 0 ] && [ -z "${ORVEL_TEST_OWN_TMP:-}" ]; then
    ORVEL_TEST_OWN_TMP=$(mktemp -d)
    export ORVEL_TEST_OWN_TMP
    chmod 1777 "$ORVEL_TEST_OWN_TMP"
    unshare -m sh -c 'mount --bind "$ORVEL_TEST_OWN_TMP" /tmp || echo "with the temporary place of the machine"; exec "$@"' sh "$0" "$@"
    status=$?
    rm -rf "$ORVEL_TEST_OWN_TMP"
    exit $status
fi
. "$(dirname "$0")/served.sh"

if [ "$(id -u)" -ne 0 ]; then
    echo "SKIPPED: needs root, to act as the users of the demo"
    finish
fi

photo=$(root_of photo)
spool=/tmp/@tmp/orvel/upload-30001
url=http://127.0.0.1:$port/cgi-bin
as_alice=(-s -u "alice:$(password alice)")
code() { sed -n 's/.*"code":\([0-9]*\).*/\1/p' <<<"$1"; }
children() { cat "/proc/$1/task/$1/children" 2>/dev/null; }
for keeper in $(children "$pid"); do
    [ "$(cat "/proc/$keeper/comm")" != orveld-keeper ] || parent=$(children "$keeper")
done
programs() { # process ids of what works for alice
    local process
    for process in $(children "${parent% }"); do
        [ "$(stat -c %u "/proc/$process" 2>/dev/null)" != 30001 ] || echo "$process"
    done
}
await() { # what, command...: up to 20 seconds
    local what=$1
    shift
    for _ in $(seq 200); do
        "$@" && return
        sleep 0.1
    done
    expect "$what" "within 20 seconds" never
}
no_programs() { [ -z "$(programs)" ]; }
a_program_has_data() { [ -n "$(programs)" ] && [ "$(data_of_program)" -gt 1000000 ]; }
data_of_program() { # bytes that the upload holds in its nameless file
    local fd size=0
    for fd in /proc/"$(programs | head -1)"/fd/*; do
        [[ $(readlink "$fd") != "$spool"/* ]] || size=$(stat -Lc %s "$fd")
    done
    echo "$size"
}
nothing_left() { # after what
    await "$1: the program ends" no_programs
    expect "$1: what is in the temporary place" "" "$(ls -A "$spool")"
    expect "$1: what is in the share" "" "$(find "$photo" -name 'gone*')"
}

# Memory stays flat whatever the size: what the program takes for itself. Pages of libraries come and go with the
# page cache, and by how much the kernel maps at once.
mib=${ORVEL_TEST_UPLOAD_MIB:-256}
truncate -s "${mib}M" "$work/large"
printf end >>"$work/large"
# As slow as it takes to look at its memory many times.
curl "${as_alice[@]}" --limit-rate 128M -T "$work/large" "$url/upload?path=/photo/large" >"$work/reply" &
client=$!
peak=0
while kill -0 "$client" 2>/dev/null; do
    for program in $(programs); do
        now=$(awk '$1 == "RssAnon:" || $1 == "RssShmem:" { sum += $2 } END { print sum }' "/proc/$program/status" 2>/dev/null)
        [ "${now:-0}" -le "$peak" ] || peak=$now
    done
    sleep 0.05
done
expect "a large upload" 1 "$(grep -c '"success":true' "$work/reply")"
cmp "$work/large" "$photo/large" || expect "the stored bytes" "as sent" others
expect "its owner, group and mode" "30001:30100 644" "$(stat -c '%u:%g %a' "$photo/large")"
echo "upload of $mib MiB: at most $peak KiB of memory"
if ldd "$build/cgi/upload" | grep -q asan; then
    echo "SKIPPED: memory of an upload: the sanitizer takes its own"
else
    expect "memory below 16 MiB" yes "$([ "$peak" -gt 0 ] && [ "$peak" -lt 16384 ] && echo yes || echo "$peak KiB")"
fi
curl "${as_alice[@]}" "$url/download?path=/photo/large" | cmp - "$work/large" || expect "the bytes fetched" "as sent" others
expect "its end" end "$(curl "${as_alice[@]}" -r -3 "$url/download?path=/photo/large")"
curl "${as_alice[@]}" -F "file=@$work/large;filename=\"form é.bin\"" "$url/upload?path=/photo" >"$work/reply"
cmp "$work/large" "$photo/form é.bin" || expect "a large form" stored "$(cat "$work/reply")"

# A refusal arrives though the body is never read.
reply=$(curl -s -u "bob:$(password bob)" -T "$work/large" "$url/upload?path=/photo/x")
expect "a large upload that is refused" 407 "$(code "$reply")"

# Whatever ends an upload early leaves nothing.
slow_upload() { # further options of curl
    curl "${as_alice[@]}" "$@" --limit-rate 4M -T "$work/large" "$url/upload?path=/photo/gone/new/file" >"$work/reply" 2>&1 &
    client=$!
    await "an upload begins" a_program_has_data
}
slow_upload
kill "$client"
nothing_left "the client hung up"
slow_upload -m 5 # curl waits for the reply, the server for the rest
truncate -s 0 "$work/large"
wait "$client"
nothing_left "the source disappeared"
truncate -s "${mib}M" "$work/large"
for signal in TERM KILL; do
    slow_upload
    kill -"$signal" "$(programs)"
    nothing_left "SIG$signal"
    kill "$client" 2>/dev/null
    wait "$client"
done

finish
