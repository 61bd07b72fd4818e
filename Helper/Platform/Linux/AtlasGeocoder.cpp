// SPDX-License-Identifier: Apache-2.0
//
// Opens the atlas with the first look-up and refuses what is no coordinate. Any thread.
#include "Helper/Platform/Linux/AtlasGeocoder.h"

#include <cmath>
#include <utility>

#include "Helper/Platform/Linux/Atlas.h"

namespace platform {

AtlasGeocoder::AtlasGeocoder(std::string path) : path_(std::move(path)) {}

AtlasGeocoder::~AtlasGeocoder() = default;

GeocodeAnswer AtlasGeocoder::lookUp(const Coordinate& place) {
  // Written so that a NaN, which no comparison holds for, is refused too.
  if (!(std::abs(place.latitude) <= 90 && std::abs(place.longitude) <= 180)) {
    return GeocodeError{"not a coordinate"};
  }
  std::string failure;
  const Atlas* atlas = opened(failure);
  if (atlas == nullptr) return GeocodeError{std::move(failure)};
  GeocodeAnswer answer = atlas->lookUp(place);
  if (auto* error = std::get_if<GeocodeError>(&answer)) {
    error->description = path_ + ": " + error->description;
  }
  return answer;
}

const Atlas* AtlasGeocoder::opened(std::string& failure) {
  const std::lock_guard lock(mutex_);
  if (!atlas_) {
    auto file = AtlasFile::open(path_);
    if (auto* reason = std::get_if<std::string>(&file)) {
      failure = std::move(*reason);
      return nullptr;
    }
    atlas_ = std::make_unique<const Atlas>(std::move(std::get<AtlasFile>(file)));
  }
  return atlas_.get();
}

}  // namespace platform
