// SPDX-License-Identifier: Apache-2.0
//
// Asks for a service port that nobody serves, and prints what the library says about it.
#include <halvec_mobile_helper.h>
#include <stdio.h>

int main(void) {
  hvmh_options options;
  hvmh_options_init(&options, sizeof options);
  options.service_path = "/nonexistent/port";
  hvmh_client* client = NULL;
  hvmh_error error;
  const hvmh_status status = hvmh_client_open(&options, &client, &error);
  printf("abi %d: %s\n", (int)hvmh_abi_version(), hvmh_status_text(status));
  return status == HVMH_NOT_RUNNING ? 0 : 1;
}
