#!/usr/bin/env bash
# The main job on the simulated benches: what a new user sees first. For a
# KR60 and a KR40 sample bench it creates a document from the pin file,
# builds a failure pattern, and drives it in a shell session on the built-in
# simulator: connect, activate, look at the relays, deactivate, disconnect.
set -euo pipefail
build=$(cd "${1:-build}" && pwd)
source=$(cd "$(dirname "$0")/.." && pwd)
fb="$build/apps/faultbox/faultbox"
# The sample failure class files are built into the default-file layout here.
export NORVIK_ROOT="$build/data/norvik"

# A fresh folder for the documents; the bench folder holds its pin files.
work="$build/demo"
rm -rf "$work"
mkdir -p "$work"
cp "$source"/data/kr60_bench.csv "$source"/data/kr60_additional.csv "$source"/data/kr40_bench.csv "$work"/
cd "$work"
# Keep the user's own settings out of the demo; the sessions ask for the
# simulator with --hardware sim, which is never taken otherwise. Answer
# waits of about 60 ms instead of 20 let the simulated serial bench keep up
# on a busy machine.
export FAULTBOX_CONFIG="$work/settings.ini"
printf '[Components\\Faultbox.Component]\nTimeout=3000\n' >"$FAULTBOX_CONFIG"

# Warnings and errors show with the rest of the output; progress notes
# (info and note messages) would bury the story and come only with --verbose.
faultbox() { "$fb" "$@" 2>&1; }
heading() { printf '\n== %s ==\n' "$1"; }
# Shows the command as a user would type it, then runs it.
run() {
  local line='$ faultbox' arg
  for arg in "$@"; do
    if [[ $arg == *' '* ]]; then line+=" \"$arg\""; else line+=" $arg"; fi
  done
  echo "$line"
  faultbox "$@"
}

echo "faultbox $(faultbox --version | awk '{print $2}'): failure insertion for HIL test benches"
echo "Working in $work with the sample benches of data/."
echo "Warnings and errors carry a number: \`faultbox messages N\` explains message N."

heading "KR60 bench (CAN): create a document from the pin file"
run doc new --pin-file kr60_bench.csv --author Demo chassis.fsa

heading "Build a pattern: open the lines of two wheel speed sensors"
echo "(Failure class 1 switches relay 2 of the pin's load channel: the line opens.)"
run pattern create chassis.fsa "Wheel sensors"
run pattern add-pins chassis.fsa "Wheel sensors" --pin ABS_ESP 1 --pin ABS_ESP 2
run pattern set-class chassis.fsa "Wheel sensors" --pin ABS_ESP 1 --pin ABS_ESP 2 1

heading "Drive it on the simulated KR60 bench"
echo '$ faultbox shell chassis.fsa --hardware sim    (commands from standard input)'
faultbox shell chassis.fsa --hardware sim <<'END'
connect
activate "Wheel sensors"
deactivate
disconnect
END

heading "KR40 bench (serial line): create a document"
run doc new --pin-file kr40_bench.csv --author Demo body.fss

heading "Build a pattern: short a window line to battery, and let the interlock choose for another pin"
run pattern create body.fss "Door lock"
run pattern add-pins body.fss "Door lock" --pin DCU_FL X1.3 --pin DCU_FL X1.4
run pattern set-class body.fss "Door lock" --pin DCU_FL X1.3 2
run pattern config body.fss "Door lock" --pin DCU_FL X1.4 3 1

heading "Drive it on the simulated KR40 bench"
echo "(The reset on connecting asks every module address 0 to 127 in turn and"
echo "waits for each: this takes a few seconds.)"
echo '$ faultbox shell body.fss --hardware sim'
faultbox shell body.fss --hardware sim <<'END'
connect
activate "Door lock"
status
deactivate
disconnect
END
echo "(Relay 2 of module 0x11 is X1.3, relay 3 is X1.4; a relay's state holds the"
echo "pin's PinConfig entries as bits: entry 1 is state 2, entry 3 is state 8.)"

heading "Next steps"
echo "docs/command-line.md walks through every command; \`faultbox activate\` does one"
echo "connect-activate-hold-deactivate run, \`faultbox shell\` reads commands from a"
echo "terminal too, and --trace FILE records every frame or byte. Without --hardware sim"
echo "both drive the real bench that the settings name."
