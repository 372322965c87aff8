#!/usr/bin/env bash
# The walk-through of tools/demo/run: a short session with the `tessel` tool
# on a fresh appliance. Run it as root inside tests/sandbox/tessel-sandbox
# (with --pg), which provides the private paths, PostgreSQL and the demo
# users alice and bob:
#
#     walkthrough.sh PATH-TO-TESSEL
#
# Every step prints its command and the JSON it answered. The script stops
# with a non-zero status as soon as a step does not answer as expected.
set -euo pipefail

tessel=${1:?usage: walkthrough.sh PATH-TO-TESSEL}
work=$(mktemp -d /tmp/tessel-demo.XXXXXX)
# alice attaches files from here and downloads into it.
chown alice "$work"
trap 'rm -rf "$work"' EXIT

step=0
# heading "what it shows" COMMAND...: the step's number and title, and the
# command quoted so that it can be pasted into a shell.
heading() {
  step=$((step + 1))
  printf '\n== %d. %s\n$ tessel' "$step" "$1"
  shift
  local word
  for word in "$@"; do
    if [[ $word =~ ^[A-Za-z0-9_./=:@-]+$ ]]; then
      printf ' %s' "$word"
    else
      printf " '%s'" "${word//\'/\'\\\'\'}"
    fi
  done
  printf '\n'
}

# step "what it shows" COMMAND...: prints the heading, the command and its
# output; the output is kept in $out.
step() {
  heading "$@"
  shift
  out=$("$tessel" "$@")
  printf '%s\n' "$out"
}

# refused_step "what it shows" ERRNO COMMAND...: the same for a step that
# the library must refuse (exit status 1) with the error code ERRNO; its
# error stack is shown.
refused_step() {
  local title=$1 errno=$2
  shift 2
  heading "$title" "$@"
  local status=0
  "$tessel" "$@" >"$work/out" 2>"$work/err" || status=$?
  cat "$work/out" "$work/err"
  if [ "$status" -ne 1 ]; then
    echo "walkthrough: expected the library to refuse this step (exit 1), got $status" >&2
    exit 1
  fi
  if ! grep -q "^  ErrNo=\[$errno\]" "$work/err"; then
    echo "walkthrough: expected the error code $errno" >&2
    exit 1
  fi
}

# member NAME: a top-level string member of the last output.
member() {
  sed -n "s/^  \"$1\" : \"\\(.*\\)\",\\{0,1\\}\$/\\1/p" <<<"$out" | head -n 1
}

expect() {
  if [ "$1" != "$2" ]; then
    echo "walkthrough: $3: expected '$2', got '$1'" >&2
    exit 1
  fi
}

printf 'A note kept by alice in the namespace "demo", its versions, a file attached to it.\n'

step "Switch the store on" settings access set on
step "Switch the namespace demo on (for the application package DemoNotes)" \
  settings access set --ns demo --pkg DemoNotes on

# The package's installer would have made its target on a volume; the
# namespace's folder goes to that volume.
mkdir -p /volume1/@appstore/DemoNotes /var/packages/DemoNotes
ln -sfn /volume1/@appstore/DemoNotes /var/packages/DemoNotes/target
step "Give the namespace its folder, on the volume of the package" namespace create --ns demo

printf 'Milk\nBread\n' >"$work/list-v1.txt"
printf 'Milk\nBread\nEggs\n' >"$work/list-v3.txt"

step "alice creates a note with two text fields and an attached file" \
  --as alice create --ns demo --category note --text title=Shopping --text body="Milk and bread" \
  --binary list.txt="$work/list-v1.txt" --commit-msg "first draft"
id=$(member id)
v1=$(member version)
[ -n "$id" ] && [ -n "$v1" ] || { echo "walkthrough: create printed no id or version" >&2; exit 1; }

step "alice edits the body (a second version)" \
  --as alice set --ns demo --id "$id" --text body="Milk, bread and eggs" --commit-msg "eggs"
v2=$(member version)

step "alice edits again and replaces the attached file (a third version)" \
  --as alice set --ns demo --id "$id" --text title="Shopping, Saturday" --binary list.txt="$work/list-v3.txt" \
  --commit-msg "Saturday"
v3=$(member version)
[ "$v1" != "$v2" ] && [ "$v2" != "$v3" ] || { echo "walkthrough: the edits made no new versions" >&2; exit 1; }

step "The note's three versions" --as alice versions list --ns demo --id "$id"
expect "$(sed -n 's/^  "count" : \([0-9]*\),\{0,1\}$/\1/p' <<<"$out")" "3" "versions listed"

step "What changed between the first and the third version" \
  --as alice versions diff --ns demo --id "$id" --old "$v1" --new "$v3"

step "The note as it was at the first version" --as alice get --ns demo --id "$id" --version "$v1"
expect "$(member version)" "$v1" "version read"

refused_step "bob asks for the note: alice has not shared it, so he is refused" 1020 \
  --as bob get --ns demo --id "$id"

step "alice downloads the attached file as it is now" \
  --as alice download --ns demo --id "$id" --name list.txt --output "$work/downloaded.txt"
cmp "$work/downloaded.txt" "$work/list-v3.txt"

printf '\nThe walk-through is complete: %d steps.\n' "$step"
