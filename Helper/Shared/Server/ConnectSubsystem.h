// SPDX-License-Identifier: Apache-2.0
//
// The subsystem of the service port: one routine, connect. Main thread.
#pragma once

#include "Helper/Platform/MigSource.h"

[[nodiscard]] const platform::MigSubsystem& ConnectSubsystem();
