// SPDX-License-Identifier: Apache-2.0
#include "Tests/Atlas/TinyAtlas.h"

#include <zlib.h>

#include <cmath>

namespace atlas_test {
namespace {

template <class Number>
std::string LittleEndian(Number number) {
  std::string bytes;
  for (std::size_t index = 0; index < sizeof number; ++index) {
    bytes += static_cast<char>(static_cast<std::uint64_t>(number) >> (8 * index) & 0xFF);
  }
  return bytes;
}

std::uint32_t Checksum(std::string_view bytes) {
  return static_cast<std::uint32_t>(
      ::crc32(0, reinterpret_cast<const Bytef*>(bytes.data()), static_cast<uInt>(bytes.size())));
}

constexpr std::size_t kCells = 360 * 720;

}  // namespace

std::string U16(std::initializer_list<std::uint16_t> numbers) {
  std::string bytes;
  for (const std::uint16_t number : numbers) bytes += LittleEndian(number);
  return bytes;
}

std::string U32(std::initializer_list<std::uint32_t> numbers) {
  std::string bytes;
  for (const std::uint32_t number : numbers) bytes += LittleEndian(number);
  return bytes;
}

std::string Place(double latitude, double longitude, std::uint32_t name, std::uint16_t state,
                  std::uint16_t weight) {
  return LittleEndian(static_cast<std::int32_t>(std::lround(latitude * 1e5))) +
         LittleEndian(static_cast<std::int32_t>(std::lround(longitude * 1e5))) +
         LittleEndian(name) + LittleEndian(state) + LittleEndian(weight);
}

std::uint32_t TinyAtlas::name(std::string_view text) {
  const auto offset = static_cast<std::uint32_t>(names.size());
  names += static_cast<char>(text.size());
  names += text;
  return offset;
}

std::uint16_t TinyAtlas::state(std::uint32_t nameOffset, std::uint16_t country) {
  const auto id = static_cast<std::uint16_t>(states.size() / 8);
  states += U32({nameOffset}) + U16({country, 0});
  return id;
}

void TinyAtlas::place(double latitude, double longitude, std::string_view text,
                      std::uint16_t stateId, std::uint16_t weight) {
  const auto row = static_cast<std::uint32_t>(std::floor((latitude + 90) * 2));
  const auto column = static_cast<std::uint32_t>(std::floor((longitude + 180) * 2));
  places.emplace_back(row * 720 + column, Place(latitude, longitude, name(text), stateId, weight));
}

std::string TinyAtlas::bytes() const {
  std::string records;
  std::vector<std::uint32_t> starts(kCells + 1, static_cast<std::uint32_t>(places.size()));
  std::uint32_t cell = 0;
  for (std::uint32_t index = 0; index < places.size(); ++index) {
    while (cell <= places[index].first) starts[cell++] = index;
    records += places[index].second;
  }
  const std::string grid(reinterpret_cast<const char*>(starts.data()), starts.size() * 4);
  const std::array<std::pair<const char*, const std::string*>, 10> sections{
      {{"CODE", &codes},
       {"CNOD", &countryNodes},
       {"CLEA", &countryLeaves},
       {"STAT", &states},
       {"SNOD", &stateNodes},
       {"SLEA", &stateLeaves},
       {"GRID", &grid},
       {"PLAC", &records},
       {"NAME", &names},
       {"INFO", &about}}};
  std::string table;
  std::string body;
  for (const auto& [kind, data] : sections) {
    table += kind + U32({static_cast<std::uint32_t>(kTableEnd + body.size()),
                         static_cast<std::uint32_t>(data->size()), Checksum(*data)});
    body += *data;
  }
  const std::string header = "HVATLAS1" + U32({1, sections.size()}) +
                             LittleEndian<std::uint64_t>(kTableEnd + body.size()) +
                             LittleEndian<std::int64_t>(0) + U32({0, 0});
  return WithChecksum(header + table + body);
}

std::string WithChecksum(std::string file) {
  file.replace(kChecksumOffset, 4, U32({0}));
  return file.replace(kChecksumOffset, 4,
                      U32({Checksum(std::string_view(file).substr(0, kTableEnd))}));
}

std::string WithNumber(std::string file, std::size_t offset, std::uint32_t number) {
  return WithChecksum(file.replace(offset, 4, U32({number})));
}

}  // namespace atlas_test
