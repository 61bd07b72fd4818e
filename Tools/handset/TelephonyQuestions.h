// SPDX-License-Identifier: Apache-2.0
//
// `handset telephony ...`. One thread, no lock.
#pragma once

#include "Tools/handset/Control.h"
#include "Tools/handset/Telephony.h"

namespace handset {

/// Has `control` answer it; both must outlive the loop.
void AnswerAboutTelephony(Control& control, Telephony& telephony);

}  // namespace handset
