// SPDX-License-Identifier: Apache-2.0
//
// The name under which something takes shape in the folder where it will stand: ".halvec-copy-" and
// a number. Whoever works under one holds a lock on it (flock(2)), so that what a killed process
// left behind is told from what another process or thread is working on. Any thread; no state.
#pragma once

#include <string>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

/// An item at a work name, open and locked. It stays where it is when this object goes.
struct WorkItem {
  std::string name;
  FileDescriptor item;
};

enum class WorkKind { kFile, kFolder };

/// Makes an empty file (0600, open for writing) or folder (0700, open for reading) in `folder`.
/// What a killed process left at the name, a tree or anything else, is removed first. An error
/// number, EBUSY when too many work there at once, or 0.
[[nodiscard]] int MakeWorkItem(int folder, WorkKind kind, WorkItem& made);

}  // namespace platform
