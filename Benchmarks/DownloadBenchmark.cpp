// SPDX-License-Identifier: Apache-2.0
//
// DownloadBenchmark: a database of 100 MiB gunzipped and downloaded, beside zlib alone, gzip and
// curl. One thread. DownloadBenchmark [--json] [--shared] [FOLDER]; needs nginx, curl, gzip,
// openssl and 400 MiB in FOLDER (the folder for temporary files).
#include <fcntl.h>
#include <unistd.h>
#include <zlib.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "Benchmarks/Download/Nginx.h"
#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/Report.h"
#include "Helper/LASD/HttpDownloader.h"
#include "Helper/Platform/Linux/HttpTransportCurl.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/vlu/Compression.h"

namespace {

namespace fs = std::filesystem;
using bench::Fail;
using bench::MicrosecondsOf;
using Bytes = std::vector<std::uint8_t>;

constexpr std::size_t kDatabaseSize = std::size_t{100} << 20;
constexpr std::size_t kBufferSize = std::size_t{128} << 10;
constexpr int kTurns = 7;
constexpr double kMebibyte = 1 << 20;

/// Drops what the downloader says.
class Silence final : public platform::SystemLog {
 public:
  void write(platform::LogPriority /*priority*/, std::string_view /*text*/) override {}
};

void Require(bool good, const char* what) {
  if (!good) Fail(what);
}

void Shell(const std::string& command) {
  Require(std::system(command.c_str()) == 0, command.c_str());
}

/// Records as a database of cells has them: numbers that grow, numbers that vary a little, noise.
void WriteDatabase(const fs::path& path) {
  std::ofstream file(path, std::ios::binary);
  std::mt19937 engine(1);
  const auto random = [&] { return static_cast<std::uint32_t>(engine()); };
  std::string block;
  std::uint32_t cell = 0;
  for (std::size_t size = 0; size < kDatabaseSize; size += block.size()) {
    block.clear();
    while (block.size() < kBufferSize) {
      cell += 1 + random() % 16;
      const std::uint32_t fields[] = {cell, 310 + random() % 8, random() % 4096, random()};
      block.append(reinterpret_cast<const char*>(fields), sizeof fields);
    }
    block.resize(kBufferSize);
    file.write(block.data(), static_cast<std::streamsize>(block.size()));
  }
  file.close();
  Require(file.good(), "write the database");
}

Bytes ReadFile(const fs::path& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

/// What cannot be done with less: inflate and write.
void InflateBare(const Bytes& data, const fs::path& path) {
  const int file =
      bench::Check(::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644), "open");
  std::vector<Bytef> buffer(kBufferSize);
  z_stream stream{};
  Require(inflateInit2(&stream, MAX_WBITS + 16) == Z_OK, "inflateInit2");
  stream.next_in = const_cast<Bytef*>(data.data());
  stream.avail_in = static_cast<uInt>(data.size());
  int result = Z_OK;
  while (result == Z_OK) {
    stream.next_out = buffer.data();
    stream.avail_out = kBufferSize;
    result = inflate(&stream, Z_NO_FLUSH);
    const std::size_t length = kBufferSize - stream.avail_out;
    Require(::write(file, buffer.data(), length) == static_cast<ssize_t>(length), "write");
  }
  Require(result == Z_STREAM_END, "inflate");
  inflateEnd(&stream);
  ::close(file);
}

struct Contestant {
  std::string name;
  std::function<void()> work;
  std::vector<double> milliseconds{};
};

/// Turn by turn, each into a new file; who goes first changes.
void Compete(std::vector<Contestant>& all, const fs::path& output) {
  for (int turn = 0; turn < kTurns; ++turn) {
    for (std::size_t i = 0; i < all.size(); ++i) {
      Contestant& one = all[(i + static_cast<std::size_t>(turn)) % all.size()];
      fs::remove(output);
      ::sync();
      one.milliseconds.push_back(MicrosecondsOf(one.work) / 1000);
      Require(fs::file_size(output) == kDatabaseSize, one.name.c_str());
    }
  }
}

double Ratio(const Contestant& one, const Contestant& base) {
  return bench::PairedRatio(one.milliseconds, base.milliseconds);
}

bench::Table Gunzip(const Bytes& compressed, const fs::path& root) {
  const fs::path output = root / "output";
  const std::string gzip =
      "gzip -dc '" + (root / "web/database.gz").string() + "' > '" + output.string() + "'";
  std::vector<Contestant> all{{"zlib and write alone", [&] { InflateBare(compressed, output); }},
                              {"gzip -dc", [&] { Shell(gzip); }},
                              {"ours", [&] {
                                 std::ofstream file(output, std::ios::binary);
                                 Require(vlu::Compression::Decompress(compressed, file), "gunzip");
                               }}};
  Compete(all, output);
  const double ours = bench::Median(all[2].milliseconds);
  return {.title = "Gunzip 100 MiB into a file",
          .unit = "ms",
          .figures = {{all[0].name, bench::Median(all[0].milliseconds), 1.0, {}},
                      {all[1].name, bench::Median(all[1].milliseconds), Ratio(all[1], all[0]), {}},
                      {"ours", ours, Ratio(all[2], all[0]), 1.05},
                      {"ours, divided by gzip -dc", ours, Ratio(all[2], all[1]), 0.6}},
          .notes = {}};
}

void FetchAndUncompress(const std::string& url, const fs::path& output) {
  HttpDownloader downloader;
  Require(downloader.fetch(url, /*wifiOnly=*/true), "fetch");
  Require(downloader.uncompressTo(output), "uncompress");
}

bench::Table Download(const bench::Nginx& server, const std::string& scheme, const fs::path& root) {
  const fs::path output = root / "output";
  const std::string url = server.url(scheme, "database.gz");
  const std::string pipe = "curl -sf --cacert '" + server.authority() + "' " + url +
                           " | gzip -dc > '" + output.string() + "'";
  std::vector<Contestant> all{{"curl | gzip -dc", [&] { Shell(pipe); }},
                              {"ours", [&] { FetchAndUncompress(url, output); }}};
  Compete(all, output);
  return {.title = "Download over " + scheme + " and gunzip 100 MiB",
          .unit = "ms",
          .figures = {{all[0].name, bench::Median(all[0].milliseconds), 1.0, {}},
                      {"ours", bench::Median(all[1].milliseconds), Ratio(all[1], all[0]), 0.8}},
          .notes = {}};
}

/// A line of /proc/self/status, in MiB.
double StatusLine(const std::string& name) {
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with(name + ":")) return std::stod(line.substr(name.size() + 1)) / 1024;
  }
  Fail("read the memory in use");
}

