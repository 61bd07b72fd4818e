# SPDX-License-Identifier: Apache-2.0
# Where the handset is: coordinates go to the helper, civic info comes to the telephony daemon.
atlas=/usr/share/halvec/atlas.bin
told=$(handset telephony log | wc -l)

# Shows a look-up, and what the telephony daemon is told of it behind the connection's first line.
locate() {
  show $tools/halvecctl location resolve "$@"
  handset telephony log --skip "$told" --count 2 --timeout 20 | tail -n 1
  told=$((told + 2))
}

say "The handset is set up for the country of its time zone."
ln -sf /usr/share/zoneinfo/Europe/Zurich /etc/localtime
show $tools/halvecctl location country

if [ -z "$quick" ]; then
  say "A look-up that takes too long: strace holds it up for six seconds where it opens its atlas. \
After five the telephony daemon is told the country alone; the late answer is dropped."
  helper=$(handset wait-start --timeout 5)
  lines=$(handset log | wc -l)
  strace -f -qq -o /dev/null -p "$helper" -P $atlas -e trace=openat \
    -e inject=openat:delay_enter=6000000 2>/dev/null &
  tracer=$!
  until grep -q '^TracerPid:.[1-9]' "/proc/$helper/status"; do :; done
  locate 47.3769 8.5417
  handset log --skip "$lines" --follow-until "wasn't waiting" --timeout 20
  kill $tracer
  wait $tracer 2>/dev/null || true
fi

say "In time: Zurich, Hong Kong, San Juan of Puerto Rico, Monaco, Malindi in Kenya, Suva in Fiji."
locate 47.3769 8.5417
locate 22.2819 114.1582
locate 18.4655 -66.1057
locate 43.7384 7.4246
locate -3.2192 40.1169
locate -18.1416 178.4419

say "In the open sea, and at (0, 0), which means that nobody knows, it is the country alone."
locate -48.8767 -123.3933
locate 0 0
