// SPDX-License-Identifier: Apache-2.0
//
// One echo exchange over the cellular data interface. Runs on the heartbeat's queue and blocks it
// for up to about two seconds. No state.
#pragma once

#include "Helper/Platform/HandsetError.h"
#include "Helper/Platform/String.h"

/// Sends one echo request to `target`, a dotted IPv4 address or the name of a host, over pdp_ip0
/// (without that interface over whatever route there is) and waits for its reply. Answers with a
/// number of the handset's system:
/// 0: a reply came.
/// 1: no socket could be had, or a call failed without a reason.
/// 22: the target is too long.
/// 46: the protocol database does not know ICMP.
/// 60: no reply came in time, or receiving failed.
/// 65: the host is unknown.
/// Any other: why the receive time-out, the sending or the reading of a clock failed.
[[nodiscard]] platform::HandsetError ExchangeEcho(const platform::String& target);
