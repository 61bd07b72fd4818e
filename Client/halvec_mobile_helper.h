// SPDX-License-Identifier: Apache-2.0
//
// The C interface of the client library: one call per request of the mobile helper. C11 and C++.
// A client object belongs to one thread at a time and has no lock; different objects are
// independent of one another. Do not use an object in a forked child: make a new one there.
//
// Promise: names, values and layouts of this header stay as they are within ABI version 1; new
// functions, status values, flags and options may be added (marked "since N").
#pragma once

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

enum { HVMH_ABI_VERSION = 1 };

/// The ABI version of the library that is running.
int32_t hvmh_abi_version(void);

/// How a call ended. Values are stable and never reused.
typedef int32_t hvmh_status;
enum {
  HVMH_OK = 0,                  // since 1: done
  HVMH_RETURN_CODE = 1,         // since 1: the helper answered with a return code other than 0
  HVMH_NOT_RUNNING = 2,         // since 1: nobody serves the service socket
  HVMH_ACCESS_DENIED = 3,       // since 1: the service socket's file mode keeps this process out
  HVMH_REFUSED = 4,             // since 1: the helper answered 35, the caller is not entitled
  HVMH_TIMED_OUT = 5,           // since 1: no answer within the limit; the connection was closed
  HVMH_HELPER_GONE = 6,         // since 1: the helper went away; the connection was closed
  HVMH_NOT_CONNECTED = 7,       // since 1: an earlier call closed the connection; nothing was sent
  HVMH_PROTOCOL_VIOLATION = 8,  // since 1: an ill-formed answer; the connection was closed
  HVMH_TOO_LARGE = 9,           // since 1: a text or data beyond its limit; nothing was sent
  HVMH_INVALID_ARGUMENT = 10,   // since 1: null pointer, unusable path or option; nothing was sent
  HVMH_NO_MEMORY = 11,          // since 1: this process ran out of memory
  HVMH_SYSTEM_ERROR = 12        // since 1: a system call failed, see system_error
};

/// Details of how a call ended. Every call that takes one fills it, also on success; it may be
/// null.
typedef struct hvmh_error {
  hvmh_status status;
  int32_t return_code;   // with HVMH_RETURN_CODE and HVMH_REFUSED: the code; otherwise 0
  int32_t system_error;  // errno where a system call was the reason; otherwise 0
  int32_t reserved[5];   // 0
} hvmh_error;

/// One clause about `status`, in English, without a full stop. Static.
const char* hvmh_status_text(hvmh_status status);

/// The name of a return code, such as "KERN_FAILURE", or "unknown code". Static.
const char* hvmh_return_code_name(int32_t return_code);

/// Writes one readable clause about `error` into `text`, cut to `size` bytes and zero-terminated.
/// Answers the length of the whole clause, as snprintf does.
size_t hvmh_error_describe(const hvmh_error* error, char* text, size_t size);

/// Connect again, once per request, when the helper went away before it read the request. Such a
/// request had no effect, so it is sent again; one that the helper may have begun never is.
enum { HVMH_FLAG_RECONNECT = 1 };  // since 1

/// What a client may choose. Fill it with hvmh_options_init() first.
typedef struct hvmh_options {
  uint32_t size;                // bytes of this structure, as the caller was compiled
  uint32_t flags;               // HVMH_FLAG_...; unknown bits are refused
  uint32_t connect_timeout_ms;  // limit of one connect; 10000 by default, 0 for none
  uint32_t request_timeout_ms;  // limit of one request; 60000 by default, 0 for none
  const char* service_path;     // the service socket; null for the path that the build chose
} hvmh_options;

/// Fills `options` with the defaults. Pass sizeof(hvmh_options) as `size`.
void hvmh_options_init(hvmh_options* options, size_t size);

/// One connection to the helper.
typedef struct hvmh_client hvmh_client;

/// Connects. `options` may be null for the defaults. On success *client is the new object, to be
/// given to hvmh_client_close(); otherwise it is null. Outcomes: HVMH_NOT_RUNNING,
/// HVMH_ACCESS_DENIED, HVMH_REFUSED, HVMH_TIMED_OUT, HVMH_HELPER_GONE (it left during every one of
/// several attempts), HVMH_RETURN_CODE, HVMH_PROTOCOL_VIOLATION, HVMH_INVALID_ARGUMENT,
/// HVMH_NO_MEMORY, HVMH_SYSTEM_ERROR.
hvmh_status hvmh_client_open(const hvmh_options* options, hvmh_client** client, hvmh_error* error);

/// Ends the connection and frees the object. Null does nothing.
void hvmh_client_close(hvmh_client* client);

/// Ends the connection, if there is one, and connects anew with the same options. What the helper
/// kept for the old connection is gone. Outcomes as hvmh_client_open().
hvmh_status hvmh_client_reconnect(hvmh_client* client, hvmh_error* error);

/// Whether the helper was still there a moment ago. Never waits.
bool hvmh_client_is_connected(const hvmh_client* client);

/// A descriptor for an event loop, or -1 without a connection. It reports a hang-up (POLLHUP) when
/// the helper goes away and nothing else. It stays the library's: never read, write or close it. It
/// changes with every connect. A hang-up is level-triggered, so stop watching when it comes.
int hvmh_client_descriptor(const hvmh_client* client);

