// SPDX-License-Identifier: Apache-2.0
//
// How the rest of the program reaches a platform service: one shared instance per interface. The
// real provider is made on first use; a test puts its own in place for a scope. Any thread may ask;
// a replacement is installed before, and removed after, every thread that uses it.
#pragma once

#include <atomic>

namespace platform {

/// The real provider of `Service`, made on first use and never destroyed. Specialised by each
/// provider in Linux/.
template <class Service>
Service& DefaultProvider();

namespace detail {
template <class Service>
inline std::atomic<Service*> replacement{nullptr};
}

/// The shared instance of `Service`: the replacement where a test installed one, else the real
/// provider.
template <class Service>
[[nodiscard]] Service& Shared() {
  if (Service* service = detail::replacement<Service>.load(std::memory_order_acquire)) {
    return *service;
  }
  return DefaultProvider<Service>();
}

/// Makes `service` the shared instance while this object lives. Borrows it.
template <class Service>
class ScopedReplacement {
 public:
  explicit ScopedReplacement(Service& service)
      : previous_(detail::replacement<Service>.exchange(&service)) {}
  ~ScopedReplacement() { detail::replacement<Service>.store(previous_); }
  ScopedReplacement(const ScopedReplacement&) = delete;
  ScopedReplacement& operator=(const ScopedReplacement&) = delete;

 private:
  Service* previous_;
};

}  // namespace platform
