// SPDX-License-Identifier: Apache-2.0
//
// An updater with a folder of its own, on a web, preferences, message ports and a log in memory.
// The test's thread and the updater's queue take turns: onQueue() and settle() wait for the queue.
#pragma once

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <semaphore>
#include <string>
#include <utility>
#include <vector>

#include "Helper/LASD/LASDUpdater.h"
#include "Helper/Platform/MessagePort.h"
#include "Helper/Platform/PreferencesStore.h"
#include "Helper/Platform/PropertyList.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/vlu/HttpTransport.h"
#include "Tests/Fakes/FakeHttpTransport.h"
#include "Tests/Fakes/FakeMessagePorts.h"
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Files/FolderForTest.h"
#include "Tests/Http/GzipForTest.h"

namespace lasd_test {

inline constexpr char kPort[] = "com.zarvo.Halvec.lasd";

/// A type's version dictionary.
inline platform::PropertyList Entry(const std::string& version, const std::string& url) {
  platform::PropertyList::Dictionary entry;
  entry.set("Version", version);
  entry.set("ContentURL", url);
  return entry;
}

/// A dictionary of the pairs.
inline platform::PropertyList Dictionary(
    std::initializer_list<std::pair<std::string, platform::PropertyList>> pairs) {
  platform::PropertyList::Dictionary dictionary;
  for (const auto& [key, value] : pairs) dictionary.set(key, value);
  return dictionary;
}

class UpdaterFixture : public testing::Test {
 protected:
  using Lines = std::vector<std::string>;
  using PropertyList = platform::PropertyList;

  UpdaterFixture() { ports.publish(kPort); }
  ~UpdaterFixture() override { settle(); }

  /// Runs `work` as the updater's queue runs a step, and waits for it.
  void onQueue(const std::function<void()>& work) {
    std::binary_semaphore done(0);
    updater->post([&] {
      work();
      done.release();
    });
    done.acquire();
  }
  /// Waits until all that was started has ended.
  void settle() {
    onQueue([] {});
  }

  /// Every line since the last call; all are notices.
  Lines lines() {
    Lines texts;
    for (auto& [priority, text] : log.takeLines()) {
      EXPECT_EQ(priority, platform::LogPriority::kNotice) << text;
      texts.push_back(std::move(text));
    }
    return texts;
  }

  /// The next notification.
  PropertyList notification() {
    const auto message = ports.take(kPort);
    EXPECT_EQ(message.id, 0);
    const auto list = platform::ParsePropertyList(message.payload);
    EXPECT_TRUE(list);
    return list ? *list : PropertyList(false);
  }
  [[nodiscard]] bool isSilent() { return ports.isEmpty(kPort); }

  void record(const std::string& type, PropertyList value) {
    store.setValue(type, std::move(value), domain);
    ASSERT_TRUE(store.synchronize(domain));
    (void)store.takeSynchronized();
  }
  std::optional<PropertyList> recorded(const std::string& type) {
    return store.copyValue(type, domain);
  }
  /// What another process would read.
  std::optional<PropertyList> written(const std::string& type) {
    return fakes::FakePreferencesStore(storage).copyValue(type, domain);
  }

  void putManifestBytes(const std::string& body) {
    web.put(kLASDManifestURL, 200, {body.begin(), body.end()},
            {{"Content-Type", "application/x-plist"}});
  }
  void putManifest(const PropertyList& manifest) {
    putManifestBytes(platform::SerializeXml(manifest).value());
  }
  void putDatabase(const std::string& url, const std::string& content) {
    web.put(url, 200, support::Gzip(content), {{"content-type", "application/gzip"}});
  }

  [[nodiscard]] std::string at(const std::string& name) const { return folder.at("LASD/" + name); }
  [[nodiscard]] std::string text(const std::string& name) const {
    return folder.text("LASD/" + name);
  }

  const platform::PreferenceDomain domain{.identifier = "com.zarvo.lasd"};
  files_test::FolderForTest folder;
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  const std::shared_ptr<fakes::FakePreferencesStore::Storage> storage =
      std::make_shared<fakes::FakePreferencesStore::Storage>();
  fakes::FakePreferencesStore store{storage};
  platform::ScopedReplacement<platform::PreferencesStore> storeReplacement{store};
  fakes::FakeMessagePorts ports;
  platform::ScopedReplacement<platform::MessagePorts> portsReplacement{ports};
  fakes::FakeHttpTransport web;
  platform::ScopedReplacement<vlu::Http::HttpTransport> webReplacement{web};
  const std::shared_ptr<LASDUpdater> updater =
      LASDUpdater::make_shared_ptr(new LASDUpdater(folder.at("LASD")));
};

}  // namespace lasd_test
