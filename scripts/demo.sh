#!/usr/bin/env bash
# The main job on sample input: what a new user sees first. It checks the
# sample benches' pin files, shows a failure class file, and opens each bench
# as a failure simulation system.
set -euo pipefail
build=${1:-build}
fb="$build/apps/faultbox/faultbox"
# The sample failure class files are built into the default-file layout here.
export NORVIK_ROOT="$build/data/norvik"
# Keep the user's own settings out of the demo.
export FAULTBOX_CONFIG="$build/demo-settings.ini"

step() { printf '\n== %s ==\n$ %s\n' "$1" "${*:2}"; "${@:2}"; }

echo "faultbox $("$fb" --version | awk '{print $2}'): failure insertion for HIL test benches"
echo "Sample benches are in data/, sample failure classes in data/failure-classes/."

step "Check a KR60 bench's pin file (every problem would be reported with a message number)" \
  "$fb" pinfile check data/kr60_bench.csv
step "The failure classes a KR80 bench offers" \
  "$fb" fcd show "$NORVIK_ROOT/Cockpit/Users/AllUsers/FailureClassesKR80.fcd"
step "Open the KR40 bench as a failure simulation system" \
  "$fb" system info data/kr40_bench.csv
step "Open the KR60 bench (with its additional pin file and external hardware addresses)" \
  "$fb" system info data/kr60_bench.csv
echo
echo "What does a message number mean? For example:"
"$fb" messages 47
