// SPDX-License-Identifier: Apache-2.0
//
// The offline geocoder: country, state and city out of one memory-mapped file. The first look-up
// opens the file. Any thread: the opening is guarded by a lock, everything after it only reads.
#pragma once

#include <memory>
#include <mutex>
#include <string>

#include "Helper/Platform/ReverseGeocoder.h"

namespace platform {

class Atlas;

class AtlasGeocoder final : public ReverseGeocoder {
 public:
  /// Looks places up in the atlas at `path`, which the first look-up opens. While the file cannot
  /// be used, every look-up tries it again and is a GeocodeError that says why.
  explicit AtlasGeocoder(std::string path);
  ~AtlasGeocoder() override;

  [[nodiscard]] GeocodeAnswer lookUp(const Coordinate& place) override;

 private:
  /// The open atlas; null, with the reason in `failure`, while it cannot be used.
  [[nodiscard]] const Atlas* opened(std::string& failure);

  const std::string path_;
  std::mutex mutex_;
  std::unique_ptr<const Atlas> atlas_;  // under mutex_ until it is there; constant from then on
};

}  // namespace platform
