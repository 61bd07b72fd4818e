// SPDX-License-Identifier: Apache-2.0
//
// The commands about the helper and the system log: status, wait-start, wait-exit, log, kill and
// start-helper. One thread, no lock.
#pragma once

#include "Tools/handset/Control.h"
#include "Tools/handset/Launcher.h"
#include "Tools/handset/SystemLogCapture.h"

namespace handset {

/// Has `control` answer them. All three must outlive the loop.
void AnswerAboutHelper(Control& control, Launcher& launcher, SystemLogCapture& capture);

}  // namespace handset
