// SPDX-License-Identifier: Apache-2.0
//
// A quad-tree of the atlas: which area a place lies in, tested straight on the mapped bytes. Any
// thread; nothing changes. Every number is checked before it is used as a place in the file, so a
// damaged tree gives wrong areas or none at all, nothing worse.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

#include "Helper/Platform/Linux/AtlasFile.h"
#include "Helper/Platform/ReverseGeocoder.h"

namespace platform {

/// A place inside the cell of a leaf: from its south-west corner, in units of 1/65535 of its sides.
struct AtlasPoint {
  double x = 0;
  double y = 0;
};

/// A closed line in a cell: 16-bit x and y of each vertex. The last one is joined to the first.
class AtlasPath {
 public:
  explicit AtlasPath(AtlasBytes vertices) : vertices_(vertices) {}

  /// Whether there is no line: it stands for the rest of the cell.
  [[nodiscard]] bool empty() const { return vertices_.empty(); }
  /// Whether a ray from `point` crosses the line an odd number of times.
  [[nodiscard]] bool holds(const AtlasPoint& point) const;
  /// The square of the distance from `point` to the line, in squares of the unit of y, where the
  /// unit of x is `xScale` units of y.
  [[nodiscard]] double squaredDistance(const AtlasPoint& point, double xScale) const;

 private:
  [[nodiscard]] AtlasPoint vertex(std::size_t index) const;
  [[nodiscard]] std::size_t size() const;

  AtlasBytes vertices_;
};

/// One area of a cell.
struct AtlasEntry {
  std::uint16_t id = 0;
  AtlasPath path{AtlasBytes()};
};

/// The areas of the cell around a place, one after the other.
class AtlasLeaf {
 public:
  /// A cell that is all one area.
  explicit AtlasLeaf(std::uint16_t whole) : whole_(whole), remaining_(1) {}
  /// A cell of `count` entries, stored in `entries` at `offset`.
  AtlasLeaf(AtlasBytes entries, std::size_t offset, std::uint32_t count, const AtlasPoint& point)
      : entries_(entries), offset_(offset), remaining_(count), point_(point) {}

  /// The next area; nothing after the last one, nor from where the file is damaged.
  [[nodiscard]] std::optional<AtlasEntry> next();
  /// Whether damage, and not the last area, was the end.
  [[nodiscard]] bool damaged() const { return damaged_; }
  /// The place that was asked for. Of no meaning in a cell that is all one area.
  [[nodiscard]] const AtlasPoint& point() const { return point_; }

 private:
  std::uint16_t whole_ = 0;
  AtlasBytes entries_;
  std::size_t offset_ = 0;
  std::uint32_t remaining_ = 0;
  bool damaged_ = false;
  AtlasPoint point_;
};

class AtlasTree {
 public:
  AtlasTree(AtlasBytes nodes, AtlasBytes leaves) : nodes_(nodes), leaves_(leaves) {}

  /// The leaf around `place`, which is a valid coordinate; nothing where the file is damaged.
  [[nodiscard]] std::optional<AtlasLeaf> leafAt(const Coordinate& place) const;

 private:
  AtlasBytes nodes_;
  AtlasBytes leaves_;
};

}  // namespace platform
