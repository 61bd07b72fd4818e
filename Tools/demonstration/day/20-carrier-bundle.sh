# SPDX-License-Identifier: Apache-2.0
# A carrier bundle: a package is unpacked, moved, linked; crash logs are collected.
library=/private/var/mobile/Library
operator=com.zarvo.operator
work=/tmp/work

# A package as an operator's archiver would make it, with `zip`: a folder, a link, a name beyond
# ASCII, and beside the settings a side-car that carries an attribute called "reviewer".
make_package() {
  mkdir -p $work/Nordtel.bundle/Überblick
  cd $work
  printf '<plist version="1.0"><dict><key>CarrierName</key><string>Nordtel</string></dict></plist>\n' \
    >Nordtel.bundle/carrier.plist
  echo "Nordtel" >Nordtel.bundle/Überblick/Märkte.txt
  ln -s carrier.plist Nordtel.bundle/Info.plist
  python3 -c '
import struct
name, value = b"reviewer\0", b"Ada"
table = struct.pack(">4sIIII12xHHIIHB", b"ATTR", 0, 131, 128, 3, 0, 1, 128, 3, 0, len(name)) + name
open("Nordtel.bundle/._carrier.plist", "wb").write(
    struct.pack(">II16xHIII34x", 0x00051607, 0x00020000, 1, 9, 38, 93) + table + value)'
  LC_ALL=C.UTF-8 zip -qry $work/Nordtel.tcbk Nordtel.bundle
  cd /
}

make_package
mkdir -p $library/Preferences
chown mobile:mobile $library $library/Preferences

say "A package arrives: a zip file with folders, a link and a side-car of attributes."
show unzip -l $work/Nordtel.tcbk

say "The helper unpacks it. The side-car has become an attribute of the settings file."
show $tools/halvecctl bundle extract $work/Nordtel.tcbk /tmp/unpacked
show ls -A /tmp/unpacked/Nordtel.bundle
python3 -c 'import os; f = "/tmp/unpacked/Nordtel.bundle/carrier.plist"
print("user.reviewer =", os.getxattr(f, "user.reviewer").decode())'

say "It is moved to the carrier bundles; the fixed name points at it, one more file goes into it."
show $tools/halvecctl bundle move /tmp/unpacked/Nordtel.bundle "$library/Carrier Bundles" Nordtel.bundle
show $tools/halvecctl bundle link "Carrier Bundles/Nordtel.bundle" "$library/Carrier Bundle.bundle"
echo "roaming rates" >$work/rates.txt
show $tools/halvecctl file copy $work "$library/Carrier Bundles/Nordtel.bundle" rates.txt

say "The operator's preference file is linked to the bundle's: the helper forgets what it had read."
# Root's own preferences of the operator are those of the mobile user here.
$tools/halvecctl bundle link --unchecked $library/Preferences/$operator.plist \
  /root/Library/Preferences/$operator.plist
cp $work/Nordtel.bundle/carrier.plist $work/old.plist
sed -i 's/Nordtel/Oldtel/' $work/old.plist
$tools/halvecctl bundle link $work/old.plist $library/Preferences/$operator.plist
show $tools/halvecctl preference get $operator CarrierName
show $tools/halvecctl bundle link "../Carrier Bundle.bundle/carrier.plist" \
  $library/Preferences/$operator.plist --domain $operator
show $tools/halvecctl preference get $operator CarrierName

say "Crash logs of the baseband go to the mobile user's own."
mkdir -p $work/baseband $library/Logs/CrashReporter
echo "assertion failed in layer 2" >$work/baseband/layer2.crash
show $tools/halvecctl crash-logs copy $work/baseband

say "What the mobile user's library looks like now."
show find $library -type l -printf '%M %u:%g %P -> %l\n' -o -printf '%M %u:%g %P\n'
