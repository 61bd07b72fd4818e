// SPDX-License-Identifier: Apache-2.0
//
// The preferences store against the least that a durable write can cost: the same bytes written to
// a temporary file, fsync, rename, fsync of the folder. And the cost of reading a cached value. The
// two sides take turns. Takes the folder to work in as its argument. One thread.
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <string>
#include <vector>

#include "Helper/Platform/Linux/PreferenceFiles.h"

namespace {

using platform::FileDescriptor;
using platform::PreferenceDomain;
using platform::PreferenceFiles;
using platform::PropertyList;
using Clock = std::chrono::steady_clock;
namespace fs = std::filesystem;

template <class Work>
double MicrosecondsOf(const Work& work) {
  const Clock::time_point start = Clock::now();
  work();
  return std::chrono::duration<double, std::micro>(Clock::now() - start).count();
}

double Median(std::vector<double>& values) {
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

void Require(bool holds, const char* what) {
  if (holds) return;
  std::fprintf(stderr, "failed: %s\n", what);
  ::_exit(1);
}

void WriteDurably(const FileDescriptor& folder, const std::vector<std::byte>& bytes) {
  const FileDescriptor file(
      ::openat(folder.get(), "raw.tmp", O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  Require(
      file && ::write(file.get(), bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size()),
      "write");
  Require(::fsync(file.get()) == 0, "fsync");
  Require(::renameat(folder.get(), "raw.tmp", folder.get(), "raw") == 0, "rename");
  Require(::fsync(folder.get()) == 0, "fsync of the folder");
}

PropertyList Settings() {
  PropertyList::Dictionary settings;
  for (int i = 0; i < 20; ++i) {
    settings.set("Setting" + std::to_string(i), "value number " + std::to_string(i));
  }
  return settings;
}

void CompareWrites(const fs::path& root, const char* name, bool isFresh) {
  constexpr int kTurns = 300;
  const fs::path folder = root / name;
  fs::create_directories(folder / "raw");
  const FileDescriptor raw(::open((folder / "raw").c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  const platform::PreferenceRoots roots{folder / "user", folder / "any", "host"};
  const PreferenceDomain domain{"com.zarvo.benchmark"};
  PropertyList whole{PropertyList::Dictionary{}};
  whole.dictionary()->set("settings", Settings());
  whole.dictionary()->set("key", std::string(100, 'x'));
  const auto bytes = platform::SerializeBinary(whole);
  Require(bytes.has_value(), "serialize");

  PreferenceFiles kept(roots);
  kept.setValue("settings", Settings(), domain);
  Require(kept.synchronize(domain), "synchronize");
  std::vector<double> bare, ours;
  for (int turn = 0; turn < kTurns; ++turn) {
    std::string value = std::to_string(turn);
    value.resize(100, 'x');
    bare.push_back(MicrosecondsOf([&] { WriteDurably(raw, *bytes); }));
    ours.push_back(MicrosecondsOf([&] {
      // A fresh store reads the file first, as a helper that was just started does.
      PreferenceFiles fresh(roots);
      PreferenceFiles& files = isFresh ? fresh : kept;
      files.setValue("key", value, domain);
      Require(files.synchronize(domain), "synchronize");
    }));
  }
  const double bareMedian = Median(bare);
  const double ourMedian = Median(ours);
  std::printf(
      "set and synchronize, %-5s store: %7.0f us, bare write of the same %7.0f us, ratio %.2f"
      " (goal: at most 1.15)\n",
      name, ourMedian, bareMedian, ourMedian / bareMedian);
}

void MeasureReads(const fs::path& root) {
  constexpr int kTurns = 200;
  constexpr int kReads = 500;
  PreferenceFiles files({root / "user", root / "any", "host"});
  const PreferenceDomain domain{"com.zarvo.benchmark"};
  files.setValue("settings", Settings(), domain);
  files.setValue("key", "value", domain);
  Require(files.synchronize(domain), "synchronize");
  // Past the time within which a file's stamp may still hide a change.
  ::usleep(50'000);
  const std::string path = root / "user/com.zarvo.benchmark.plist";
  std::vector<double> stat, pair, app;
  for (int turn = 0; turn < kTurns; ++turn) {
    stat.push_back(MicrosecondsOf([&] {
      for (int i = 0; i < kReads; ++i) {
        Require(platform::StampOfPreferenceFile(path).inode != 0, "stat");
      }
    }));
    pair.push_back(MicrosecondsOf([&] {
      for (int i = 0; i < kReads; ++i) {
        Require(files.synchronize(domain) && files.copyValue("key", domain).has_value(), "copy");
      }
    }));
    app.push_back(MicrosecondsOf([&] {
      for (int i = 0; i < kReads; ++i) {
        Require(files.synchronizeApp(domain.identifier) &&
                    files.copyAppValue("key", domain.identifier).has_value(),
                "copy");
      }
    }));
  }
  const auto each = [](std::vector<double>& values) { return Median(values) * 1000 / kReads; };
  std::printf(
      "synchronize and copy a cached value: %.0f ns, through all scopes %.0f ns, one bare "
      "stat %.0f ns\n",
      each(pair), each(app), each(stat));
}

}  // namespace

int main(int argumentCount, char** arguments) {
  const fs::path base = argumentCount > 1 ? fs::path(arguments[1]) : fs::temp_directory_path();
  std::string name = (base / "preferences-benchmark-XXXXXX").string();
  Require(::mkdtemp(name.data()) != nullptr, "make a folder");
  CompareWrites(name, "kept", false);
  CompareWrites(name, "fresh", true);
  MeasureReads(fs::path(name) / "reads");
  fs::remove_all(name);
  return 0;
}
