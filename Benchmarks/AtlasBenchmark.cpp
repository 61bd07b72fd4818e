// SPDX-License-Identifier: Apache-2.0
//
// The offline geocoder: latency of a look-up, opening from the disk, memory, beside SQLite R*Trees
// over the same areas and places. One thread.
#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cmath>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <numbers>
#include <random>
#include <string>
#include <vector>

#include "Benchmarks/Atlas/SpatialDatabase.h"
#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/Report.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/AtlasGeocoder.h"
#include "Helper/Platform/Linux/AtlasPlaces.h"

namespace {

using platform::AtlasFile;
using platform::AtlasSection;
using platform::Coordinate;

constexpr std::size_t kLookUps = 60'000;
constexpr std::size_t kDatabaseLookUps = 6'000;
constexpr int kOpenings = 25;

AtlasFile Open(const std::string& path) {
  auto file = AtlasFile::open(path);
  if (const auto* reason = std::get_if<std::string>(&file)) bench::Fail(reason->c_str());
  return std::move(std::get<AtlasFile>(file));
}

/// Three of four within five kilometres of a stored place, the others anywhere on the globe.
std::vector<Coordinate> RandomPlaces(const AtlasFile& atlas) {
  const platform::AtlasBytes records = atlas.section(AtlasSection::kPlaces);
  std::mt19937 random(20'000);
  const auto below = [&](std::size_t limit) { return random() % limit; };
  std::uniform_real_distribution<double> offset(-0.045, 0.045);
  std::uniform_real_distribution<double> unit(-1, 1);
  std::vector<Coordinate> places;
  while (places.size() < kLookUps) {
    if (below(4) == 0) {
      places.push_back({std::asin(unit(random)) * 180 / std::numbers::pi, unit(random) * 180});
      continue;
    }
    platform::AtlasPlace near;
    std::memcpy(&near, records.data() + below(records.size() / sizeof near) * sizeof near,
                sizeof near);
    places.push_back({near.latitude / 1e5 + offset(random), near.longitude / 1e5 + offset(random)});
    if (std::abs(places.back().longitude) > 180) places.pop_back();
  }
  return places;
}

/// Forgets what the kernel has cached of the file.
void Evict(const std::string& path) {
  const platform::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
  bench::Check(file.get(), "open");
  bench::Check(::fsync(file.get()), "fsync");
  bench::Check(::posix_fadvise(file.get(), 0, 0, POSIX_FADV_DONTNEED), "posix_fadvise");
}

/// Memory of this process that no file backs or another process shares, in kilobytes.
double PrivateKilobytes() {
  std::ifstream rollup("/proc/self/smaps_rollup");
  double dirty = 0;
  for (std::string line; std::getline(rollup, line);) {
    if (std::sscanf(line.c_str(), "Private_Dirty: %lf kB", &dirty) == 1) break;
  }
  return dirty;
}

std::string CountryOf(const platform::GeocodeAnswer& answer) {
  const auto* address = std::get_if<platform::CivicAddress>(&answer);
  return address != nullptr ? address->countryCode.value_or("") : "";
}

/// The two contestants must do the same work: they agree on the countries.
void RequireAgreement(platform::AtlasGeocoder& geocoder, bench::SpatialDatabase& database,
                      const AtlasFile& atlas, const std::vector<Coordinate>& places) {
  const platform::AtlasBytes codes = atlas.section(AtlasSection::kCountryCodes);
  std::size_t different = 0;
  for (std::size_t index = 0; index < kDatabaseLookUps; ++index) {
    const std::uint16_t country = database.lookUp(places[index]).country;
    const std::string code =
        country == 0 ? ""
                     : std::string(reinterpret_cast<const char*>(codes.data()) + country * 2, 2);
    if (code != CountryOf(geocoder.lookUp(places[index]))) ++different;
  }
  // The index rounds its boxes to 32-bit floating point.
  if (different > kDatabaseLookUps / 500) bench::Fail("the contestants disagree");
}

template <class LookUp>
std::vector<double> Latencies(const std::vector<Coordinate>& places, std::size_t count,
                              const LookUp& lookUp) {
  std::vector<double> times;
  times.reserve(count);
  for (std::size_t index = 0; index < count; ++index) {
    times.push_back(bench::MicrosecondsOf([&] { lookUp(places[index]); }));
  }
  return times;
}

double Mean(const std::vector<double>& values) {
  double sum = 0;
  for (const double value : values) sum += value;
  return sum / static_cast<double>(values.size());
}

/// The median of openings with one look-up, in milliseconds; the file evicted before each.
template <class OpenAndLookUp>
double ColdOpening(const std::string& path, const OpenAndLookUp& open) {
  std::vector<double> times;
  for (int round = 0; round < kOpenings; ++round) {
    Evict(path);
    times.push_back(bench::MicrosecondsOf(open) / 1000);
  }
  return bench::Median(times);
}

double MegabytesOf(const std::string& path) {
  struct stat status {};
  bench::Check(::stat(path.c_str(), &status), "stat");
  return static_cast<double>(status.st_size) / 1e6;
}

void Measure(const std::string& path, const std::string& databasePath, bench::Report& report) {
  const Coordinate vienna{48.2082, 16.3738};
  // First: what is mapped cannot be evicted.
  const double opening = ColdOpening(path, [&] { (void)Open(path); });
  const double answering =
      ColdOpening(path, [&] { (void)platform::AtlasGeocoder(path).lookUp(vienna); });
  const AtlasFile atlas = Open(path);
  const std::vector<Coordinate> places = RandomPlaces(atlas);
  const double before = PrivateKilobytes();
  platform::AtlasGeocoder geocoder(path);
  const auto ask = [&](const Coordinate& place) { (void)geocoder.lookUp(place); };
  for (const Coordinate& place : places) ask(place);
  const double memory = PrivateKilobytes() - before;
  const std::vector<double> ours = Latencies(places, kLookUps, ask);

  bench::WriteSpatialDatabase(atlas, databasePath);
  bench::SpatialDatabase database(databasePath, atlas);
  RequireAgreement(geocoder, database, atlas, places);
  const std::vector<double> theirs = Latencies(
      places, kDatabaseLookUps, [&](const Coordinate& place) { (void)database.lookUp(place); });

  report.add({"look-up, file cached",
              "us",
              {{"atlas, mean", Mean(ours), {}, 5},
               {"atlas, 99th percentile", bench::Percentile(ours, 0.99), {}, 50},
               {"SQLite R*Tree, mean", Mean(theirs), Mean(theirs) / Mean(ours), {}},
               {"SQLite R*Tree, 99th percentile",
                bench::Percentile(theirs, 0.99),
                bench::Percentile(theirs, 0.99) / bench::Percentile(ours, 0.99),
                {}}},
              {}});
  report.add(
      {"file",
       "MB",
       {{"atlas", MegabytesOf(path), {}, {}}, {"SQLite R*Tree", MegabytesOf(databasePath), {}, {}}},
       {}});
  report.add({"private memory after all look-ups", "kB", {{"atlas", memory, {}, 512}}, {}});
  const double otherAnswering = ColdOpening(
      databasePath, [&] { (void)bench::SpatialDatabase(databasePath, atlas).lookUp(vienna); });
  report.add({"file not cached",
              "ms",
              {{"atlas: opening", opening, {}, 2},
               {"atlas: opening and first look-up", answering, {}, {}},
               {"SQLite R*Tree: opening and first look-up", otherAnswering, {}, {}}},
              {}});
}

}  // namespace

int main(int count, char** arguments) {
  bool json = false;
  bool shared = false;
  for (int index = 1; index < count; ++index) {
    json |= std::strcmp(arguments[index], "--json") == 0;
    shared |= std::strcmp(arguments[index], "--shared") == 0;
  }
  if (!shared) (void)bench::TakePrecedence();  // without the right, the figures are shared ones
  std::string folder = "/var/tmp/halvec-benchmark-atlas-XXXXXX";
  if (::mkdtemp(folder.data()) == nullptr) bench::Fail("mkdtemp");
  const std::string database = folder + "/places.db";
  bench::Report report(json);
  Measure(HALVEC_BUILT_ATLAS, database, report);
  report.finish();
  bench::Check(::unlink(database.c_str()), "unlink");
  bench::Check(::rmdir(folder.c_str()), "rmdir");
  return 0;
}
