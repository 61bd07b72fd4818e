// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/vlu/Compression.h"

#include <zlib.h>

#include <algorithm>
#include <limits>
#include <memory>
#include <span>

#include "Helper/Platform/SharedLibrary.h"

namespace vlu::Compression {
namespace {

constexpr std::size_t kBufferSize = std::size_t{128} << 10;
/// The largest window, and gzip's head and trailer instead of zlib's.
constexpr int kGzipWindowBits = MAX_WBITS + 16;

struct Zlib {
  platform::SharedLibrary library{"libz.so.1"};
  decltype(&::inflateInit2_) initialise = nullptr;
  decltype(&::inflate) inflate = nullptr;
  decltype(&::inflateReset) reset = nullptr;
  decltype(&::inflateEnd) end = nullptr;

  Zlib() {
    library.bind(initialise, "inflateInit2_");
    library.bind(inflate, "inflate");
    library.bind(reset, "inflateReset");
    library.bind(end, "inflateEnd");
  }
};

const Zlib& Library() {
  static const Zlib& zlib = *new Zlib;
  return zlib;
}

class Gunzip {
 public:
  Gunzip(const std::vector<std::uint8_t>& data, std::ofstream& out, std::uint64_t longest)
      : rest_(data), out_(out), room_(longest) {
    ready_ = zlib_.library.complete() &&
             zlib_.initialise(&stream_, kGzipWindowBits, ZLIB_VERSION, sizeof stream_) == Z_OK;
  }
  ~Gunzip() {
    if (ready_) zlib_.end(&stream_);
  }
  Gunzip(const Gunzip&) = delete;
  Gunzip& operator=(const Gunzip&) = delete;

  [[nodiscard]] bool run() {
    if (!ready_) return false;
    do {
      if (!member()) return false;
    } while (restIsAnotherMember());
    return std::all_of(rest_.begin(), rest_.end(), [](std::uint8_t byte) { return byte == 0; });
  }

 private:
  /// Writes one member out; false unless it is whole and right.
  [[nodiscard]] bool member() {
    int result = zlib_.reset(&stream_);
    while (result == Z_OK) {
      const std::size_t offered =
          std::min(rest_.size(), std::size_t{std::numeric_limits<uInt>::max()});
      stream_.next_in = const_cast<Bytef*>(rest_.data());  // only read
      stream_.avail_in = static_cast<uInt>(offered);
      stream_.next_out = buffer_.get();
      stream_.avail_out = kBufferSize;
      // No progress is an error of its own: data that was cut short ends there.
      result = zlib_.inflate(&stream_, Z_NO_FLUSH);
      rest_ = rest_.subspan(offered - stream_.avail_in);
      if (!write(kBufferSize - stream_.avail_out)) return false;
    }
    return result == Z_STREAM_END;
  }

  [[nodiscard]] bool write(std::size_t length) {
    if (length > room_) return false;
    room_ -= length;
    out_.write(reinterpret_cast<const char*>(buffer_.get()), static_cast<std::streamsize>(length));
    return out_.good();
  }

  [[nodiscard]] bool restIsAnotherMember() const {
    return rest_.size() >= 2 && rest_[0] == 0x1f && rest_[1] == 0x8b;
  }

  const Zlib& zlib_ = Library();
  z_stream stream_{};
  bool ready_;
  std::unique_ptr<Bytef[]> buffer_ = std::make_unique_for_overwrite<Bytef[]>(kBufferSize);
  std::span<const std::uint8_t> rest_;
  std::ofstream& out_;
  std::uint64_t room_;
};

}  // namespace

bool Decompress(const std::vector<std::uint8_t>& data, std::ofstream& out, std::uint64_t longest) {
  const bool whole = Gunzip(data, out, longest).run();
  // What a full disk refuses may show at the close only.
  out.close();
  return whole && out.good();
}

}  // namespace vlu::Compression
