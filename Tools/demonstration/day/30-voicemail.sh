# SPDX-License-Identifier: Apache-2.0
# Voicemail: tokens that survive a kill, closed to everybody else; the radio manager's log.
store=/var/lib/halvec-mobile-helper

say "The telephony daemon has its voicemail tokens kept: a current one, and one for each key."
show $tools/halvecctl voicemail token set 'mailbox 4711'
show $tools/halvecctl voicemail token set 'key of the SIM' --key com.zarvo.sim.1
show $tools/halvecctl voicemail token get
show $tools/halvecctl voicemail token get --key com.zarvo.sim.1

say "The helper is killed in the midst of it. What it acknowledged is on the disk."
show handset kill KILL
show handset wait-exit --timeout 20
show $tools/halvecctl voicemail token get
await_watcher

say "The store is closed to everybody but the helper."
show ls -l $store
printf '$ cat %s/voicemail-tokens.db     # as mobile\n' $store
handset as mobile -- cat $store/voicemail-tokens.db 2>&1 && { echo "expected a refusal"; exit 1; }

say "A reset removes the current token and the records; the tokens of keys stay."
show $tools/halvecctl voicemail reset
code=0
show $tools/halvecctl voicemail token get --json || code=$?
[ $code -eq 6 ] || { echo "expected no token"; exit 1; }
show $tools/halvecctl voicemail token get --key com.zarvo.sim.1

say "Is visual voicemail subscribed? Its library says; this handset has none."
show $tools/halvecctl voicemail subscribed

say "The radio manager is told to log to its file, and what it received."
heard=$(handset telephony log | wc -l)
show $tools/halvecctl radio-log on
show $tools/halvecctl radio-log off
show handset telephony log --skip "$heard" --count 2 --timeout 20
handset log | tail -n 2
