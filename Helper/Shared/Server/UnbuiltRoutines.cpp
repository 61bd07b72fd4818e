// SPDX-License-Identifier: Apache-2.0
//
// THE PLACE OF WHAT IS NOT BUILT YET. Each routine here answers KERN_FAILURE and does nothing; it
// moves to its own folder, and its id out of UnbuiltRoutines.h, when its subsystem is built.
#include "Helper/Shared/Server/RequestRoutines.h"

KernReturn server_HvMobileHelperSetVoicemailToken(PortName, wire::Text<256>&) {
  return KERN_FAILURE;
}
KernReturn server_HvMobileHelperSetVoicemailTokenForKey(PortName, wire::Text<256>&,
                                                        wire::Text<256>&) {
  return KERN_FAILURE;
}
KernReturn server_HvMobileHelperClearVoicemailToken(PortName) { return KERN_FAILURE; }
KernReturn server_HvMobileHelperResetVoicemailRecords(PortName) { return KERN_FAILURE; }
KernReturn server_HvMobileHelperCopyVoicemailTokenForKey(PortName, wire::Text<256>&,
                                                         wire::Text<256>&) {
  return KERN_FAILURE;
}
KernReturn server_HvMobileHelperCopyVoicemailToken(PortName, wire::Text<256>&) {
  return KERN_FAILURE;
}
