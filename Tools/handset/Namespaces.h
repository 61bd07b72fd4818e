// SPDX-License-Identifier: Apache-2.0
//
// Namespaces of the handset: pid, mount, network, uts and ipc, and no user namespace, because the
// handset's users must be the real uids 501 and 502, which only the first user namespace has.
// One thread, no lock.
#pragma once

#include <functional>
#include <optional>
#include <string>

namespace handset {

/// Why this process cannot make a handset ("must be run as root ..."), or nothing if it can. Leaves
/// no trace.
[[nodiscard]] std::optional<std::string> WhyNoHandset();

/// Forks a process that is the first of new namespaces and runs `first` there, waits for it, and
/// returns its exit status (128 + signal where a signal ended it). The new process dies with its
/// parent, even by SIGKILL, and everything in the namespaces dies with it. Signals to end that the
/// parent is sent meanwhile are passed on. Returns in both processes: in the new one, what `first`
/// returned. Throws Failure.
[[nodiscard]] int RunInNamespaces(const std::function<int()>& first);

}  // namespace handset
