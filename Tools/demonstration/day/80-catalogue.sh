# SPDX-License-Identifier: Apache-2.0
# The rest of the catalogue, and what the day has served of it.
say "What the day has not needed yet: a preference as an application sees it, a file, a token, a link."
show $tools/halvecctl preference get $domain CarrierName --app
show $tools/halvecctl plist show /root/Library/Preferences/com.zarvo.lasd.plist | head -n 12
show $tools/halvecctl voicemail token clear
show $tools/halvecctl bundle unlink "$library/Carrier Bundle.bundle"

say "Every request of the catalogue has been served today, as root's monitor saw it."
kill $watcher
wait $watcher 2>/dev/null || true
$tools/halvecctl list --json >/tmp/catalogue
python3 - /tmp/catalogue $served <<'END'
import collections, json, sys
catalogue, served = (open(path).read() for path in sys.argv[1:])
events = [json.loads(line) for line in served.splitlines()]
count = collections.Counter(event["Request"] for event in events)
slowest = {name: max(e["Microseconds"] for e in events if e["Request"] == name) for name in count}
names = [request["name"] for request in json.loads(catalogue)]
for name in names:
    print(f"{count[name]:4} x {name:32} slowest {slowest.get(name, 0):7} us")
missing = [name for name in names if not count[name]]
raise SystemExit(f"never served: {missing}" if missing else 0)
END