/// In a process of its own: the peak beyond the body and what the loaded library needs at rest.
double PeakBeyondBody(const bench::Nginx& server, const fs::path& root, double bodySize) {
  int ends[2];
  bench::Check(::pipe2(ends, O_CLOEXEC), "pipe2");
  const bench::Child child(-1, [&] {
    (void)HttpDownloader().fetch(server.url("https", "small.gz"), true);
    std::ofstream("/proc/self/clear_refs") << "5";  // begins a new peak
    const double before = StatusLine("VmRSS");
    FetchAndUncompress(server.url("https", "database.gz"), root / "output");
    const double peak = StatusLine("VmHWM") - before - bodySize / kMebibyte;
    Require(::write(ends[1], &peak, sizeof peak) == sizeof peak, "report the peak");
  });
  ::close(ends[1]);
  double peak = 0;
  Require(::read(ends[0], &peak, sizeof peak) == sizeof peak, "measure the peak");
  ::close(ends[0]);
  return peak;
}

}  // namespace

int main(int count, char** arguments) {
  bool json = false;
  bool shared = false;
  fs::path base = fs::temp_directory_path();
  for (int i = 1; i < count; ++i) {
    if (std::string_view(arguments[i]) == "--json") {
      json = true;
    } else if (std::string_view(arguments[i]) == "--shared") {
      shared = true;
    } else {
      base = arguments[i];
    }
  }
  std::string name = base / "download-benchmark-XXXXXX";
  if (::mkdtemp(name.data()) == nullptr) Fail("make a folder");
  const fs::path root = name;
  fs::create_directory(root / "web");
  WriteDatabase(root / "web/database");
  Shell("cd '" + (root / "web").string() + "' && gzip database && echo small | gzip > small.gz");

  if (!shared) (void)bench::TakePrecedence();
  Silence silence;
  const platform::ScopedReplacement<platform::SystemLog> log(silence);
  const bench::Nginx server(root);
  platform::HttpProfile profile;
  profile.certificates = server.authority();
  platform::HttpTransportCurl transport(profile);
  const platform::ScopedReplacement<vlu::Http::HttpTransport> replacement(transport);

  const double bodySize = static_cast<double>(fs::file_size(root / "web/database.gz"));
  bench::Report report(json);
  report.add({.title = "Memory at the peak of an https download, beyond a body of " +
                       std::to_string(static_cast<int>(bodySize / kMebibyte)) + " MiB",
              .unit = "MiB",
              .figures = {{"ours", PeakBeyondBody(server, root, bodySize), {}, 4.0}},
              .notes = {}});
  report.add(Gunzip(ReadFile(root / "web/database.gz"), root));
  report.add(Download(server, "http", root));
  report.add(Download(server, "https", root));
  report.finish();
  fs::remove_all(root);
  return 0;
}
