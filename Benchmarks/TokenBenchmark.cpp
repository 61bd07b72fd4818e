// SPDX-License-Identifier: Apache-2.0
//
// The voicemail token store beside SQLite itself in the same mode, beside the least that one
// durable change can cost (an append of the same size and fdatasync), and beside the steps that
// replace a file durably. The contestants take turns. One thread.
//
// TokenBenchmark [--json] [FOLDER]      FOLDER: on the disk to measure
#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/Report.h"
#include "Helper/Platform/Linux/VoicemailTokenDatabase.h"

namespace {

namespace fs = std::filesystem;
using platform::FileDescriptor;
using platform::VoicemailTokenDatabase;

constexpr std::size_t kTokenLength = 100;
/// What a change of one page adds to a write-ahead log: the page and its head.
constexpr std::size_t kLogFrame = 4096 + 24;

std::string TokenOf(int number) {
  std::string token = std::to_string(number);
  token.resize(kTokenLength, 'x');
  return token;
}

/// SQLite without anything around it.
class BareSqlite {
 public:
  explicit BareSqlite(const std::string& path) {
    check(::sqlite3_open(path.c_str(), &database_));
    check(::sqlite3_exec(database_,
                         "PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL;"
                         "PRAGMA wal_autocheckpoint = 100; PRAGMA secure_delete = ON;"
                         "CREATE TABLE token (id INTEGER PRIMARY KEY, token TEXT) STRICT;",
                         nullptr, nullptr, nullptr));
    check(::sqlite3_prepare_v2(database_, "INSERT OR REPLACE INTO token VALUES (0, ?1);", -1, &set_,
                               nullptr));
    check(::sqlite3_prepare_v2(database_, "SELECT token FROM token;", -1, &copy_, nullptr));
  }
  ~BareSqlite() {
    (void)::sqlite3_finalize(set_);
    (void)::sqlite3_finalize(copy_);
    (void)::sqlite3_close(database_);
  }
  BareSqlite(const BareSqlite&) = delete;
  BareSqlite& operator=(const BareSqlite&) = delete;

  void set(const std::string& token) {
    check(
        ::sqlite3_bind_text(set_, 1, token.data(), static_cast<int>(token.size()), SQLITE_STATIC));
    if (::sqlite3_step(set_) != SQLITE_DONE) bench::Fail("set");
    check(::sqlite3_reset(set_));
  }
  std::string copy() {
    if (::sqlite3_step(copy_) != SQLITE_ROW) bench::Fail("copy");
    std::string token(reinterpret_cast<const char*>(::sqlite3_column_text(copy_, 0)));
    check(::sqlite3_reset(copy_));
    return token;
  }

