// SPDX-License-Identifier: Apache-2.0
//
// The map service: tickets that turn a coordinate into map items. Main thread: tickets are asked
// for, submitted and completed there; a look-up itself never runs there.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Helper/Platform/ReverseGeocoder.h"
#include "Helper/Platform/SharedService.h"

namespace platform {

/// A postal address by its parts, as UTF-8. A part that the address does not have is absent.
struct StructuredAddress {
  std::optional<std::string> countryCode = {};         // ISO 3166-1, two capital letters
  std::optional<std::string> administrativeArea = {};  // the state
  std::optional<std::string> locality = {};            // the city
  std::optional<std::string> postCode = {};
};

struct MapAddress {
  std::shared_ptr<const StructuredAddress> structured;  // null where the parts are not known
};

/// One place that the service knows.
class MapItem {
 public:
  virtual ~MapItem() = default;
  [[nodiscard]] virtual bool isValid() const = 0;
  /// Null where the place has no address.
  [[nodiscard]] virtual const MapAddress* address() const = 0;
};

/// The best first; an item may be null.
using MapItems = std::vector<std::shared_ptr<const MapItem>>;

struct MapError {
  std::string description;
};

/// Gets the items, or null, and the error, or null; both are valid until it returns. No items
/// without an error: nothing is there.
using MapCompletion = std::function<void(const MapItems* mapItems, const MapError* error)>;

/// Further properties of a ticket, and an observer of network traffic. This service has neither:
/// there is only the null pointer to them.
class MapTraits;
class NetworkActivity;

struct ReverseGeocodeOptions {
  bool includesEstimatedTimeOfArrival = false;
  /// Whether a coordinate may be moved into the datum of its country's maps.
  bool allowsLocationShift = false;
  const MapTraits* traits = nullptr;
};

class MapTicket {
 public:
  virtual ~MapTicket() = default;
  /// Starts the look-up. `handler` runs exactly once, on the main queue, never inside this call,
  /// whether or not the ticket still exists by then.
  virtual void submit(MapCompletion handler, NetworkActivity* activity) = 0;
};

class MapService {
 public:
  virtual ~MapService() = default;
  /// A ticket, never null, for what is at `coordinate`, whatever numbers that is made of.
  [[nodiscard]] virtual std::unique_ptr<MapTicket> reverseGeocodeTicket(
      const Coordinate& coordinate, const ReverseGeocodeOptions& options) = 0;
};

template <>
MapService& DefaultProvider<MapService>();

/// The country that this handset is set up for.
class CountryConfiguration {
 public:
  virtual ~CountryConfiguration() = default;
  /// ISO 3166-1 in two capital letters, unless somebody has configured another text (UTF-8, no
  /// NUL); absent where the handset does not know.
  [[nodiscard]] virtual std::optional<std::string> countryCode() = 0;
};

template <>
CountryConfiguration& DefaultProvider<CountryConfiguration>();

}  // namespace platform
