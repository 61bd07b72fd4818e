# SPDX-License-Identifier: Apache-2.0
# The data-path heartbeat, as the far side of the cellular link sees it.
say "The heartbeat: an echo request over pdp_ip0 at once, once more, then every two seconds."
show handset capture start pdp_ip0
show $tools/halvecctl heartbeat start
show handset capture show --protocol icmp --count 8 --timeout 30 pdp_ip0
show handset network counters pdp_ip0
echo "The identifier in each request is the helper's process id: $(printf '%04x' "$(handset wait-start)")"

say "It goes on without any client, and ends when it is stopped."
show $tools/halvecctl heartbeat stop
