// SPDX-License-Identifier: Apache-2.0
//
// Maps an atlas and checks its header. The mapping is shared with every other reader of the file;
// whoever installs a new atlas renames it into place, so a mapped one never shrinks.
#include "Helper/Platform/Linux/AtlasFile.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>

#include <bit>
#include <cerrno>
#include <utility>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {
namespace {

static_assert(std::endian::native == std::endian::little, "an atlas is read as it is stored");

struct Header {
  std::array<char, 8> magic;
  std::uint32_t version;
  std::uint32_t sectionCount;
  std::uint64_t size;
  std::int64_t buildDate;  // seconds since 1970
  std::uint32_t crc;       // of the header, with zero here, and of the table
  std::uint32_t zero;
};
static_assert(sizeof(Header) == 40);

struct TableEntry {
  std::array<char, 4> kind;
  std::uint32_t offset;
  std::uint32_t length;
  std::uint32_t crc;
};
static_assert(sizeof(TableEntry) == 16);

constexpr std::string_view kMagic = "HVATLAS1";
constexpr std::uint32_t kVersion = 1;
constexpr std::size_t kSectionCount = static_cast<std::size_t>(AtlasSection::kCount);
constexpr std::size_t kSectionsBegin = sizeof(Header) + kSectionCount * sizeof(TableEntry);

/// What a section must look like for its reader: so many bytes at least, in whole records.
struct SectionShape {
  std::string_view kind;
  std::size_t least;
  std::size_t record;
};
constexpr std::size_t kGridBytes = (360 * 720 + 1) * sizeof(std::uint32_t);
constexpr std::array<SectionShape, kSectionCount> kShapes{{
    {"CODE", 2, 2},
    {"CNOD", 16, 16},
    {"CLEA", 0, 4},
    {"STAT", 8, 8},
    {"SNOD", 16, 16},
    {"SLEA", 0, 4},
    {"GRID", kGridBytes, kGridBytes},
    {"PLAC", 0, 16},
    {"NAME", 1, 1},
    {"INFO", 0, 1},
}};

/// CRC-32 as in ISO 3309, bit by bit: 200 bytes do not repay a table.
std::uint32_t Crc32(AtlasBytes bytes) {
  std::uint32_t crc = 0xFFFFFFFF;
  for (const std::byte byte : bytes) {
    crc ^= std::to_integer<std::uint32_t>(byte);
    for (int bit = 0; bit < 8; ++bit) crc = (crc >> 1) ^ ((crc & 1) != 0 ? 0xEDB88320 : 0);
  }
  return ~crc;
}

std::string LastError(const std::string& path) {
  const char* text = ::strerrordesc_np(errno);
  return path + ": " + (text ? text : "unknown error");
}

bool HeaderIsWhole(AtlasBytes file) {
  if (file.size() < kSectionsBegin) return false;
  std::array<std::byte, kSectionsBegin> head;
  std::memcpy(head.data(), file.data(), head.size());
  Header header;
  std::memcpy(&header, head.data(), sizeof header);
  if (std::string_view(header.magic.data(), header.magic.size()) != kMagic ||
      header.version != kVersion || header.sectionCount != kSectionCount ||
      header.size != file.size()) {
    return false;
  }
  const std::uint32_t expected = std::exchange(header.crc, 0);
  std::memcpy(head.data(), &header, sizeof header);
  return Crc32(head) == expected;
}

}  // namespace

std::variant<AtlasFile, std::string> AtlasFile::open(const std::string& path) {
  // Non-blocking, because opening a FIFO for reading would wait for its writer.
  const FileDescriptor file(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  struct stat status {};
  if (!file || ::fstat(file.get(), &status) != 0) return LastError(path);
  if (!S_ISREG(status.st_mode)) return path + ": not a regular file";
  const auto size = static_cast<std::size_t>(status.st_size);
  if (size < kSectionsBegin) return path + ": not an atlas";
  void* const address = ::mmap(nullptr, size, PROT_READ, MAP_SHARED, file.get(), 0);
  if (address == MAP_FAILED) return LastError(path);
  // A look-up needs a dozen pages all over the file; what lies around them would be read in vain.
  // Only advice: where it is refused, look-ups are slower.
  static_cast<void>(::madvise(address, size, MADV_RANDOM));
  AtlasFile atlas(AtlasBytes(static_cast<const std::byte*>(address), size));
  if (!HeaderIsWhole(atlas.mapping_)) return path + ": not an atlas of this version, or damaged";
  if (!atlas.findSections()) return path + ": damaged table of sections";
  return atlas;
}

AtlasFile::AtlasFile(AtlasFile&& other) noexcept
    : mapping_(std::exchange(other.mapping_, {})), sections_(std::exchange(other.sections_, {})) {}

AtlasFile::~AtlasFile() {
  // Cannot fail for a whole mapping, and nothing could be done if it did.
  if (!mapping_.empty()) {
    static_cast<void>(::munmap(const_cast<std::byte*>(mapping_.data()), mapping_.size()));
  }
}

bool AtlasFile::findSections() {
  for (std::size_t index = 0; index < kSectionCount; ++index) {
    TableEntry entry;
    std::memcpy(&entry, mapping_.data() + sizeof(Header) + index * sizeof entry, sizeof entry);
    const SectionShape& shape = kShapes[index];
    if (std::string_view(entry.kind.data(), entry.kind.size()) != shape.kind ||
        entry.offset < kSectionsBegin || entry.offset > mapping_.size() ||
        entry.length > mapping_.size() - entry.offset || entry.length < shape.least ||
        entry.length % shape.record != 0) {
      return false;
    }
    sections_[index] = mapping_.subspan(entry.offset, entry.length);
  }
  // One grid, not two.
  return section(AtlasSection::kGrid).size() == kGridBytes;
}

}  // namespace platform
