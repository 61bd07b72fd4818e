// SPDX-License-Identifier: Apache-2.0
//
// `handset network ...`, `handset capture ...` and `handset tower ...`. One thread, no lock.
#pragma once

#include "Tools/handset/Capture.h"
#include "Tools/handset/Control.h"
#include "Tools/handset/Links.h"

namespace handset {

/// Has `control` answer them; all must outlive the loop.
void AnswerAboutNetwork(Control& control, Links& links, Capture& capture);

}  // namespace handset
