// SPDX-License-Identifier: Apache-2.0
//
// Stores a preference value and reads it back.
#include <halvec_mobile_helper.h>
#include <stdio.h>
#include <string.h>

static int fail(const char* what, const hvmh_error* error) {
  char text[256];
  hvmh_error_describe(error, text, sizeof text);
  fprintf(stderr, "%s: %s\n", what, text);
  // What a caller does about it depends on the status alone.
  switch (error->status) {
    case HVMH_NOT_RUNNING:
    case HVMH_HELPER_GONE:
    case HVMH_TIMED_OUT:
      return 75;  // worth another try later
    default:
      return 1;
  }
}

int main(int count, char** arguments) {
  hvmh_options options;
  hvmh_options_init(&options, sizeof options);
  options.flags = HVMH_FLAG_RECONNECT;
  options.request_timeout_ms = 5000;
  if (count > 1) options.service_path = arguments[1];

  hvmh_error error;
  hvmh_client* client = NULL;
  if (hvmh_client_open(&options, &client, &error) != HVMH_OK) return fail("connect", &error);

  const char value[] = "<plist><string>on</string></plist>";
  if (hvmh_set_preference_value(client, "com.example.carrier", "Roaming", value, strlen(value),
                                &error) != HVMH_OK) {
    hvmh_client_close(client);
    return fail("set", &error);
  }

  void* stored = NULL;
  size_t size = 0;
  if (hvmh_copy_preference_value(client, "com.example.carrier", "Roaming", &stored, &size,
                                 &error) != HVMH_OK) {
    hvmh_client_close(client);
    return fail("copy", &error);
  }
  printf("%zu bytes\n", size);
  hvmh_free(stored);
  hvmh_client_close(client);
  return 0;
}
