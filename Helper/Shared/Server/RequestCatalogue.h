// SPDX-License-Identifier: Apache-2.0
//
// The subsystem that every private port is served with: 23 routines in id order.
#pragma once

#include "Helper/Platform/MigSource.h"

[[nodiscard]] const platform::MigSubsystem& RequestSubsystem();
