# SPDX-License-Identifier: Apache-2.0
# The idle exit: the last step.
say "Everybody has disconnected. Ten idle seconds from now the helper leaves."
show $tools/halvecctl status
if [ -z "$quick" ]; then
  show handset wait-exit --timeout 30
  show handset status
  echo
  echo "The next message would start it again. Nothing of this handset stays on this machine."
else
  echo "Not waited for; without --quick it is."
fi
