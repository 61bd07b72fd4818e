// SPDX-License-Identifier: Apache-2.0
//
// The process's name space of message ports: 32-bit names to rights, with user references. A right
// is a Unix socket. Any thread may call; one lock guards the table and is held for single look-ups
// and changes only, never while a message travels.
#pragma once

#include <cstddef>
#include <optional>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/ForeignDescriptor.h"
#include "Helper/Shared/Interface/Message.h"

namespace platform {

/// Makes a port and gives its receive right a new name.
/// KERN_SUCCESS; KERN_RESOURCE_SHORTAGE when the process has no descriptors left.
[[nodiscard]] KernReturn PortAllocate(PortName& name);

/// Adds one send right under the name of a receive right (make-send).
/// KERN_SUCCESS; KERN_INVALID_NAME; KERN_INVALID_RIGHT when the name holds no receive right.
[[nodiscard]] KernReturn PortInsertSendRight(PortName name);

/// Drops the receive right of `name`: the port dies. Send rights under the same name become dead
/// names and keep it until they are deallocated.
/// KERN_SUCCESS; KERN_INVALID_NAME; KERN_INVALID_RIGHT when the name holds no receive right.
KernReturn PortDropReceiveRight(PortName name);

/// Gives up one send or dead-name reference; on a name that holds only a receive right, that right.
/// The name is free, for good, when nothing is left under it.
/// KERN_SUCCESS; KERN_INVALID_NAME.
KernReturn PortDeallocate(PortName name);

/// Checks in a named service: takes its receive right over from the service launcher, or binds it
/// where no launcher holds it (socket mode 0660; its file stays when the right is given up, so that
/// nobody else can bind the name).
/// KERN_SUCCESS; KERN_INVALID_ARGUMENT for a name that is no file name; KERN_NO_ACCESS when another
/// process serves the name; KERN_RESOURCE_SHORTAGE; KERN_FAILURE for any other reason.
[[nodiscard]] KernReturn BootstrapCheckIn(const char* serviceName, PortName& name);

/// Enters a received send right under a new name. `holder` is the pidfd of the process that sent
/// it, null when it is not known: its exit counts as the port's death.
[[nodiscard]] PortName PortAdoptSendRight(FileDescriptor right, SharedDescriptor holder);

/// What stands under a name.
struct PortRights {
  bool receive = false;
  bool named = false;  // the receive right of a named service port
  std::size_t sendReferences = 0;
};
[[nodiscard]] std::optional<PortRights> PortQuery(PortName name);

/// How many names are in use.
[[nodiscard]] std::size_t PortNameCount();

/// The socket of the receive right, or null.
[[nodiscard]] SharedDescriptor PortReceiveDescriptor(PortName name);
/// The socket to send on, or null.
[[nodiscard]] SharedDescriptor PortSendDescriptor(PortName name);
/// The pidfd of the process that sent this send right, or null.
[[nodiscard]] SharedDescriptor PortHolder(PortName name);

/// Whether `descriptor` can be a right: a SOCK_SEQPACKET Unix socket whose two ends have no
/// address. A socket with an address belongs to some service, and writing there with this process's
/// credentials would lend it our identity.
[[nodiscard]] bool IsAnonymousPort(int descriptor);

}  // namespace platform
