// SPDX-License-Identifier: Apache-2.0
//
// The attributions travel inside the atlas, so that no copy of the data is without them.
#include <string_view>

#include "Helper/Platform/Linux/AtlasFile.h"
#include "Helper/Platform/MapAttributions.h"

namespace platform {

std::variant<std::string, GeocodeError> ReadMapAttributions(const std::string& path) {
  const auto file = AtlasFile::open(path);
  if (const auto* failure = std::get_if<std::string>(&file)) return GeocodeError{*failure};
  const AtlasBytes text = std::get<AtlasFile>(file).section(AtlasSection::kAbout);
  return std::string(reinterpret_cast<const char*>(text.data()), text.size());
}

}  // namespace platform
