// SPDX-License-Identifier: Apache-2.0
//
// Archive copiers over archives in memory: what they extract is kept by path. One thread.
#pragma once

#include <cerrno>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/ArchiveCopier.h"

namespace fakes {

struct FakeArchive {
  struct Item {
    std::string name;
    std::string content{};
    int error = 0;  // of an item that cannot be extracted
  };
  std::vector<Item> items{};
  bool damaged = false;  // behind its items
};

class FakeArchiveCopierFactory final : public platform::ArchiveCopierFactory {
 public:
  std::unique_ptr<platform::ArchiveCopier> create() override {
    return available ? std::make_unique<Copier>(*this) : nullptr;
  }

  bool available = true;
  std::map<std::string, FakeArchive> archives;  // by path
  std::map<std::string, std::string> files;     // contents by path
  std::vector<platform::ArchiveCopyOptions> copies;
  std::string source, destination;  // of the last copy
  int copiersAlive = 0;

 private:
  class Copier final : public platform::ArchiveCopier {
   public:
    explicit Copier(FakeArchiveCopierFactory& factory) : factory_(factory) {
      ++factory_.copiersAlive;
    }
    ~Copier() override { --factory_.copiersAlive; }
    Copier(const Copier&) = delete;
    Copier& operator=(const Copier&) = delete;

    void setFileErrorCallback(FileErrorCallback callback) override {
      fileError_ = std::move(callback);
    }
    void setFatalErrorCallback(FatalErrorCallback callback) override {
      fatalError_ = std::move(callback);
    }
    int copy(const std::string& source, const std::string& destination,
             const platform::ArchiveCopyOptions& options) override {
      factory_.copies.push_back(options);
      factory_.source = source;
      factory_.destination = destination;
      const auto wanted = options.find(platform::kExtractPKZip);
      if (wanted == options.end() || !wanted->second) return EINVAL;
      const auto archive = factory_.archives.find(source);
      if (archive == factory_.archives.end()) return ENOENT;
      for (const FakeArchive::Item& item : archive->second.items) {
        if (item.error == 0) {
          factory_.files[destination + '/' + item.name] = item.content;
        } else if (fileError_ && fileError_(item.name, item.error) != platform::kLeaveItemOut) {
          return ECANCELED;
        }
      }
      if (!archive->second.damaged) return 0;
      if (fatalError_) fatalError_();
      return EBADMSG;
    }

   private:
    FakeArchiveCopierFactory& factory_;
    FileErrorCallback fileError_;
    FatalErrorCallback fatalError_;
  };
};

}  // namespace fakes
