// SPDX-License-Identifier: Apache-2.0
//
// Fuzz target of the atlas reader: whatever the bytes are, a look-up ends, and reads only them. The
// first byte says where the nodes (or the grid) end and the leaves (or the places) begin. One
// thread.
#include <sys/mman.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/AtlasGeocoder.h"
#include "Helper/Platform/Linux/AtlasPlaces.h"
#include "Helper/Platform/Linux/AtlasTree.h"

namespace {

using platform::AtlasBytes;
using platform::Coordinate;

constexpr std::array<Coordinate, 5> kPlaces{
    {{48.2, 16.4}, {-90, -180}, {90, 180}, {-33.9, 179.99}, {0, 0}}};

void Require(bool holds) {
  if (!holds) std::abort();
}

/// The bytes from `begin` to `end` in a block of their own, so that a step beyond them is seen.
std::vector<std::byte> Part(AtlasBytes bytes, std::size_t begin, std::size_t end) {
  const AtlasBytes part = bytes.first(end).subspan(begin);
  return {part.begin(), part.end()};
}

void WalkTree(AtlasBytes nodes, AtlasBytes leaves, const Coordinate& place) {
  auto leaf = platform::AtlasTree(nodes, leaves).leafAt(place);
  if (!leaf) return;
  std::size_t entries = 0;
  while (const auto entry = leaf->next()) {
    Require(++entries <= leaves.size() / 4 + 1);
    Require(entry->path.empty() || entry->path.squaredDistance(leaf->point(), 2) >= 0);
    Require(!(entry->path.empty() && entry->path.holds(leaf->point())));
  }
}

void VisitPlaces(AtlasBytes grid, AtlasBytes places, const Coordinate& center) {
  platform::AtlasPlaces(grid, places)
      .forEachWithin(center, 30, [](const platform::AtlasPlace&, double distance) {
        Require(distance >= 0 && distance <= 30);
      });
}

void OpenAsFile(AtlasBytes bytes) {
  const platform::FileDescriptor file(::memfd_create("atlas", MFD_CLOEXEC));
  Require(file.get() >= 0);
  Require(::write(file.get(), bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size()));
  platform::AtlasGeocoder geocoder("/proc/self/fd/" + std::to_string(file.get()));
  for (const Coordinate& place : kPlaces) (void)geocoder.lookUp(place);  // any answer will do
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const AtlasBytes bytes = std::as_bytes(std::span(data, size));
  OpenAsFile(bytes);
  if (size == 0) return 0;
  const std::size_t cut = 1 + (size - 1) * data[0] / 255;
  const std::vector<std::byte> first = Part(bytes, 1, cut);
  const std::vector<std::byte> second = Part(bytes, cut, size);
  const std::vector<std::byte> records(
      second.begin(), second.end() - static_cast<std::ptrdiff_t>(second.size() % 16));
  for (const Coordinate& place : kPlaces) {
    WalkTree(first, second, place);
    VisitPlaces(first, records, place);
  }
  return 0;
}
