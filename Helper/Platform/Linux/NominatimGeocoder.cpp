// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/NominatimGeocoder.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <future>
#include <initializer_list>
#include <memory>
#include <string_view>
#include <vector>

#include "Helper/Platform/Json.h"
#include "Helper/Platform/WorkQueue.h"
#include "Helper/Platform/vlu/Http.h"

namespace platform {
namespace {

using Response = std::shared_ptr<vlu::Http::HttpResponse>;

constexpr int kStatusOk = 200;
constexpr std::size_t kLargestAnswer = std::size_t{256} << 10;
constexpr const char* kLate = "the geocoder did not answer in time";

/// Territories that have a country code of their own besides the subdivision code (ISO 3166-2) of
/// the state that they belong to, and that services report under that state.
constexpr std::string_view kTerritories[] = {"CN-HK", "CN-MO", "FR-BL", "FR-GF", "FR-GP", "FR-MF",
                                             "FR-MQ", "FR-NC", "FR-PF", "FR-PM", "FR-RE", "FR-TF",
                                             "FR-WF", "FR-YT", "NL-AW", "NL-CW", "NL-SX", "US-AS",
                                             "US-GU", "US-MP", "US-PR", "US-UM", "US-VI"};

/// Where answers arrive. Never destroyed: one may arrive after the look-up gave it up.
WorkQueue& AnswerQueue() {
  static auto* queue = new WorkQueue("com.zarvo.halvec.geocoder.answers");
  return *queue;
}

bool IsCoordinate(const Coordinate& place) {
  return std::abs(place.latitude) <= 90 && std::abs(place.longitude) <= 180;  // false for NaN
}

std::string Rounded(double degrees) {
  constexpr int kDecimals = 4;
  std::array<char, 16> text{};
  const auto end = std::to_chars(text.data(), text.data() + text.size(), degrees,
                                 std::chars_format::fixed, kDecimals)
                       .ptr;
  return {text.data(), end};
}

std::string UrlOf(const std::string& endpoint, const Coordinate& place) {
  return endpoint + "/reverse?format=jsonv2&lat=" + Rounded(place.latitude) +
         "&lon=" + Rounded(place.longitude) +
         "&zoom=18&addressdetails=1&layer=address&accept-language=en";
}

/// The first of `keys` that is there and not empty.
std::optional<std::string> FirstOf(const PropertyList& address,
                                   std::initializer_list<const char*> keys) {
  for (const char* key : keys) {
    const PropertyList* value = address.find(key);
    const std::string* text = value ? value->string() : nullptr;
    if (text && !text->empty()) return *text;
  }
  return std::nullopt;
}

bool IsLetter(char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z'); }

std::optional<std::string> CountryOf(const PropertyList& address) {
  std::optional<std::string> code = FirstOf(address, {"country_code"});
  if (!code || code->size() != 2 || !std::all_of(code->begin(), code->end(), IsLetter)) {
    return std::nullopt;
  }
  constexpr char kToUpper = 'a' - 'A';
  for (char& letter : *code) letter = letter >= 'a' ? static_cast<char>(letter - kToUpper) : letter;
  for (const char* key : {"ISO3166-2-lvl3", "ISO3166-2-lvl4"}) {
    const std::optional<std::string> subdivision = FirstOf(address, {key});
    if (!subdivision || !subdivision->starts_with(*code)) continue;
    const auto* const end = std::end(kTerritories);
    if (std::find(std::begin(kTerritories), end, *subdivision) != end)
      return subdivision->substr(3);
  }
  return code;
}

GeocodeAnswer Read(std::string_view text) {
  const std::optional<PropertyList> answer = ParseJson(text);
  if (!answer || !answer->dictionary()) return GeocodeError{"the geocoder's answer is garbled"};
  if (answer->find("error")) return OpenSea{};
  const PropertyList* address = answer->find("address");
  std::optional<std::string> country = address ? CountryOf(*address) : std::nullopt;
  if (!country) return GeocodeError{"the geocoder's answer names no country"};
  return CivicAddress{
      .countryCode = std::move(country),
      .state = FirstOf(*address, {"state", "region", "province", "state_district"}),
      .city = FirstOf(*address, {"city", "town", "village", "municipality", "hamlet", "county"}),
      .postCode = FirstOf(*address, {"postcode"})};
}

GeocodeAnswer Read(vlu::Http::HttpResponse& response) {
  switch (response.errorType()) {
    case vlu::Http::ErrorType::kSuccess:
      break;
    case vlu::Http::ErrorType::kTimedOut:
      return GeocodeError{kLate};
    case vlu::Http::ErrorType::kTooLarge:
      return GeocodeError{"the geocoder's answer is too long"};
    default:
      return GeocodeError{std::string("the geocoder cannot be asked: ") +
                          vlu::Http::asString(response.errorType())};
  }
  if (response.statusCode() != kStatusOk) {
    return GeocodeError{"the geocoder answered with status " +
                        std::to_string(response.statusCode())};
  }
  const std::vector<std::uint8_t> body = response.takeBody();
  return Read(std::string_view(reinterpret_cast<const char*>(body.data()), body.size()));
}

}  // namespace

GeocodeAnswer NominatimGeocoder::lookUp(const Coordinate& place) {
  if (!IsCoordinate(place)) return GeocodeError{"that is no coordinate"};
  const auto request = vlu::Http::HttpRequest::create(
      vlu::Http::RequestType::kRetrieval, UrlOf(endpoint_, place),
      {{"User-Agent", "HalvecMobileHelper/" HALVEC_VERSION}}, vlu::Http::HttpSession::create());
  if (!request) return GeocodeError{"the geocoder cannot be asked on this system"};
  const auto arrival = std::make_shared<std::promise<Response>>();
  std::future<Response> response = arrival->get_future();
  request->setCallbackQueue(AnswerQueue());
  request->setCompletionCallback(
      [arrival](Response answer) { arrival->set_value(std::move(answer)); });
  request->setLimits(limit_, kLargestAnswer);
  request->start("");
  // The transfer ends by itself at about that time, but the look-up of a name may keep it longer.
  if (response.wait_for(limit_) != std::future_status::ready) return GeocodeError{kLate};
  const Response answer = response.get();
  if (!answer) return GeocodeError{"the system has no means left to ask the geocoder"};
  return Read(*answer);
}

}  // namespace platform
