// SPDX-License-Identifier: Apache-2.0
//
// The writer that the power-cut campaign interrupts, and the reader that it asks afterwards:
//   PreferenceWriter store FOLDER    sets one number after the other through the preferences store
//   PreferenceWriter rename FOLDER   the same without any fsync, to show that the campaign notices
//   PreferenceWriter read FOLDER     prints the number that is stored, "none" or "torn"
// The writers print each number when it is acknowledged. One thread.
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/Linux/PreferenceFiles.h"

namespace {

using platform::PreferenceDomain;
using platform::PreferenceFiles;
using platform::PropertyList;
namespace fs = std::filesystem;

constexpr const char* kDomain = "com.zarvo.campaign";

// Tells which number a file was written for, whatever its "number" says.
std::string TextFor(std::int64_t number) {
  return std::string(static_cast<std::size_t>(number % 9000), 'x') + std::to_string(number);
}

bool StoreDurably(PreferenceFiles& files, std::int64_t number) {
  files.setValue("number", number, {kDomain});
  files.setValue("text", TextFor(number), {kDomain});
  return files.synchronize(PreferenceDomain{kDomain});
}

bool StoreByRename(const fs::path& folder, std::int64_t number) {
  PropertyList::Dictionary values;
  values.set("number", number);
  values.set("text", TextFor(number));
  const auto bytes = platform::SerializeBinary(std::move(values));
  if (!bytes) return false;
  const fs::path file = folder / (std::string(kDomain) + ".plist");
  const fs::path temporary = file.string() + ".tmp";
  fs::create_directories(folder);
  std::ofstream stream(temporary, std::ios::binary | std::ios::trunc);
  stream.write(reinterpret_cast<const char*>(bytes->data()),
               static_cast<std::streamsize>(bytes->size()));
  stream.close();
  std::error_code error;
  fs::rename(temporary, file, error);
  return stream.good() && !error;
}

int Write(const fs::path& folder, bool durably) {
  PreferenceFiles files({folder, folder, "host"});
  for (std::int64_t number = 1;; ++number) {
    if (!(durably ? StoreDurably(files, number) : StoreByRename(folder, number))) return 1;
    std::printf("%lld\n", static_cast<long long>(number));
    if (std::fflush(stdout) != 0) return 1;
  }
}

int Read(const fs::path& folder) {
  const std::string file = folder / (std::string(kDomain) + ".plist");
  const platform::PreferenceFileContents contents = platform::ReadPreferenceFile(file);
  if (contents.state == platform::PreferenceFileContents::State::kAbsent) {
    std::puts("none");
    return 0;
  }
  const PropertyList* number = contents.values.find("number");
  const PropertyList* text = contents.values.find("text");
  const auto value = number != nullptr ? number->integer() : std::nullopt;
  if (value && text != nullptr && *text == PropertyList(TextFor(*value))) {
    std::printf("%lld\n", static_cast<long long>(*value));
  } else {
    std::puts("torn");
  }
  return 0;
}

}  // namespace

int main(int argumentCount, char** arguments) {
  const std::vector<std::string_view> words(arguments, arguments + argumentCount);
  if (words.size() == 3 && words[1] == "store") return Write(words[2], true);
  if (words.size() == 3 && words[1] == "rename") return Write(words[2], false);
  if (words.size() == 3 && words[1] == "read") return Read(words[2]);
  std::fputs("usage: PreferenceWriter store|rename|read FOLDER\n", stderr);
  return 2;
}
