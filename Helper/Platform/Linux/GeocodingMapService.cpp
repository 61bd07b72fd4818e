// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/GeocodingMapService.h"

#include <utility>

#include "Helper/Platform/MainQueue.h"
#include "Helper/Platform/WorkQueue.h"

namespace platform {
namespace {

/// How long a look-up may have waited for its turn and still be answered by a geocoder that takes
/// up to four seconds: the five-second fallback comes after both.
constexpr Duration kPatience = std::chrono::milliseconds(500);

class AddressItem final : public MapItem {
 public:
  explicit AddressItem(CivicAddress address)
      : address_{std::make_shared<const StructuredAddress>(
            StructuredAddress{.countryCode = std::move(address.countryCode),
                              .administrativeArea = std::move(address.state),
                              .locality = std::move(address.city),
                              .postCode = std::move(address.postCode)})} {}
  bool isValid() const override { return true; }
  const MapAddress* address() const override { return &address_; }

 private:
  const MapAddress address_;
};

void Complete(const MapCompletion& handler, GeocodeAnswer answer) {
  if (const auto* failure = std::get_if<GeocodeError>(&answer)) {
    const MapError error{failure->description};
    return handler(nullptr, &error);
  }
  MapItems items;
  if (auto* address = std::get_if<CivicAddress>(&answer)) {
    items.push_back(std::make_shared<const AddressItem>(std::move(*address)));
  }
  handler(&items, nullptr);
}

}  // namespace

/// The queue and the geocoders, shared with tickets, which may outlive the service.
class GeocodingMapService::Lookup {
 public:
  Lookup(ReverseGeocoder& geocoder, ReverseGeocoder& quickGeocoder, const Clock& clock)
      : geocoder_(geocoder), quickGeocoder_(quickGeocoder), clock_(clock) {}

  void submit(const Coordinate& coordinate, MapCompletion handler) {
    queue_.async([&geocoder = geocoder_, &quickGeocoder = quickGeocoder_, &clock = clock_,
                  submitted = clock_.now(), coordinate, handler = std::move(handler)]() mutable {
      const bool inTime = clock.now() - submitted <= kPatience;
      GeocodeAnswer answer = (inTime ? geocoder : quickGeocoder).lookUp(coordinate);
      PostToMainQueue([handler = std::move(handler), answer = std::move(answer)]() mutable {
        Complete(handler, std::move(answer));
      });
    });
  }

 private:
  ReverseGeocoder& geocoder_;
  ReverseGeocoder& quickGeocoder_;
  const Clock& clock_;
  WorkQueue queue_{"com.zarvo.halvec.geocoder"};
};

class GeocodingMapService::Ticket final : public MapTicket {
 public:
  Ticket(std::shared_ptr<Lookup> lookup, const Coordinate& coordinate)
      : lookup_(std::move(lookup)), coordinate_(coordinate) {}
  void submit(MapCompletion handler, NetworkActivity* /*activity*/) override {
    lookup_->submit(coordinate_, std::move(handler));
  }

 private:
  const std::shared_ptr<Lookup> lookup_;
  const Coordinate coordinate_;
};

GeocodingMapService::GeocodingMapService(ReverseGeocoder& geocoder, ReverseGeocoder& quickGeocoder,
                                         const Clock& clock)
    : lookup_(std::make_shared<Lookup>(geocoder, quickGeocoder, clock)) {}

std::unique_ptr<MapTicket> GeocodingMapService::reverseGeocodeTicket(
    const Coordinate& coordinate, const ReverseGeocodeOptions& /*options*/) {
  return std::make_unique<Ticket>(lookup_, coordinate);
}

}  // namespace platform
