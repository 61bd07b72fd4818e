// SPDX-License-Identifier: Apache-2.0
//
// The handset's network: a namespace of its own, in which only the loopback interface exists.
// Called by the handset's first process during set-up. One thread, no lock.
#pragma once

namespace handset {

class Network {
 public:
  /// Takes the loopback interface of the caller's network namespace up; throws Failure. The
  /// namespace must be the handset's own by then.
  void bringUpLoopback();

  /// How many datagrams a Unix socket queues if it is created now; throws Failure.
  [[nodiscard]] unsigned datagramQueue();

  /// Sets how many datagrams a Unix socket queues if it is created from now on in the caller's
  /// network namespace (net.unix.max_dgram_qlen; sockets that exist keep theirs); throws Failure.
  void setDatagramQueue(unsigned length);
};

}  // namespace handset
