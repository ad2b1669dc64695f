#!/usr/bin/env bash
# The main job on sample input: what a new user sees first.
set -euo pipefail
build=${1:-build}
fb="$build/apps/faultbox/faultbox"
echo "== faultbox $("$fb" --version | awk '{print $2}') =="
echo
echo "Every problem the tool finds is reported with a message number. Some of them:"
"$fb" messages 35 47 81
