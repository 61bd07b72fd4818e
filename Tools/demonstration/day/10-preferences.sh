# SPDX-License-Identifier: Apache-2.0
# Preferences: a real carrier file goes through the helper, value by value.
file=/mnt/com.zarvo.carrier.plist
domain=com.zarvo.carrier

# Keys of the carrier file, and one value as a property list of its own.
keys() {
  python3 - "$file" <<'END'
import plistlib, sys
print("\n".join(plistlib.load(open(sys.argv[1], "rb"))))
END
}
value_of() {
  python3 - "$file" "$1" <<'END'
import plistlib, sys
sys.stdout.buffer.write(plistlib.dumps(plistlib.load(open(sys.argv[1], "rb"))[sys.argv[2]]))
END
}

say "A handset of our own: nothing runs yet, the launcher holds the service port."
show ls -l /run/halvec/ports
show handset status

say "halvecctl is let in, because root has listed it; so is every program that root lists."
show handset entitle $tools/halvecctl root
await_watcher

say "Every value of a carrier file goes through it."
for key in $(keys); do
  value_of "$key" | $tools/halvecctl preference set $domain "$key" --plist -
  echo "set $key"
done
show handset status

say "Read back through the helper."
for key in CarrierName AccessPoints SignalThreshold; do
  show $tools/halvecctl preference get $domain $key
done
for key in $(keys); do
  $tools/halvecctl preference get $domain "$key" --xml >/tmp/back.plist
  value_of "$key" >/tmp/sent.plist
  python3 - <<'END'
import plistlib
same = plistlib.load(open("/tmp/back.plist", "rb")) == plistlib.load(open("/tmp/sent.plist", "rb"))
raise SystemExit(0 if same else "a value came back changed")
END
done
echo "every value came back as it was sent"

say "What is stored, and what the helper logged on the way."
show ls -l /root/Library/Preferences
python3 -c "
import plistlib, pprint
pprint.pprint(plistlib.load(open('/root/Library/Preferences/$domain.plist', 'rb')), sort_dicts=False)"
handset log | tail -n 3

say "The same program, run by a user whom nobody has listed, is refused with 35."
printf '$ halvecctl preference get %s CarrierName     # as mobile\n' $domain
code=0
handset as mobile -- $tools/halvecctl preference get $domain CarrierName 2>&1 || code=$?
[ $code -eq 4 ] || { echo "expected a refusal"; exit 1; }