/// Frees what a request returned. Null does nothing.
void hvmh_free(void* memory);

// The requests. Texts are zero-terminated UTF-8 of at most 255 bytes where nothing else is said; a
// longer one is HVMH_TOO_LARGE. A null text or result pointer is HVMH_INVALID_ARGUMENT. Result
// texts and data are new memory for hvmh_free(); results are null, 0 or false unless the call
// answers HVMH_OK. Any status may come back; HVMH_NOT_RUNNING and HVMH_ACCESS_DENIED only with
// HVMH_FLAG_RECONNECT.

/// Stores the voicemail token of the default key.
hvmh_status hvmh_set_voicemail_token(hvmh_client* client, const char* token, hvmh_error* error);

/// Stores a voicemail token under a key.
hvmh_status hvmh_set_voicemail_token_for_key(hvmh_client* client, const char* key,
                                             const char* token, hvmh_error* error);

/// Removes the voicemail token of the default key.
hvmh_status hvmh_clear_voicemail_token(hvmh_client* client, hvmh_error* error);

/// Resets the voicemail records.
hvmh_status hvmh_reset_voicemail_records(hvmh_client* client, hvmh_error* error);

/// The voicemail token under `key`.
hvmh_status hvmh_copy_voicemail_token_for_key(hvmh_client* client, const char* key, char** token,
                                              hvmh_error* error);

/// The voicemail token of the default key.
hvmh_status hvmh_copy_voicemail_token(hvmh_client* client, char** token, hvmh_error* error);

/// Stores a preference value: a serialized property list (XML or binary) of at most 16 MiB. Exactly
/// one byte, whatever it is, removes the key. Durable when the call answers HVMH_OK.
hvmh_status hvmh_set_preference_value(hvmh_client* client, const char* domain, const char* key,
                                      const void* value, size_t value_size, hvmh_error* error);

/// A preference value of the current user as an XML property list, not zero-terminated. Null and 0
/// when the key is absent, which is HVMH_OK.
hvmh_status hvmh_copy_preference_value(hvmh_client* client, const char* domain, const char* key,
                                       void** value, size_t* value_size, hvmh_error* error);

/// The same, found as an application finds it: through all scopes of user and host.
hvmh_status hvmh_copy_app_preference_value(hvmh_client* client, const char* domain, const char* key,
                                           void** value, size_t* value_size, hvmh_error* error);

/// Links a carrier bundle. Texts of at most 1023 bytes.
hvmh_status hvmh_set_carrier_bundle_link(hvmh_client* client, const char* target,
                                         const char* link_path, const char* domain,
                                         hvmh_error* error);

/// Makes a symbolic link. Texts of at most 1023 bytes.
hvmh_status hvmh_create_symlink(hvmh_client* client, const char* target, const char* link_path,
                                hvmh_error* error);

/// Removes the link to a carrier bundle. Texts of at most 1023 bytes.
hvmh_status hvmh_remove_carrier_bundle_link(hvmh_client* client, const char* link_path,
                                            const char* domain, hvmh_error* error);

/// Whether visual voicemail is subscribed.
hvmh_status hvmh_is_voicemail_subscribed(hvmh_client* client, bool* subscribed, hvmh_error* error);

/// Switches the heartbeat on (not 0) or off (0).
hvmh_status hvmh_trigger_heartbeat(hvmh_client* client, int32_t enable, hvmh_error* error);

/// Asks for an update of the databases whose bits are set in `types`.
hvmh_status hvmh_trigger_database_update(hvmh_client* client, uint32_t types, hvmh_error* error);

/// Copies a file between two directories. *success tells whether it worked.
hvmh_status hvmh_copy_file(hvmh_client* client, const char* source_directory,
                           const char* destination_directory, const char* file_name, bool* success,
                           hvmh_error* error);

/// Copies crash logs from `source_path`. *success tells whether it worked.
hvmh_status hvmh_copy_crash_logs(hvmh_client* client, const char* source_path, bool* success,
                                 hvmh_error* error);

/// Moves carrier bundles. *success tells whether it worked.
hvmh_status hvmh_move_carrier_bundles(hvmh_client* client, const char* source_path,
                                      const char* destination_directory, const char* name,
                                      bool* success, hvmh_error* error);

/// Has the civic info of a place, in degrees, delivered to the telephony daemon's connection port,
/// within about five seconds. Stay connected until then: the helper leaves when it has no client.
hvmh_status hvmh_request_country_code_from_location(hvmh_client* client, double latitude,
                                                    double longitude, hvmh_error* error);

/// The country that the handset is set up for, wherever it is; empty when it does not know.
hvmh_status hvmh_copy_country_code(hvmh_client* client, char** country_code, hvmh_error* error);

/// Switches the radio manager's logging on (not 0) or off (0).
hvmh_status hvmh_set_radio_manager_logging(hvmh_client* client, int32_t enable, hvmh_error* error);

/// Extracts an archive. *success tells whether it worked.
hvmh_status hvmh_extract_archive(hvmh_client* client, const char* source_path,
                                 const char* destination_path, bool* success, hvmh_error* error);

/// The content of a property-list file, not zero-terminated.
hvmh_status hvmh_copy_property_list_file(hvmh_client* client, const char* path, void** content,
                                         size_t* content_size, hvmh_error* error);

#ifdef __cplusplus
}
#endif
