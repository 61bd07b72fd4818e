// SPDX-License-Identifier: Apache-2.0
//
// What the one-call requests ask of the rest of the handset. Main thread, but for the subscription
// function, which any thread may ask for.
#pragma once

#include <cstdint>

/// Tells, by a boolean of 8 bits, whether the visual-voicemail service is subscribed.
using VoicemailSubscriptionFunction = std::uint8_t();

/// Opens the visual-voicemail library of the build with lazy binding and finds its subscription
/// function; null when the library or the function is missing. The library stays open for the life
/// of the process.
[[nodiscard]] VoicemailSubscriptionFunction* LoadVoicemailSubscriptionFunction();

/// What the visual-voicemail library answers; false when it cannot be had. It is looked for once in
/// the life of the process, whatever comes of it.
[[nodiscard]] std::uint8_t IsVoicemailServiceSubscribed();

/// Tells the radio manager, if it runs, whether to log to a file: a one-way message 1 to its port
/// `com.zarvo.radio-manager` that carries 1 or 0 in 32 bits. Whether it arrives is not told.
void SetRadioManagerLogToFile(bool enabled);
