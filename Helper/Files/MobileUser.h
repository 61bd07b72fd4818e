// SPDX-License-Identifier: Apache-2.0
//
// The handset's interactive user, "mobile", to whom files made for the telephony daemon belong. The
// functions are symbols of the program. Any thread; the user database is asked once per process.
#pragma once

#include <sys/types.h>

extern "C" {

/// The home directory, the same pointer every time and valid until the process ends; null when the
/// user database knows none: read it as an empty path then.
const char* GetMobileUserDirectory();

/// The user id. Kept: 0 when there is no such user, without a line in the log.
uid_t GetMobileUserUID();

/// The primary group's id. Kept: 0 when there is no such user.
gid_t GetMobileUserGID();

}  // extern "C"
