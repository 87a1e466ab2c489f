// KXGIdTable: numbering in first-seen order across growth, keys of any bytes
// and length (block ends, length-prefix boundaries, a key longer than a
// block); KXGChunkedVector keeps its elements in place while growing.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "kxacore/Gedcom/KXGIdTable.h"

namespace {

TEST(KXGIdTableTest, NumbersKeysInFirstSeenOrderAcrossGrowth) {
  KXGIdTable table;
  constexpr std::uint32_t kCount = 200000;  // many table doublings and key blocks
  for (std::uint32_t i = 0; i < kCount; ++i) {
    const auto [index, added] = table.intern("@I" + std::to_string(i) + "@");
    ASSERT_EQ(index, i);
    ASSERT_TRUE(added);
  }
  EXPECT_EQ(table.size(), kCount);
  for (std::uint32_t i = kCount; i-- > 0;) {
    const std::string key = "@I" + std::to_string(i) + "@";
    const auto [index, added] = table.intern(key);
    ASSERT_EQ(index, i);
    ASSERT_FALSE(added);
    ASSERT_EQ(table.text(i), key);
  }
  EXPECT_EQ(table.size(), kCount);
}

TEST(KXGIdTableTest, KeysOfAnyBytesAndLengthRoundTrip) {
  const std::vector<std::string> keys = {
      "",
      std::string("@a\0b@", 5),
      std::string("@a\0c@", 5),            // differs only after a NUL
      std::string(127, 'x'),               // one length byte
      std::string(128, 'x'),               // two length bytes
      std::string(16383, 'y'),
      std::string(16384, 'y'),             // three length bytes
      std::string((1u << 20) - 3, 'z'),    // nearly a block: starts a fresh one
      std::string((3u << 20) + 7, 'w'),    // longer than a block: a block of its own
      "@after-the-long-one@",
      "\xff\xfe@\x80",
  };
  KXGIdTable table;
  for (std::size_t i = 0; i < keys.size(); ++i) {
    EXPECT_EQ(table.intern(keys[i]), std::make_pair(static_cast<std::uint32_t>(i), true)) << i;
  }
  // Fill several blocks with medium keys, so keys meet block ends.
  for (int i = 0; i < 5000; ++i) table.intern(std::string(700 + i % 300, 'k') + std::to_string(i));
  for (std::size_t i = 0; i < keys.size(); ++i) {
    EXPECT_EQ(table.text(static_cast<std::uint32_t>(i)), keys[i]) << i;
    EXPECT_EQ(table.intern(keys[i]), std::make_pair(static_cast<std::uint32_t>(i), false)) << i;
  }
  for (int i = 0; i < 5000; ++i) {
    const std::string key = std::string(700 + i % 300, 'k') + std::to_string(i);
    ASSERT_EQ(table.text(static_cast<std::uint32_t>(keys.size()) + static_cast<std::uint32_t>(i)), key);
  }
}

TEST(KXGChunkedVectorTest, GrowsWithoutMovingElements) {
  KXGChunkedVector<int, 4> values;  // blocks of 16
  EXPECT_TRUE(values.empty());
  values.push_back(0);
  const int* first = &values[0];
  for (int i = 1; i < 100; ++i) values.push_back(i);
  EXPECT_EQ(first, &values[0]);
  ASSERT_EQ(values.size(), 100u);
  for (int i = 0; i < 100; ++i) EXPECT_EQ(values[static_cast<std::size_t>(i)], i);
  values.back() = -1;
  EXPECT_EQ(values[99], -1);
}

}  // namespace
