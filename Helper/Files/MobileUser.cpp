// SPDX-License-Identifier: Apache-2.0
//
// The program's own symbols over the process-wide record. Any thread.
#include "Helper/Files/MobileUser.h"

#include "Helper/Platform/MobileUserRecord.h"

const char* GetMobileUserDirectory() { return platform::MobileUser().directory(); }

uid_t GetMobileUserUID() { return platform::MobileUser().uid(); }

gid_t GetMobileUserGID() { return platform::MobileUser().gid(); }
