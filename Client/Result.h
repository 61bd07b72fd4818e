// SPDX-License-Identifier: Apache-2.0
//
// What the C++ calls of the client library answer: an Error, or a Result that holds a value or an
// Error. Values only; no thread, no state.
#pragma once

#include <cassert>
#include <string>
#include <utility>
#include <variant>

#include "Client/halvec_mobile_helper.h"
#include "Helper/Shared/Interface/ReturnCodes.h"

namespace halvec {

/// How a call ended. The status values are those of the C interface.
struct [[nodiscard]] Error {
  hvmh_status status = HVMH_OK;
  KernReturn returnCode = KERN_SUCCESS;  // with HVMH_RETURN_CODE and HVMH_REFUSED
  int systemError = 0;                   // errno where a system call was the reason

  [[nodiscard]] bool failed() const noexcept { return status != HVMH_OK; }

  /// One readable clause, without a full stop: the status, and the code or errno with its name.
  [[nodiscard]] std::string describe() const;

  /// The helper's return code as an error: none for 0, HVMH_REFUSED for 35.
  static Error FromReturnCode(KernReturn code) noexcept {
    if (code == KERN_SUCCESS) return {};
    return {code == KERN_INVALID_SECURITY ? HVMH_REFUSED : HVMH_RETURN_CODE, code, 0};
  }
  static Error FromSystem(int systemError) noexcept {
    return {HVMH_SYSTEM_ERROR, KERN_SUCCESS, systemError};
  }
  friend bool operator==(const Error&, const Error&) = default;
};

/// A value, or the error because of which there is none.
template <class T>
class [[nodiscard]] Result {
 public:
  Result(Error error) : outcome_(error) { assert(error.failed()); }  // NOLINT: converts by design
  Result(T value) : outcome_(std::move(value)) {}                    // NOLINT: converts by design

  [[nodiscard]] explicit operator bool() const noexcept {
    return std::holds_alternative<T>(outcome_);
  }
  /// No error when there is a value.
  [[nodiscard]] Error error() const noexcept {
    const Error* error = std::get_if<Error>(&outcome_);
    return error == nullptr ? Error{} : *error;
  }
  /// The value; only when there is one.
  [[nodiscard]] T& operator*() noexcept { return *operator->(); }
  [[nodiscard]] const T& operator*() const noexcept { return *std::get_if<T>(&outcome_); }
  [[nodiscard]] T* operator->() noexcept { return std::get_if<T>(&outcome_); }

 private:
  std::variant<Error, T> outcome_;
};

/// Done, or the error.
template <>
class [[nodiscard]] Result<void> {
 public:
  Result() = default;
  Result(Error error) : error_(error) {}  // NOLINT: converts by design

  [[nodiscard]] explicit operator bool() const noexcept { return !error_.failed(); }
  [[nodiscard]] const Error& error() const noexcept { return error_; }

 private:
  Error error_;
};

}  // namespace halvec
