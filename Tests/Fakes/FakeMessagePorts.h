// SPDX-License-Identifier: Apache-2.0
//
// Named message ports in memory: the test publishes them and takes what arrived. Any thread; one
// lock.
#pragma once

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/MessagePort.h"
#include "Helper/Shared/Interface/OneWayMessage.h"

namespace fakes {

class FakeMessagePorts final : public platform::MessagePorts {
 public:
  struct Message {
    std::int32_t id = 0;
    std::vector<std::byte> payload;
    friend bool operator==(const Message&, const Message&) = default;
  };
  /// As many as a stock kernel lets wait at one socket, and one.
  static constexpr std::size_t kQueueLimit = 11;

  void publish(const std::string& name) { state_->publish(name); }
  void retract(const std::string& name) { state_->retract(name); }
  /// Has every attempt to send call `observer`, on the sender's thread, before anything else.
  void observeSends(std::function<void()> observer) { state_->observe(std::move(observer)); }

  /// The oldest message at `name` that was not taken yet; blocks until there is one.
  [[nodiscard]] Message take(const std::string& name) { return state_->take(name); }
  [[nodiscard]] bool isEmpty(const std::string& name) { return state_->isEmpty(name); }

  std::unique_ptr<platform::RemoteMessagePort> createRemote(const std::string& name) override {
    if (!state_->isPublished(name)) return nullptr;
    return std::make_unique<Remote>(state_, name);
  }

 private:
  struct State {
    std::mutex mutex;
    std::condition_variable arrived;
    std::map<std::string, std::deque<Message>> queues;
    std::function<void()> observer;

    void observe(std::function<void()> newObserver) {
      const std::lock_guard guard(mutex);
      observer = std::move(newObserver);
    }
    void publish(const std::string& name) {
      const std::lock_guard guard(mutex);
      queues[name];
    }
    void retract(const std::string& name) {
      const std::lock_guard guard(mutex);
      queues.erase(name);
    }
    bool isPublished(const std::string& name) {
      const std::lock_guard guard(mutex);
      return queues.contains(name);
    }
    bool isEmpty(const std::string& name) {
      const std::lock_guard guard(mutex);
      return queues[name].empty();
    }
    Message take(const std::string& name) {
      std::unique_lock guard(mutex);
      std::deque<Message>& queue = queues[name];
      arrived.wait(guard, [&] { return !queue.empty(); });
      Message message = std::move(queue.front());
      queue.pop_front();
      return message;
    }
    bool send(const std::string& name, Message message) {
      const std::lock_guard guard(mutex);
      if (observer) observer();
      const auto queue = queues.find(name);
      if (queue == queues.end() || queue->second.size() >= kQueueLimit) return false;
      queue->second.push_back(std::move(message));
      arrived.notify_all();
      return true;
    }
  };

  class Remote final : public platform::RemoteMessagePort {
   public:
    Remote(std::shared_ptr<State> state, std::string name)
        : state_(std::move(state)), name_(std::move(name)) {}
    bool sendRequest(std::int32_t messageId, std::span<const std::byte> payload) override {
      if (payload.size() > wire::kOneWayPayloadLimit) return false;
      return state_->send(name_, {messageId, {payload.begin(), payload.end()}});
    }

   private:
    const std::shared_ptr<State> state_;
    const std::string name_;
  };

  const std::shared_ptr<State> state_ = std::make_shared<State>();
};

}  // namespace fakes
