// SPDX-License-Identifier: Apache-2.0
//
// FilesBenchmark: copies, merges and changes of owner beside cp and chown, turn by turn. One
// thread. FilesBenchmark [--json] [FOLDER]; needs 3 GiB in FOLDER (the folder for temporary files)
// and, for owners, root.
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <string_view>

#include "Benchmarks/Support/Compare.h"
#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/Report.h"
#include "Helper/Files/FileUtilities.h"

namespace {

namespace fs = std::filesystem;
using bench::Fail;
using bench::Run;
using platform::FileManager;

constexpr int kFolders = 100;
constexpr int kFilesPerFolder = 100;

void MakeTree(const fs::path& root) {
  for (int i = 0; i < kFolders; ++i) {
    const fs::path folder = root / ("folder" + std::to_string(i));
    fs::create_directories(folder);
    for (int k = 0; k < kFilesPerFolder; ++k) {
      std::ofstream(folder / ("file" + std::to_string(k)))
          << std::string(static_cast<std::size_t>(100 + (k * 37) % 4000), 'x');
    }
  }
}

FileManager& Manager() { return platform::Shared<FileManager>(); }

void Require(bool good, const char* what) {
  if (!good) Fail(what);
}

/// Runs both in turn, each after `prepare`, and compares them; the peer is 1.00.
bench::Table Compare(const char* title, const char* peer, double goal, int turns,
                     const std::function<void()>& prepare, const std::function<void()>& ours,
                     const std::function<void()>& theirs) {
  const auto times = bench::TakeTurns(turns, prepare, {ours, theirs});
  return {
      .title = title,
      .unit = "ms",
      .figures = {{peer, bench::Median(times[1]), 1.0, {}},
                  {"ours", bench::Median(times[0]), bench::PairedRatio(times[0], times[1]), goal}},
      .notes = {}};
}

bench::Table CopyTree(const fs::path& root) {
  const std::string from = root / "tree";
  const std::string to = root / "copy";
  return Compare(
      "Copy a tree of 10,000 small files", "cp -a", 0.75, 7, [&] { fs::remove_all(to); },
      [&] { Require(Manager().copyItem(from, to, nullptr), "copy"); },
      [&] {
        Run({"cp", "-a", from, to});
      });
}

bench::Table CopyLargeFile(const fs::path& root) {
  const std::string from = root / "large";
  const std::string to = root / "large-copy";
  {
    std::ofstream file(from, std::ios::binary);
    const std::string block(1 << 20, 'x');
    for (int i = 0; i < 1024; ++i) file << block;
    file.close();
    Require(file.good(), "write 1 GiB");
  }
  bench::Table table = Compare(
      "Copy a file of 1 GiB", "cp -a", 1.0, 5, [&] { fs::remove(to); },
      [&] { Require(Manager().copyItem(from, to, nullptr), "copy"); },
      [&] {
        Run({"cp", "-a", from, to});
      });
  fs::remove(from);
  fs::remove(to);
  return table;
}

bench::Table ChangeOwners(const fs::path& root) {
  const std::string tree = root / "tree";
  std::uint32_t id = 501;
  return Compare(
      "Give a tree of 10,000 files to another owner", "chown -R", 1.0, 15, [&] { id ^= 1; },
      [&] { Require(SetItemOwner(tree.c_str(), id, id, true) == 0, "change the owner"); },
      [&] {
        Run({"chown", "-R", std::to_string(id) + ":" + std::to_string(id), tree});
      });
}

bench::Table Merge(const fs::path& root) {
  const std::string from = root / "tree";
  const std::string into = root / "merged";
  bench::Table table = Compare(
      "Merge a tree into one with the same 10,000 names", "cp -aT --remove-destination", 1.0, 5,
      [&] {
        fs::remove_all(into);
        Run({"cp", "-a", from, into});
      },
      [&] { MergeItem(Manager(), from, into, /*copy=*/true); },
      [&] {
        Run({"cp", "-aT", "--remove-destination", from, into});
      });
  fs::remove_all(into);
  return table;
}

}  // namespace

int main(int count, char** arguments) {
  bool json = false;
  fs::path base = fs::temp_directory_path();
  for (int i = 1; i < count; ++i) {
    if (std::string_view(arguments[i]) == "--json") {
      json = true;
    } else {
      base = arguments[i];
    }
  }
  std::string name = base / "files-benchmark-XXXXXX";
  if (::mkdtemp(name.data()) == nullptr) Fail("make a folder");
  const fs::path root = name;
  (void)bench::TakePrecedence();  // without it the figures are only less steady
  bench::Report report(json);
  MakeTree(root / "tree");
  report.add(CopyTree(root));
  fs::remove_all(root / "copy");
  report.add(Merge(root));
  if (::geteuid() == 0) report.add(ChangeOwners(root));
  report.add(CopyLargeFile(root));
  report.finish();
  fs::remove_all(root);
  return 0;
}
