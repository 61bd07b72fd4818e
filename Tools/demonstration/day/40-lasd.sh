# SPDX-License-Identifier: Apache-2.0
# LASD databases: a server behind the Wi-Fi link offers them, the helper fetches what is new.
host=configuration.zarvo.example
web=/run/handset/web
told=$(handset telephony log | wc -l)

# offer TYPE VERSION: the database, and its place in the manifest.
offer() {
  echo "cells of $1, version $2" | gzip >$web/$1.db.gz
  python3 - $web/1/v3/lasd.plist "$1" "$2" "https://$host/$1.db.gz" <<'END'
import os, plistlib, sys
path, kind, version, url = sys.argv[1:]
os.makedirs(os.path.dirname(path), exist_ok=True)
manifest = plistlib.load(open(path, "rb")) if os.path.exists(path) else {}
manifest[kind] = {"Version": version, "ContentURL": url}
plistlib.dump(manifest, open(path, "wb"))
END
}
# Prints the next notifications of which there are $1.
heard() {
  handset telephony log --skip "$told" --count "$1" --timeout 30
  told=$((told + $1))
}
cellular() { handset network counters --json pdp_ip0; }

say "A server behind Wi-Fi offers five databases. The default route goes over cellular."
mkdir -p /var/mobile/Library
for kind in gsm umts cdma lte scdma; do offer $kind 2026.1; done
before=$(cellular)
show ip route
show $tools/halvecctl lasd update
heard 5
show $tools/halvecctl lasd status

say "One gets a new version and one is rolled back; the others are left alone."
offer lte 2026.2
offer umts 2025.9
show $tools/halvecctl lasd update
heard 2
show head /var/mobile/Library/LASD/lte.db /var/mobile/Library/LASD/umts.db
show handset web log --count 9 --timeout 20
[ "$(cat /var/mobile/Library/LASD/umts.db)" = "cells of umts, version 2025.9" ]

say "Nothing of it went over cellular; and without Wi-Fi nothing goes at all."
show handset network down wlan0
show $tools/halvecctl lasd update
heard 1
show handset network up wlan0
show handset network counters
[ "$(cellular)" = "$before" ] || { echo "a packet went over cellular"; exit 1; }
