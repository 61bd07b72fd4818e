// SPDX-License-Identifier: Apache-2.0
//
// The writer that the power-cut campaign interrupts, and the reader that it asks afterwards:
//   TokenWriter store FOLDER    sets one number after the other through the token store
//   TokenWriter rename FOLDER   writes them to a file without any fsync, to show that the campaign
//                               notices
//   TokenWriter read FOLDER     prints the number that is stored, "none" or "torn"
// The writers print each number when it is acknowledged. One thread.
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/Linux/VoicemailTokenDatabase.h"

namespace {

using platform::VoicemailTokenDatabase;
namespace fs = std::filesystem;

// Set before the current token, and so of the same number or the next one.
constexpr const char* kKey = "ahead";

std::string TextFor(long long number) {
  return std::to_string(number) + std::string(static_cast<std::size_t>(number % 250), 'x');
}

fs::path DatabaseIn(const fs::path& folder) { return folder / "tokens.db"; }
fs::path FileIn(const fs::path& folder) { return folder / "token"; }

bool StoreDurably(VoicemailTokenDatabase& store, long long number) {
  store.setToken(kKey, TextFor(number));
  store.setCurrentToken(TextFor(number));
  return store.copyCurrentToken() == TextFor(number);
}

bool StoreByRename(const fs::path& folder, long long number) {
  const fs::path temporary = FileIn(folder).string() + ".tmp";
  fs::create_directories(folder);
  std::ofstream stream(temporary, std::ios::binary | std::ios::trunc);
  stream << TextFor(number);
  stream.close();
  std::error_code error;
  fs::rename(temporary, FileIn(folder), error);
  return stream.good() && !error;
}

int Write(const fs::path& folder, bool durably) {
  VoicemailTokenDatabase store(DatabaseIn(folder));
  for (long long number = 1;; ++number) {
    if (!(durably ? StoreDurably(store, number) : StoreByRename(folder, number))) return 1;
    std::printf("%lld\n", number);
    if (std::fflush(stdout) != 0) return 1;
  }
}

int Read(const fs::path& folder) {
  VoicemailTokenDatabase store(DatabaseIn(folder));
  std::optional<std::string> token;
  std::optional<std::string> ahead;
  if (fs::exists(FileIn(folder))) {
    std::string text;
    std::ifstream(FileIn(folder), std::ios::binary) >> text;
    token = ahead = text;
  } else {
    token = store.copyCurrentToken();
    ahead = store.copyToken(kKey);
  }
  if (!token) {
    std::puts("none");
    return 0;
  }
  const long long number = std::atoll(token->c_str());
  if (token == TextFor(number) && (ahead == token || ahead == TextFor(number + 1))) {
    std::printf("%lld\n", number);
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
  std::fputs("usage: TokenWriter store|rename|read FOLDER\n", stderr);
  return 2;
}