 private:
  static void check(int code) {
    if (code != SQLITE_OK) bench::Fail("SQLite");
  }
  sqlite3* database_ = nullptr;
  sqlite3_stmt* set_ = nullptr;
  sqlite3_stmt* copy_ = nullptr;
};

void Append(const FileDescriptor& file) {
  static const std::string frame(kLogFrame, 'f');
  if (::write(file.get(), frame.data(), frame.size()) != static_cast<ssize_t>(frame.size())) {
    bench::Fail("write");
  }
  bench::Check(::fdatasync(file.get()), "fdatasync");
}

void Replace(const FileDescriptor& folder, const std::string& content) {
  const FileDescriptor file(bench::Check(
      ::openat(folder.get(), "raw.tmp", O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600), "openat"));
  if (::write(file.get(), content.data(), content.size()) != static_cast<ssize_t>(content.size())) {
    bench::Fail("write");
  }
  bench::Check(::fsync(file.get()), "fsync");
  bench::Check(::renameat(folder.get(), "raw.tmp", folder.get(), "raw"), "renameat");
  bench::Check(::fsync(folder.get()), "fsync of the folder");
}

bench::Table MeasureSets(const fs::path& folder) {
  constexpr int kRounds = 301;
  BareSqlite bare(folder / "bare.db");
  VoicemailTokenDatabase store(folder / "store/tokens.db");
  const FileDescriptor log(
      bench::Check(::open((folder / "log").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600), "open"));
  const FileDescriptor place(
      bench::Check(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC), "open"));
  std::vector<double> appends, replaces, bares, ours;
  for (int round = 0; round < kRounds; ++round) {
    const std::string token = TokenOf(round);
    appends.push_back(bench::MicrosecondsOf([&] { Append(log); }));
    replaces.push_back(bench::MicrosecondsOf([&] { Replace(place, token); }));
    bares.push_back(bench::MicrosecondsOf([&] { bare.set(token); }));
    ours.push_back(bench::MicrosecondsOf([&] { store.setCurrentToken(token); }));
  }
  if (store.copyCurrentToken() != TokenOf(kRounds - 1)) bench::Fail("nothing was stored");
  constexpr double kGoal = 1.15;
  return {.title = "set a token, durably, beside SQLite in the same mode",
          .unit = "us",
          .figures = {{"SQLite", bench::Median(bares), 1.0, {}},
                      {"token store", bench::Median(ours), bench::PairedRatio(ours, bares), kGoal},
                      {"append of the same size, fdatasync",
                       bench::Median(appends),
                       bench::PairedRatio(appends, bares),
                       {}},
                      {"temporary file, fsync, rename, fsync of the folder",
                       bench::Median(replaces),
                       bench::PairedRatio(replaces, bares),
                       {}}},
          .notes = {}};
}

bench::Table MeasureCopies(const fs::path& folder) {
  constexpr int kRounds = 201;
  constexpr int kCopies = 200;
  BareSqlite bare(folder / "bare-copies.db");
  VoicemailTokenDatabase store(folder / "copies/tokens.db");
  bare.set(TokenOf(1));
  store.setCurrentToken(TokenOf(1));
  std::vector<double> bares, ours;
  const auto each = [](const auto& copy) {
    return bench::MicrosecondsOf([&] {
             for (int i = 0; i < kCopies; ++i) {
               if (copy() != TokenOf(1)) bench::Fail("copy");
             }
           }) /
           kCopies;
  };
  for (int round = 0; round < kRounds; ++round) {
    bares.push_back(each([&] { return bare.copy(); }));
    ours.push_back(each([&] { return store.copyCurrentToken(); }));
  }
  constexpr double kGoal = 1.15;
  return {.title = "copy a token, beside SQLite in the same mode",
          .unit = "us",
          .figures = {{"SQLite", bench::Median(bares), 1.0, {}},
                      {"token store", bench::Median(ours), bench::PairedRatio(ours, bares), kGoal}},
          .notes = {}};
}

bench::Table MeasureOpening(const fs::path& folder) {
  constexpr int kRounds = 101;
  const std::string file = folder / "opened/tokens.db";
  VoicemailTokenDatabase(file).setCurrentToken(TokenOf(1));
  std::vector<double> rounds;
  for (int round = 0; round < kRounds; ++round) {
    rounds.push_back(bench::MicrosecondsOf([&] {
      if (VoicemailTokenDatabase(file).copyCurrentToken() != TokenOf(1)) bench::Fail("copy");
    }));
  }
  return {.title = "the first copy of a helper, the library being loaded",
          .unit = "us",
          .figures = {{"open, examine, copy, close", bench::Median(rounds), {}, {}}},
          .notes = {}};
}

}  // namespace

int main(int count, char** arguments) {
  bool json = false;
  fs::path base = "/var/tmp";
  for (int index = 1; index < count; ++index) {
    const std::string_view argument = arguments[index];
    if (argument == "--json") {
      json = true;
    } else {
      base = argument;
    }
  }
  std::string folder = base / "token-benchmark-XXXXXX";
  if (!::mkdtemp(folder.data())) bench::Fail("mkdtemp");
  bench::Report report(json);
  report.add(MeasureOpening(folder));
  report.add(MeasureSets(folder));
  report.add(MeasureCopies(folder));
  report.finish();
  fs::remove_all(folder);
  return 0;
}
