// SPDX-License-Identifier: Apache-2.0
//
// A visual-voicemail library for the tests: subscribed while /tmp/subscribed exists. Any thread.
#include <stdint.h>
#include <unistd.h>

uint8_t HALVEC_VOICEMAIL_SYMBOL(void);
uint8_t HALVEC_VOICEMAIL_SYMBOL(void) { return access("/tmp/subscribed", F_OK) == 0; }
