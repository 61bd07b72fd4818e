// SPDX-License-Identifier: Apache-2.0
//
// The telephony framework with a daemon in memory that does what the test tells it. One thread.
#pragma once

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "Helper/Platform/TelephonyConnection.h"

namespace fakes {

class FakeTelephonyFramework final : public platform::TelephonyFramework {
 public:
  bool published = true;             // whether the daemon has published its port
  platform::TelephonyResult answer;  // what the daemon answers
  int notificationsBeforeAnswer = 0;

  /// What happened, in that order: "identifier TEXT", "open", "set", "close".
  std::vector<std::string> events;
  std::vector<platform::CivicInfoTexts> delivered;
  std::vector<std::string> identifiers;

  void addIdentifierException(const platform::String& identifier) override {
    events.push_back("identifier " + std::string(identifier.utf8()));
    if (std::find(identifiers.begin(), identifiers.end(), identifier.utf8()) == identifiers.end()) {
      identifiers.emplace_back(identifier.utf8());
    }
  }

  std::unique_ptr<platform::TelephonyConnection> createConnection(
      platform::TelephonyNotificationCallback callback, void* context) override {
    if (!published) return nullptr;
    return std::make_unique<Connection>(*this, callback, context);
  }

 private:
  class Connection final : public platform::TelephonyConnection {
   public:
    Connection(FakeTelephonyFramework& framework, platform::TelephonyNotificationCallback callback,
               void* context)
        : framework_(framework), callback_(callback), context_(context) {
      framework_.events.emplace_back("open");
    }
    ~Connection() override { framework_.events.emplace_back("close"); }
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    platform::TelephonyResult setCivicInfo(const platform::CivicInfoTexts& texts) override {
      framework_.events.emplace_back("set");
      framework_.delivered.push_back(texts);
      for (int count = 0; count < framework_.notificationsBeforeAnswer; ++count) {
        callback_(this, context_);
      }
      return framework_.answer;
    }

   private:
    FakeTelephonyFramework& framework_;
    const platform::TelephonyNotificationCallback callback_;
    void* const context_;
  };
};

}  // namespace fakes
