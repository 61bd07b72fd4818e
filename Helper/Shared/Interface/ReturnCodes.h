// SPDX-License-Identifier: Apache-2.0
//
// Return codes as they travel in replies: kernel-style codes under their Mach names, and the codes
// of the message layer. Values only; no thread, no state.
#pragma once

#include <cstdint>
#include <string_view>

/// A kernel-style 32-bit return code.
using KernReturn = std::int32_t;

inline constexpr KernReturn KERN_SUCCESS = 0;
inline constexpr KernReturn KERN_NO_SPACE = 3;
inline constexpr KernReturn KERN_INVALID_ARGUMENT = 4;
inline constexpr KernReturn KERN_FAILURE = 5;
inline constexpr KernReturn KERN_RESOURCE_SHORTAGE = 6;
inline constexpr KernReturn KERN_NO_ACCESS = 8;
inline constexpr KernReturn KERN_MEMORY_FAILURE = 9;
inline constexpr KernReturn KERN_INVALID_NAME = 15;
inline constexpr KernReturn KERN_INVALID_RIGHT = 17;
inline constexpr KernReturn KERN_INVALID_SECURITY = 35;

inline constexpr KernReturn MIG_TYPE_ERROR = -300;
inline constexpr KernReturn MIG_BAD_ID = -303;
inline constexpr KernReturn MIG_BAD_ARGUMENTS = -304;
inline constexpr KernReturn MIG_NO_REPLY = -305;
inline constexpr KernReturn MIG_TRAILER_ERROR = -309;

/// The name of `code`, or "unknown code".
[[nodiscard]] constexpr std::string_view ReturnCodeName(KernReturn code) {
  switch (code) {
    case KERN_SUCCESS:
      return "KERN_SUCCESS";
    case KERN_NO_SPACE:
      return "KERN_NO_SPACE";
    case KERN_INVALID_ARGUMENT:
      return "KERN_INVALID_ARGUMENT";
    case KERN_FAILURE:
      return "KERN_FAILURE";
    case KERN_RESOURCE_SHORTAGE:
      return "KERN_RESOURCE_SHORTAGE";
    case KERN_NO_ACCESS:
      return "KERN_NO_ACCESS";
    case KERN_MEMORY_FAILURE:
      return "KERN_MEMORY_FAILURE";
    case KERN_INVALID_NAME:
      return "KERN_INVALID_NAME";
    case KERN_INVALID_RIGHT:
      return "KERN_INVALID_RIGHT";
    case KERN_INVALID_SECURITY:
      return "KERN_INVALID_SECURITY";
    case MIG_TYPE_ERROR:
      return "MIG_TYPE_ERROR";
    case MIG_BAD_ID:
      return "MIG_BAD_ID";
    case MIG_BAD_ARGUMENTS:
      return "MIG_BAD_ARGUMENTS";
    case MIG_NO_REPLY:
      return "MIG_NO_REPLY";
    case MIG_TRAILER_ERROR:
      return "MIG_TRAILER_ERROR";
    default:
      return "unknown code";
  }
}
