// SPDX-License-Identifier: Apache-2.0
//
// ArchiveBenchmark: extraction of zip files beside bsdtar and unzip, turn by turn. One thread.
// ArchiveBenchmark [--json] [FOLDER]; needs zip, unzip and bsdtar, and 1 GiB in FOLDER (the folder
// for temporary files).
#include <filesystem>
#include <fstream>
#include <memory>
#include <random>
#include <string>
#include <string_view>

#include "Benchmarks/Support/Compare.h"
#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/Report.h"
#include "Helper/Platform/ArchiveCopier.h"

namespace {

namespace fs = std::filesystem;

constexpr int kFolders = 50;
constexpr int kFilesPerFolder = 100;
constexpr int kLargeMegabytes = 256;

/// Text that compresses about as well as property lists and programs do.
std::string Text(std::size_t size, std::mt19937& random) {
  std::string text;
  while (text.size() < size) {
    text += "<key>" + std::to_string(random() % 10'000) + "</key><integer>" +
            std::to_string(random()) + "</integer>\n";
  }
  text.resize(size);
  return text;
}

void MakeManyFiles(const fs::path& root, std::mt19937& random) {
  for (int i = 0; i < kFolders; ++i) {
    const fs::path folder = root / ("folder" + std::to_string(i));
    fs::create_directories(folder);
    for (int k = 0; k < kFilesPerFolder; ++k) {
      std::ofstream(folder / ("file" + std::to_string(k)))
          << Text(static_cast<std::size_t>(100 + (k * 37) % 4000), random);
    }
  }
}

void MakeLargeFile(const fs::path& root, std::mt19937& random) {
  fs::create_directories(root);
  std::ofstream file(root / "large", std::ios::binary);
  for (int i = 0; i < kLargeMegabytes; ++i) file << Text(1 << 20, random);
}

void Extract(const std::string& archive, const std::string& to) {
  const auto copier = platform::Shared<platform::ArchiveCopierFactory>().create();
  if (!copier || copier->copy(archive, to,
                              {{platform::kExtractPKZip, true},
                               {platform::kCopyExtendedAttributes, true},
                               {platform::kCopyResources, true}}) != 0) {
    bench::Fail("extract");
  }
}

bench::Table CompareExtraction(const char* title, const fs::path& root, const fs::path& content,
                               double bsdtarGoal, double unzipGoal, int turns) {
  const std::string archive = root / "archive.zip";
  const std::string to = root / "to";
  fs::remove(archive);
  bench::Run({"sh", "-c", "cd " + content.string() + " && zip -qr " + archive + " ."});
  const auto prepare = [&] {
    fs::remove_all(to);
    fs::create_directory(to);
  };
  const auto times = bench::TakeTurns(turns, prepare,
                                      {[&] { Extract(archive, to); },
                                       [&] {
                                         bench::Run({"bsdtar", "-xf", archive, "-C", to});
                                       },
                                       [&] {
                                         bench::Run({"unzip", "-q", archive, "-d", to});
                                       }});
  const double ours = bench::Median(times[0]);
  return {.title = title,
          .unit = "ms",
          .figures = {{"bsdtar", bench::Median(times[1]), 1.0, {}},
                      {"ours", ours, bench::PairedRatio(times[0], times[1]), bsdtarGoal},
                      {"unzip", bench::Median(times[2]), 1.0, {}},
                      {"ours", ours, bench::PairedRatio(times[0], times[2]), unzipGoal}},
          .notes = {}};
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
  std::string name = base / "archive-benchmark-XXXXXX";
  if (::mkdtemp(name.data()) == nullptr) bench::Fail("make a folder");
  const fs::path root = name;
  (void)bench::TakePrecedence();  // without it the figures are only less steady
  bench::Report report(json);
  std::mt19937 random(1);
  MakeManyFiles(root / "many", random);
  report.add(CompareExtraction("Extract 5,000 small files", root, root / "many", 0.80, 0.67, 9));
  MakeLargeFile(root / "one", random);
  report.add(CompareExtraction("Extract one file of 256 MiB", root, root / "one", 0.95, 0.95, 7));
  report.finish();
  fs::remove_all(root);
  return 0;
}
