// SPDX-License-Identifier: Apache-2.0
//
// The base of an object that shared pointers own and that lives on a serial queue of its own: work
// is posted there, and there the object is destroyed. Any thread may post and hold references; what
// the posted work touches belongs to the queue and needs no lock.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <utility>

#include "Helper/Platform/WorkQueue.h"

namespace vlu {

template <class Owner>
class SharedSynchronizable {
 public:
  SharedSynchronizable(const SharedSynchronizable&) = delete;
  SharedSynchronizable& operator=(const SharedSynchronizable&) = delete;

  /// Takes the new `object` into a shared pointer and makes it known to the object. When the last
  /// reference goes, the object is destroyed on its queue, after all work that waits there. Without
  /// memory for the pointer's bookkeeping that happens at once and std::bad_alloc is thrown.
  [[nodiscard]] static std::shared_ptr<Owner> make_shared_ptr(Owner* object) {
    std::shared_ptr<Owner> pointer(object, &DestroyOnQueue);
    object->self_ = pointer;
    return pointer;
  }

  /// Runs `work` on the queue after all that was posted before, never inside this call. The object
  /// lives until it has run. Throws std::bad_weak_ptr when no reference to the object is left, or
  /// make_shared_ptr() has not been called.
  void post(std::function<void()> work) {
    queue_.async([self = std::shared_ptr<Owner>(self_), work = std::move(work)] { work(); });
  }

  [[nodiscard]] const platform::WorkQueue& queue() const { return queue_; }

 protected:
  /// `label` names the queue for people.
  explicit SharedSynchronizable(std::string label) : queue_(std::move(label)) {}
  ~SharedSynchronizable() = default;

 private:
  static void DestroyOnQueue(Owner* object) {
    // On a serial queue whatever is submitted is a barrier: it runs after all that waits.
    object->queue_.async([object] { delete object; });
  }

  std::weak_ptr<Owner> self_;
  platform::WorkQueue queue_;
};

}  // namespace vlu
