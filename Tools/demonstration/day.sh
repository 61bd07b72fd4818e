#!/bin/sh
# SPDX-License-Identifier: Apache-2.0
# What ./run shows, from inside the simulated handset: the steps of day/ in the order of their names.
set -eu
tools=/usr/libexec/halvec
steps=/mnt/day

number=0
# Opens a step: numbers it and says what it shows.
say() {
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

for step in "$steps"/*.sh; do . "$step"; done
