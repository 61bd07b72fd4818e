// SPDX-License-Identifier: Apache-2.0
//
// The process-wide map from port names (service port, private ports, clients' ports) to servers.
// Neither side is retained. Any thread; its own mutex is held for one add, remove or look-up.
#pragma once

#include "Helper/Shared/Server/HelperServerUtils.h"

/// Makes the map, once; it is released at exit.
void PortToServerMapInitialize();
void PortToServerMapAdd(PortName port, HelperServer* server);
void PortToServerMapRemove(PortName port);
