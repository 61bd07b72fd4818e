// SPDX-License-Identifier: Apache-2.0
//
// The way down a quad-tree and the two questions to a path. Any thread; no state.
#include "Helper/Platform/Linux/AtlasTree.h"

#include <algorithm>
#include <limits>

namespace platform {
namespace {

// The box that the tree divides, in degrees; what lies outside is moved to its edge.
constexpr double kWest = -179.9999;
constexpr double kSouth = -89.9999;
constexpr double kWidth = 359.9998;
constexpr double kHeight = 179.9998;
constexpr double kBelowOne = 1 - std::numeric_limits<double>::epsilon();

constexpr double kUnits = 65535;
constexpr int kDeepest = 32;

// A node: two bits of kind, and the number of a block, an area or a leaf record.
constexpr std::uint32_t kValueMask = 0x3FFFFFFF;
constexpr std::uint32_t kBranch = 0;
constexpr std::uint32_t kWholeCell = 1;
constexpr std::uint32_t kLeaf = 2;

constexpr std::size_t kVertexBytes = 4;

/// Doubles `fraction`, a place between 0 and 1, and answers in which half it was.
std::size_t Half(double& fraction) {
  fraction *= 2;
  if (fraction < 1) return 0;
  fraction -= 1;
  return 1;
}

}  // namespace

std::size_t AtlasPath::size() const { return vertices_.size() / kVertexBytes; }

AtlasPoint AtlasPath::vertex(std::size_t index) const {
  std::uint16_t x;
  std::uint16_t y;
  std::memcpy(&x, vertices_.data() + index * kVertexBytes, sizeof x);
  std::memcpy(&y, vertices_.data() + index * kVertexBytes + sizeof x, sizeof y);
  return {static_cast<double>(x), static_cast<double>(y)};
}

bool AtlasPath::holds(const AtlasPoint& point) const {
  if (empty()) return false;
  bool inside = false;
  AtlasPoint from = vertex(size() - 1);
  for (std::size_t index = 0; index < size(); ++index) {
    const AtlasPoint to = vertex(index);
    if ((from.y > point.y) != (to.y > point.y) &&
        point.x < (to.x - from.x) * (point.y - from.y) / (to.y - from.y) + from.x) {
      inside = !inside;
    }
    from = to;
  }
  return inside;
}

double AtlasPath::squaredDistance(const AtlasPoint& point, double xScale) const {
  double nearest = std::numeric_limits<double>::infinity();
  if (empty()) return nearest;
  AtlasPoint from = vertex(size() - 1);
  for (std::size_t index = 0; index < size(); ++index) {
    const AtlasPoint to = vertex(index);
    const double alongX = (to.x - from.x) * xScale;
    const double alongY = to.y - from.y;
    const double towardsX = (point.x - from.x) * xScale;
    const double towardsY = point.y - from.y;
    const double length = alongX * alongX + alongY * alongY;
    const double share =
        length > 0 ? std::clamp((towardsX * alongX + towardsY * alongY) / length, 0.0, 1.0) : 0;
    const double x = towardsX - share * alongX;
    const double y = towardsY - share * alongY;
    nearest = std::min(nearest, x * x + y * y);
    from = to;
  }
  return nearest;
}

std::optional<AtlasEntry> AtlasLeaf::next() {
  if (remaining_ == 0 || damaged_) return std::nullopt;
  --remaining_;
  if (entries_.empty()) return AtlasEntry{whole_, AtlasPath(AtlasBytes())};
  damaged_ = true;  // unless the entry is whole
  const auto id = ReadAtlas<std::uint16_t>(entries_, offset_);
  const auto count = ReadAtlas<std::uint16_t>(entries_, offset_ + sizeof(std::uint16_t));
  if (!id || !count) return std::nullopt;
  offset_ += 2 * sizeof(std::uint16_t);
  const std::size_t length = *count * kVertexBytes;
  if (length > entries_.size() - offset_) return std::nullopt;
  const AtlasPath path(entries_.subspan(offset_, length));
  offset_ += length;
  damaged_ = false;
  return AtlasEntry{*id, path};
}

std::optional<AtlasLeaf> AtlasTree::leafAt(const Coordinate& place) const {
  double x = std::clamp((place.longitude - kWest) / kWidth, 0.0, kBelowOne);
  double y = std::clamp((place.latitude - kSouth) / kHeight, 0.0, kBelowOne);
  std::size_t block = 0;
  // A damaged tree may lead in circles; a sound one ends long before this.
  for (int depth = 0; depth < kDeepest; ++depth) {
    const std::size_t east = Half(x);
    const std::size_t quarter = 2 * Half(y) + east;
    const auto node = ReadAtlas<std::uint32_t>(nodes_, (block + quarter) * sizeof(std::uint32_t));
    if (!node) return std::nullopt;
    const std::uint32_t value = *node & kValueMask;
    switch (*node >> 30) {
      case kBranch:
        block = value;
        break;
      case kWholeCell:
        return AtlasLeaf(static_cast<std::uint16_t>(value));
      case kLeaf: {
        const std::size_t offset = value * sizeof(std::uint32_t);
        const auto count = ReadAtlas<std::uint32_t>(leaves_, offset);
        if (!count) return std::nullopt;
        return AtlasLeaf(leaves_, offset + sizeof *count, *count, {x * kUnits, y * kUnits});
      }
      default:
        return std::nullopt;
    }
  }
  return std::nullopt;
}

}  // namespace platform
