// SPDX-License-Identifier: Apache-2.0
//
// What every preferences store keeps to, run on the one in memory and on the one on files. One
// thread, but for the test that says otherwise.
#include <gtest/gtest.h>

#include <memory>
#include <thread>

#include "Helper/Platform/Linux/PreferenceFiles.h"
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Preferences/TemporaryFolder.h"

namespace {

using platform::HostScope;
using platform::PreferenceDomain;
using platform::PreferencesStore;
using platform::PropertyList;
using platform::UserScope;

// Makes stores on the same storage, as every process makes one of its own.
class MemoryStores {
 public:
  [[nodiscard]] std::unique_ptr<PreferencesStore> make() const {
    return std::make_unique<fakes::FakePreferencesStore>(storage_);
  }

 private:
  std::shared_ptr<fakes::FakePreferencesStore::Storage> storage_ =
      std::make_shared<fakes::FakePreferencesStore::Storage>();
};

class FileStores {
 public:
  [[nodiscard]] std::unique_ptr<PreferencesStore> make() const {
    return std::make_unique<platform::PreferenceFiles>(folder_.roots());
  }

 private:
  preferences_test::TemporaryFolder folder_;
};

template <class Stores>
class PreferencesStoreContract : public testing::Test {
 protected:
  Stores stores;
  const PreferenceDomain domain{"com.zarvo.carrier"};
};

class StoreNames {
 public:
  template <class Stores>
  static std::string GetName(int) {
    return std::is_same_v<Stores, MemoryStores> ? "Memory" : "Files";
  }
};

using Implementations = testing::Types<MemoryStores, FileStores>;
TYPED_TEST_SUITE(PreferencesStoreContract, Implementations, StoreNames);

TYPED_TEST(PreferencesStoreContract, HasNothingAtFirst) {
  const auto store = this->stores.make();
  EXPECT_FALSE(store->copyValue("key", this->domain));
  EXPECT_TRUE(store->synchronize(this->domain));
  EXPECT_FALSE(store->copyAppValue("key", "com.zarvo.carrier"));
  EXPECT_TRUE(store->synchronizeApp("com.zarvo.carrier"));
}

TYPED_TEST(PreferencesStoreContract, ShowsAChangeAtOnceAndOthersAfterSynchronizing) {
  const auto store = this->stores.make();
  const auto other = this->stores.make();
  store->setValue("key", "value", this->domain);
  EXPECT_EQ(store->copyValue("key", this->domain), PropertyList("value"));
  EXPECT_TRUE(other->synchronize(this->domain));
  EXPECT_FALSE(other->copyValue("key", this->domain));
  EXPECT_TRUE(store->synchronize(this->domain));
  EXPECT_TRUE(other->synchronize(this->domain));
  EXPECT_EQ(other->copyValue("key", this->domain), PropertyList("value"));
}

TYPED_TEST(PreferencesStoreContract, RemovesAKeySetToNothing) {
  const auto store = this->stores.make();
  store->setValue("key", 1, this->domain);
  store->setValue("other", 2, this->domain);
  EXPECT_TRUE(store->synchronize(this->domain));
  store->setValue("key", std::nullopt, this->domain);
  EXPECT_FALSE(store->copyValue("key", this->domain));
  EXPECT_TRUE(store->synchronize(this->domain));
  const auto later = this->stores.make();
  EXPECT_FALSE(later->copyValue("key", this->domain));
  EXPECT_EQ(later->copyValue("other", this->domain), PropertyList(2));
  later->setValue("missing", std::nullopt, this->domain);
  EXPECT_TRUE(later->synchronize(this->domain));
}

TYPED_TEST(PreferencesStoreContract, KeepsEveryKindOfValue) {
  PropertyList::Dictionary inner;
  inner.set("", PropertyList::Array{});
  inner.set("control \x01", "\x1B");
  const std::vector<PropertyList> values{true,
                                         std::numeric_limits<std::uint64_t>::max(),
                                         std::numeric_limits<std::int64_t>::min(),
                                         0.1,
                                         "\xF0\x9F\x98\x80",
                                         PropertyList::Data(1000, std::byte{7}),
                                         PropertyList::Date{0.25},
                                         PropertyList::Uid{9},
                                         PropertyList::Array{1, "a", inner},
                                         inner};
  const auto store = this->stores.make();
  for (std::size_t i = 0; i < values.size(); ++i) {
    store->setValue(std::to_string(i), values[i], this->domain);
  }
  EXPECT_TRUE(store->synchronize(this->domain));
  const auto later = this->stores.make();
  for (std::size_t i = 0; i < values.size(); ++i) {
    EXPECT_EQ(later->copyValue(std::to_string(i), this->domain), values[i]) << i;
  }
}

TYPED_TEST(PreferencesStoreContract, KeepsKeysThatOthersWroteMeanwhile) {
  const auto store = this->stores.make();
  const auto other = this->stores.make();
  store->setValue("mine", 1, this->domain);
  EXPECT_TRUE(store->synchronize(this->domain));
  other->setValue("theirs", 2, this->domain);
  EXPECT_TRUE(other->synchronize(this->domain));
  store->setValue("mine", 3, this->domain);
  EXPECT_TRUE(store->synchronize(this->domain));
  const auto later = this->stores.make();
  EXPECT_EQ(later->copyValue("mine", this->domain), PropertyList(3));
  EXPECT_EQ(later->copyValue("theirs", this->domain), PropertyList(2));
}

TYPED_TEST(PreferencesStoreContract, KeepsScopesAndDomainsApart) {
  const auto store = this->stores.make();
  int number = 0;
  for (const char* identifier :
       {"com.zarvo.carrier", "com.zarvo.Carrier", "com.zarvo/carrier", ""}) {
    for (const UserScope user : {UserScope::kCurrentUser, UserScope::kAnyUser}) {
      for (const HostScope host : {HostScope::kCurrentHost, HostScope::kAnyHost}) {
        store->setValue("key", ++number, {identifier, user, host});
        EXPECT_TRUE(store->synchronize({identifier, user, host}));
      }
    }
  }
  number = 0;
  const auto later = this->stores.make();
  for (const char* identifier :
       {"com.zarvo.carrier", "com.zarvo.Carrier", "com.zarvo/carrier", ""}) {
    for (const UserScope user : {UserScope::kCurrentUser, UserScope::kAnyUser}) {
      for (const HostScope host : {HostScope::kCurrentHost, HostScope::kAnyHost}) {
        EXPECT_EQ(later->copyValue("key", {identifier, user, host}), PropertyList(++number));
      }
    }
  }
}

TYPED_TEST(PreferencesStoreContract, SearchesTheScopesFromTheNarrowestToTheWidest) {
  const auto store = this->stores.make();
  const std::string name = "com.zarvo.carrier";
  const std::vector<PreferenceDomain> narrowing{
      {name, UserScope::kAnyUser, HostScope::kAnyHost},
      {name, UserScope::kAnyUser, HostScope::kCurrentHost},
      {name, UserScope::kCurrentUser, HostScope::kAnyHost},
      {name, UserScope::kCurrentUser, HostScope::kCurrentHost}};
  for (std::size_t i = 0; i < narrowing.size(); ++i) {
    store->setValue("key", i, narrowing[i]);
    EXPECT_EQ(store->copyAppValue("key", name), PropertyList(i));
    EXPECT_TRUE(store->synchronizeApp(name));
    EXPECT_EQ(store->copyAppValue("key", name), PropertyList(i));
  }
  const auto later = this->stores.make();
  for (std::size_t i = narrowing.size(); i-- > 0;) {
    EXPECT_EQ(later->copyAppValue("key", name), PropertyList(i));
    later->setValue("key", std::nullopt, narrowing[i]);
    EXPECT_TRUE(later->synchronizeApp(name));
  }
  EXPECT_FALSE(later->copyAppValue("key", name));
}

TYPED_TEST(PreferencesStoreContract, ForgetsPendingChangesOfTheFlushedScopes) {
  const auto store = this->stores.make();
  const std::string name = "com.zarvo.carrier";
  const PreferenceDomain mine{name};
  const PreferenceDomain mineHere{name, UserScope::kCurrentUser, HostScope::kCurrentHost};
  const PreferenceDomain everybodys{name, UserScope::kAnyUser, HostScope::kAnyHost};
  store->setValue("key", "stored", mine);
  EXPECT_TRUE(store->synchronize(mine));
  for (const auto& domain : {mine, mineHere, everybodys}) store->setValue("key", "new", domain);
  store->flushCachedDomain(name, UserScope::kCurrentUser);
  EXPECT_EQ(store->copyValue("key", mine), PropertyList("stored"));
  EXPECT_FALSE(store->copyValue("key", mineHere));
  EXPECT_EQ(store->copyValue("key", everybodys), PropertyList("new"));
  store->flushCachedDomain(name, UserScope::kAnyUser);
  EXPECT_FALSE(store->copyValue("key", everybodys));
  EXPECT_EQ(store->copyValue("key", mine), PropertyList("stored"));
}

TYPED_TEST(PreferencesStoreContract, ServesSeveralThreads) {
  const auto store = this->stores.make();
  constexpr int kThreads = 4;
  constexpr int kRounds = 20;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; i < kRounds; ++i) {
        const std::string key = std::to_string(t);
        store->setValue(key, i, this->domain);
        EXPECT_EQ(store->copyValue(key, this->domain), PropertyList(i));
        EXPECT_TRUE(store->synchronize(this->domain));
        EXPECT_EQ(store->copyAppValue(key, this->domain.identifier), PropertyList(i));
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  const auto later = this->stores.make();
  for (int t = 0; t < kThreads; ++t) {
    EXPECT_EQ(later->copyValue(std::to_string(t), this->domain), PropertyList(kRounds - 1));
  }
}

}  // namespace
