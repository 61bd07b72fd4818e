// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/SystemCountry.h"

#include <limits.h>
#include <unistd.h>

#include <array>
#include <string_view>

#include "Helper/Platform/Linux/ZoneAliases.h"
#include "Helper/Platform/PreferencesStore.h"
#include "Helper/Platform/RegularFile.h"

namespace platform {
namespace {

constexpr std::size_t kCodeLength = 2;
constexpr std::size_t kLargestFile = std::size_t{1} << 20;

std::string ReadText(const std::string& path) {
  const auto bytes = ReadRegularFile(path.c_str(), kLargestFile);
  if (!bytes) return {};
  return {reinterpret_cast<const char*>(bytes->data()), bytes->size()};
}

/// Takes everything up to `separator`, or the rest, off the front of `text`.
std::string_view TakeUpTo(std::string_view& text, char separator) {
  const std::size_t end = text.find(separator);
  const std::string_view front = text.substr(0, end);
  text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
  return front;
}

/// The rows of zone.tab (tzfile(5)): country, coordinates, zone, between tabs.
class ZoneTable {
 public:
  explicit ZoneTable(std::string text) : text_(std::move(text)) {}

  [[nodiscard]] std::optional<std::string> countryOf(std::string_view zone) const {
    return find(
        [zone](std::string_view /*country*/, std::string_view name) { return name == zone; });
  }
  /// `country` itself where a zone is in it.
  [[nodiscard]] std::optional<std::string> existing(std::string_view country) const {
    return find(
        [country](std::string_view code, std::string_view /*zone*/) { return code == country; });
  }

 private:
  template <class Matches>
  [[nodiscard]] std::optional<std::string> find(Matches matches) const {
    for (std::string_view rest = text_; !rest.empty();) {
      std::string_view row = TakeUpTo(rest, '\n');
      const std::string_view country = TakeUpTo(row, '\t');
      (void)TakeUpTo(row, '\t');  // the coordinates
      const std::string_view zone = TakeUpTo(row, '\t');
      if (country.size() == kCodeLength && !zone.empty() && matches(country, zone)) {
        return std::string(country);
      }
    }
    return std::nullopt;
  }

  const std::string text_;
};

std::optional<std::string> ChosenCountry() {
  auto& store = Shared<PreferencesStore>();
  (void)store.synchronizeApp(kCountryPreferenceDomain);  // what cannot be written can be read still
  const auto value = store.copyAppValue(kCountryPreferenceKey, kCountryPreferenceDomain);
  const std::string* text = value ? value->string() : nullptr;
  return text && !text->empty() ? std::optional(*text) : std::nullopt;
}

/// The name of the zone whose file `localTime` links to; empty without one.
std::string ZoneOf(const std::string& localTime) {
  std::array<char, PATH_MAX> target{};
  const ssize_t length = ::readlink(localTime.c_str(), target.data(), target.size());
  std::string_view name(target.data(), length < 0 ? 0 : static_cast<std::size_t>(length));
  constexpr std::string_view kDirectory = "/zoneinfo/";
  const std::size_t at = name.rfind(kDirectory);
  if (at == std::string_view::npos) return {};
  name.remove_prefix(at + kDirectory.size());
  for (const std::string_view variant : {"posix/", "right/"}) {
    if (name.starts_with(variant)) name.remove_prefix(variant.size());
  }
  return std::string(name);
}

/// What LANG is set to in the text of a locale.conf(5), at last if repeatedly; empty where it is
/// not.
std::string_view LanguageIn(std::string_view text) {
  constexpr std::string_view kAssignment = "LANG=";
  std::string_view language;
  while (!text.empty()) {
    std::string_view line = TakeUpTo(text, '\n');
    if (!line.starts_with(kAssignment)) continue;
    line.remove_prefix(kAssignment.size());
    if (!line.empty() && (line.front() == '"' || line.front() == '\'')) {
      const char quote = line.front();
      line.remove_prefix(1);
      line = TakeUpTo(line, quote);
    }
    language = line;
  }
  return language;
}

/// The territory of a locale's name: language[_territory][.codeset][@modifier].
std::string_view TerritoryOf(std::string_view locale) {
  const std::string_view name = locale.substr(0, locale.find_first_of(".@"));
  const std::size_t at = name.find('_');
  return at == std::string_view::npos ? std::string_view() : name.substr(at + 1);
}

}  // namespace

std::optional<std::string> SystemCountry::countryCode() {
  if (auto chosen = ChosenCountry()) return chosen;
  const ZoneTable table(ReadText(files_.zoneTable));
  if (auto country = table.countryOf(CanonicalZone(ZoneOf(files_.localTime)))) return country;
  for (const std::string& file : files_.locales) {
    const std::string text = ReadText(file);
    if (auto country = table.existing(TerritoryOf(LanguageIn(text)))) return country;
  }
  const std::string domain = ReadText(files_.regulatoryDomain);
  return table.existing(std::string_view(domain).substr(0, domain.find('\n')));
}

template <>
CountryConfiguration& DefaultProvider<CountryConfiguration>() {
  static CountryConfiguration& configuration = *new SystemCountry;
  return configuration;
}

}  // namespace platform
