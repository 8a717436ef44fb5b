#!/usr/bin/env bash
# The page in a real browser, against the web server and a demo appliance made for the test.
#   run.sh SERVER BUILD [TEST...]
# ORVEL_TEST_SCREENSHOTS: where pictures of the main states and of failures go; without it none are taken.
set -uo pipefail
here=$(cd "$(dirname "$0")" && pwd)
export VEXO_GATE_LOGIN_SECONDS=600 # for those who type on a slow machine
. "$here/../apps/served.sh"
export ORVEL_TEST_PAM_TOLD=$build/tests/apps/pam_told.so
[ -r "$ORVEL_TEST_PAM_TOLD" ] || { echo "FAILED: pam_told is not built"; exit 1; }
shift 2
for program in node npm; do # Node.js 20 or later
    command -v "$program" >/dev/null || { echo "FAILED: $program is not installed"; exit 1; }
done
[ -x "${ORVEL_TEST_FIREFOX:-/usr/bin/firefox-esr}" ] || { echo "FAILED: firefox-esr is not installed"; exit 1; }
cmp -s "$here/package-lock.json" "$here/node_modules/.installed" ||
    { (cd "$here" && npm ci --no-audit --no-fund --loglevel=error) && cp "$here/package-lock.json" "$here/node_modules/.installed"; } ||
    { echo "FAILED: npm ci"; exit 1; }

[ -z "${ORVEL_TEST_SCREENSHOTS:-}" ] || mkdir -p "$ORVEL_TEST_SCREENSHOTS"
mkdir "$work/files"
export ORVEL_TEST_WORK=$work/files ORVEL_TEST_DEMO=$demo ORVEL_TEST_GATES=$gates ORVEL_TEST_KEPT=$demo/var/lib/vexo/listings ORVEL_TEST_URL=http://127.0.0.1:$port/
for user in alice bob admin; do export "ORVEL_TEST_${user^^}=$(password "$user")"; done
ORVEL_TEST_PHOTO=$(root_of photo) ORVEL_TEST_PROJECTS=$(root_of projects)
export ORVEL_TEST_PHOTO ORVEL_TEST_PROJECTS
tests=("$@")
[ "${#tests[@]}" -gt 0 ] || tests=("$here"/*.test.mjs)
node --experimental-websocket --test --test-concurrency=1 --test-reporter=spec "${tests[@]}" || failures=$((failures + 1))
finish
