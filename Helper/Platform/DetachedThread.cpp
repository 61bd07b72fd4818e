// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/DetachedThread.h"

#include <signal.h>

#include <thread>
#include <utility>

namespace platform {
namespace {

/// Keeps signals from the calling thread, and so from those it makes, for the length of a scope.
class SignalsBlocked {
 public:
  SignalsBlocked() {
    sigset_t all;
    sigfillset(&all);
    (void)::pthread_sigmask(SIG_SETMASK, &all, &previous_);
  }
  SignalsBlocked(const SignalsBlocked&) = delete;
  SignalsBlocked& operator=(const SignalsBlocked&) = delete;
  ~SignalsBlocked() { (void)::pthread_sigmask(SIG_SETMASK, &previous_, nullptr); }

 private:
  sigset_t previous_{};
};

}  // namespace

void StartDetachedThread(std::function<void()> body) {
  const SignalsBlocked blocked;
  std::thread(std::move(body)).detach();
}

}  // namespace platform
