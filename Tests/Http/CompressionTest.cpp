// SPDX-License-Identifier: Apache-2.0
//
// What the decompression takes for gzip, and where it stops.
#include "Helper/Platform/vlu/Compression.h"

#include <gtest/gtest.h>
#include <sys/resource.h>

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <iterator>
#include <numeric>

#include "Tests/Http/GzipForTest.h"

namespace {

using Bytes = std::vector<std::uint8_t>;

Bytes Joined(Bytes left, const Bytes& right) {
  left.insert(left.end(), right.begin(), right.end());
  return left;
}

class Decompression : public ::testing::Test {
 protected:
  Decompression() {
    EXPECT_NE(::mkdtemp(folder.data()), nullptr);
    path = folder + "/file";
  }
  ~Decompression() override { std::filesystem::remove_all(folder); }

  bool decompress(const Bytes& data, std::uint64_t longest = vlu::Compression::kLongestOutput) {
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    const bool done = vlu::Compression::Decompress(data, file, longest);
    EXPECT_FALSE(file.is_open());
    return done;
  }
  [[nodiscard]] std::string content() const {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }

  std::string folder = "/tmp/decompression-XXXXXX";
  std::string path;
};

/// Text that does not shrink to nothing and is longer than every buffer.
std::string LongText() {
  std::string text;
  for (long i = 0; text.size() < 3'000'000; ++i) text += std::to_string(i * 7919);
  return text;
}

TEST_F(Decompression, RestoresOneMember) {
  const std::string text = LongText();
  EXPECT_TRUE(decompress(support::Gzip(text)));
  EXPECT_TRUE(content() == text);
}

TEST_F(Decompression, RestoresAnEmptyMember) {
  EXPECT_TRUE(decompress(support::Gzip("")));
  EXPECT_EQ(content(), "");
}

TEST_F(Decompression, JoinsTheMembersInARow) {
  EXPECT_TRUE(
      decompress(Joined(Joined(support::Gzip("one"), support::Gzip("")), support::Gzip(" two"))));
  EXPECT_EQ(content(), "one two");
}

TEST_F(Decompression, TakesZeroBytesBehindTheLastMember) {
  EXPECT_TRUE(decompress(Joined(support::Gzip("text"), Bytes(1000, 0))));
  EXPECT_EQ(content(), "text");
}

TEST_F(Decompression, RefusesOtherBytesBehindTheLastMember) {
  EXPECT_FALSE(decompress(Joined(support::Gzip("text"), {'x'})));
  EXPECT_FALSE(decompress(Joined(support::Gzip("text"), {0, 0, 'x'})));
  EXPECT_FALSE(decompress(Joined(support::Gzip("text"), {0x1f})));
  EXPECT_FALSE(decompress(Joined(support::Gzip("text"), {0x1f, 0x8b})));
}

TEST_F(Decompression, RefusesWhatIsNotGzip) {
  EXPECT_FALSE(decompress({}));
  EXPECT_FALSE(decompress(Bytes(100, 0)));
  EXPECT_FALSE(decompress({'P', 'K', 3, 4}));
  // The same data behind zlib's own head (RFC 1950).
  Bytes zlib(100);
  uLongf length = zlib.size();
  ASSERT_EQ(::compress(zlib.data(), &length, reinterpret_cast<const Bytef*>("text"), 4), Z_OK);
  zlib.resize(length);
  EXPECT_FALSE(decompress(zlib));
}

TEST_F(Decompression, RefusesDataCutShortAtEveryByte) {
  const Bytes whole = support::Gzip("some text that is cut short, some text that is cut short");
  for (std::size_t length = 0; length < whole.size(); ++length) {
    EXPECT_FALSE(decompress(Bytes(whole.begin(), whole.begin() + static_cast<long>(length))))
        << length << " of " << whole.size();
  }
  EXPECT_TRUE(decompress(whole));
}

TEST_F(Decompression, RefusesAWrongCheckSumAndAWrongLength) {
  const Bytes whole = support::Gzip("text");
  for (std::size_t fromEnd = 1; fromEnd <= 8; ++fromEnd) {
    Bytes wrong = whole;
    wrong[wrong.size() - fromEnd] ^= 1;
    EXPECT_FALSE(decompress(wrong)) << fromEnd;
  }
}

TEST_F(Decompression, StopsAtTheLongestOutput) {
  const Bytes bomb = support::Gzip(std::string(std::size_t{64} << 20, '\0'));
  ASSERT_LT(bomb.size(), std::size_t{70'000});
  EXPECT_FALSE(decompress(bomb, 1'000'000));
  EXPECT_LE(std::filesystem::file_size(path), 1'000'000U);
  EXPECT_TRUE(decompress(bomb, std::uint64_t{64} << 20));
}

TEST_F(Decompression, CountsTheOutputOfAllMembersTogether) {
  const Bytes two = Joined(support::Gzip("12345"), support::Gzip("67890"));
  EXPECT_TRUE(decompress(two, 10));
  EXPECT_FALSE(decompress(two, 9));
}

TEST_F(Decompression, NoticesAFullDisk) {
  const std::string text = LongText();
  for (const std::string& size : {text.substr(0, 10), text}) {
    std::ofstream full("/dev/full", std::ios::binary);
    ASSERT_TRUE(full.is_open());
    EXPECT_FALSE(vlu::Compression::Decompress(support::Gzip(size), full));
  }
}

TEST_F(Decompression, NoticesALimitInTheMiddleOfTheFile) {
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto previous = std::signal(SIGXFSZ, SIG_IGN);
  const rlimit small{300'000, before.rlim_max};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
  EXPECT_FALSE(decompress(support::Gzip(LongText())));
  EXPECT_EQ(::setrlimit(RLIMIT_FSIZE, &before), 0);
  (void)std::signal(SIGXFSZ, previous);
}

TEST_F(Decompression, FailsOnAStreamThatIsNotOpen) {
  std::ofstream closed;
  EXPECT_FALSE(vlu::Compression::Decompress(support::Gzip("text"), closed));
}

}  // namespace
