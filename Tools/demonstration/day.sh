#!/bin/sh
# SPDX-License-Identifier: Apache-2.0
# What ./run shows, from inside the simulated handset: the steps of day/ in the order of their names.
# With --quick, without those that do nothing but wait.
set -eu
quick=${1:-}
tools=/usr/libexec/halvec
steps=/mnt/day

number=0
begin=$(date +%s%N)
# Says how long the last step took.
took() {
  [ $number -eq 0 ] || printf '\033[2m%d ms\033[0m\n' $((($(date +%s%N) - begin) / 1000000))
  begin=$(date +%s%N)
}
# Opens a step: numbers it and says what it shows.
say() {
  took
  number=$((number + 1))
  printf '\n\033[1m%d. %s\033[0m\n' "$number" "$*"
}
# Shows a command as a person would type it, then runs it.
show() {
  line='$'
  for word; do
    case $word in *' '*) line="$line '$word'" ;; *) line="$line $word" ;; esac
  done
  printf '%s\n' "$line" | sed "s|$tools/||g"
  "$@"
}

# Every message that a helper serves from now on, until the last step looks at the list.
served=/tmp/served
: >$served
while handset wait-start --timeout 120 >/dev/null; do
  $tools/halvecctl --json monitor >>$served 2>/dev/null || true
done &
watcher=$!
# Goes on once the monitor sees what the present helper serves.
await_watcher() {
  lines=$(wc -l <$served)
  until [ "$(wc -l <$served)" -gt "$lines" ]; do
    $tools/halvecctl voicemail token get >/dev/null || true
  done
}

for step in "$steps"/*.sh; do . "$step"; done
took
