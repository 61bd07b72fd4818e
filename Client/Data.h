// SPDX-License-Identifier: Apache-2.0
//
// Bytes that a request returned. Move-only; belongs to one thread at a time. The memory comes from
// malloc, so that the C interface hands the very same block to its caller.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <memory>
#include <span>
#include <string_view>
#include <utility>

namespace halvec {

/// A block of bytes of fixed length. Empty: no memory at all.
class Data {
 public:
  Data() = default;
  Data(Data&& other) noexcept
      : bytes_(std::move(other.bytes_)), size_(std::exchange(other.size_, 0)) {}
  Data& operator=(Data&& other) noexcept {
    bytes_ = std::move(other.bytes_);
    size_ = std::exchange(other.size_, 0);
    return *this;
  }
  ~Data() = default;

  /// Makes this a block of `size` bytes of unspecified content. False, and empty, without memory.
  [[nodiscard]] bool allocate(std::size_t size) noexcept {
    bytes_.reset(size == 0 ? nullptr : static_cast<std::byte*>(std::malloc(size)));
    size_ = bytes_ == nullptr ? 0 : size;
    return size_ == size;
  }

  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] bool empty() const noexcept { return size_ == 0; }
  [[nodiscard]] std::span<std::byte> bytes() noexcept { return {bytes_.get(), size_}; }
  [[nodiscard]] std::span<const std::byte> bytes() const noexcept { return {bytes_.get(), size_}; }
  /// The bytes as text, for content that is text.
  [[nodiscard]] std::string_view text() const noexcept {
    return {reinterpret_cast<const char*>(bytes_.get()), size_};
  }

  /// Gives the block away; the caller frees it. Null when empty.
  [[nodiscard]] std::byte* release() noexcept {
    size_ = 0;
    return bytes_.release();
  }

 private:
  struct Free {
    void operator()(std::byte* bytes) const noexcept { std::free(bytes); }
  };
  std::unique_ptr<std::byte, Free> bytes_;
  std::size_t size_ = 0;
};

}  // namespace halvec
