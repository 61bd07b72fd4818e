// SPDX-License-Identifier: Apache-2.0
//
// What every voicemail token store keeps to, run on the one in memory and on the database.
#include <gtest/gtest.h>

#include <memory>
#include <thread>
#include <vector>

#include "Helper/Platform/Linux/VoicemailTokenDatabase.h"
#include "Tests/Fakes/FakeVoicemailTokenStore.h"
#include "Tests/VoicemailTokens/TokenFolder.h"

namespace {

using platform::VoicemailTokenStore;

// Makes stores on the same storage, as every process makes one of its own.
class MemoryStores {
 public:
  [[nodiscard]] std::unique_ptr<VoicemailTokenStore> make() const {
    return std::make_unique<fakes::FakeVoicemailTokenStore>(storage_);
  }

 private:
  std::shared_ptr<fakes::FakeVoicemailTokenStore::Storage> storage_ =
      std::make_shared<fakes::FakeVoicemailTokenStore::Storage>();
};

class DatabaseStores {
 public:
  [[nodiscard]] std::unique_ptr<VoicemailTokenStore> make() const {
    return std::make_unique<platform::VoicemailTokenDatabase>(folder_.file());
  }

 private:
  token_test::TokenFolder folder_;
};

template <class Stores>
class VoicemailTokenStoreContract : public testing::Test {
 protected:
  Stores stores;
};

class StoreNames {
 public:
  template <class Stores>
  static std::string GetName(int) {
    return std::is_same_v<Stores, MemoryStores> ? "Memory" : "Database";
  }
};
using Implementations = testing::Types<MemoryStores, DatabaseStores>;
TYPED_TEST_SUITE(VoicemailTokenStoreContract, Implementations, StoreNames);

TYPED_TEST(VoicemailTokenStoreContract, HasNothingAtFirst) {
  const auto store = this->stores.make();
  EXPECT_FALSE(store->copyCurrentToken());
  EXPECT_FALSE(store->copyToken("key"));
  EXPECT_FALSE(store->copyToken(""));
}

TYPED_TEST(VoicemailTokenStoreContract, KeepsWhatWasSetLast) {
  const auto store = this->stores.make();
  store->setCurrentToken("first");
  store->setCurrentToken("second");
  store->setToken("key", "third");
  store->setToken("key", "fourth");
  EXPECT_EQ(store->copyCurrentToken(), "second");
  EXPECT_EQ(store->copyToken("key"), "fourth");
}

TYPED_TEST(VoicemailTokenStoreContract, ShowsItToEveryStoreOnTheSameStorage) {
  const auto store = this->stores.make();
  const auto other = this->stores.make();
  store->setCurrentToken("current");
  store->setToken("key", "token");
  EXPECT_EQ(other->copyCurrentToken(), "current");
  EXPECT_EQ(other->copyToken("key"), "token");
  other->setCurrentToken(std::nullopt);
  EXPECT_FALSE(store->copyCurrentToken());
  EXPECT_EQ(this->stores.make()->copyToken("key"), "token");
}

TYPED_TEST(VoicemailTokenStoreContract, KeepsAnEmptyTokenApartFromNone) {
  const auto store = this->stores.make();
  store->setCurrentToken("");
  store->setToken("", "");
  EXPECT_EQ(store->copyCurrentToken(), "");
  EXPECT_EQ(store->copyToken(""), "");
  store->setCurrentToken(std::nullopt);
  EXPECT_FALSE(store->copyCurrentToken());
}

TYPED_TEST(VoicemailTokenStoreContract, KeepsTextOfEveryLengthAndScript) {
  const auto store = this->stores.make();
  const std::vector<std::string> texts{"\xf0\x9f\x93\x9e", "\n\t\x01\x7f",
                                       "'; DROP TABLE token; --", std::string(255, 'x'),
                                       std::string(100'000, 'y')};
  for (const std::string& text : texts) {
    store->setCurrentToken(text);
    store->setToken(text, text);
    EXPECT_EQ(store->copyCurrentToken(), text);
  }
  for (const std::string& text : texts) EXPECT_EQ(store->copyToken(text), text);
}

TYPED_TEST(VoicemailTokenStoreContract, TellsKeysApartByEveryByte) {
  const auto store = this->stores.make();
  store->setToken("key", "1");
  store->setToken("Key", "2");
  store->setToken("key ", "3");
  EXPECT_EQ(store->copyToken("key"), "1");
  EXPECT_EQ(store->copyToken("Key"), "2");
  EXPECT_EQ(store->copyToken("key "), "3");
}

TYPED_TEST(VoicemailTokenStoreContract, ClearsNothingWithoutHarm) {
  const auto store = this->stores.make();
  store->setCurrentToken(std::nullopt);
  store->removeAllRecords();
  EXPECT_FALSE(store->copyCurrentToken());
}

TYPED_TEST(VoicemailTokenStoreContract, KeepsTokensWhenTheRecordsAreRemoved) {
  const auto store = this->stores.make();
  store->setCurrentToken("current");
  store->setToken("key", "token");
  store->removeAllRecords();
  EXPECT_EQ(store->copyCurrentToken(), "current");
  EXPECT_EQ(store->copyToken("key"), "token");
}

TYPED_TEST(VoicemailTokenStoreContract, ServesManyThreads) {
  const auto store = this->stores.make();
  std::vector<std::thread> threads;
  for (int number = 0; number < 4; ++number) {
    threads.emplace_back([&store, number] {
      const std::string key = "key" + std::to_string(number);
      for (int round = 0; round < 20; ++round) {
        store->setToken(key, std::to_string(round));
        EXPECT_EQ(store->copyToken(key), std::to_string(round));
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
}

}  // namespace
