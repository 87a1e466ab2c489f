#include "kxacore/Core/KXCIntegerMapTable.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <type_traits>
#include <vector>

namespace {

static_assert(!std::is_copy_constructible_v<KXCIntegerMapTable>);

constexpr std::int64_t kMin = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();

class KXCIntegerMapTableKeys : public testing::TestWithParam<std::int64_t> {};

// Every key is an ordinary key, the extremes and 0 included.
TEST_P(KXCIntegerMapTableKeys, StoresReplacesAndTellsZeroFromAbsent) {
  const std::int64_t key = GetParam();
  KXCIntegerMapTable table;
  EXPECT_FALSE(table.hasKey(key));
  EXPECT_EQ(table.valueForKey(key), 0) << "absent reads as 0";

  table.setValue(0, key);
  EXPECT_TRUE(table.hasKey(key)) << "a stored 0 is still a key";
  EXPECT_EQ(table.valueForKey(key), 0);

  table.setValue(kMin, key);
  EXPECT_EQ(table.valueForKey(key), kMin);
  EXPECT_EQ(table.allKeysAsNumbers(), std::vector<std::int64_t>{key}) << "replaced, not added";
  EXPECT_FALSE(table.hasKey(key ^ 1));
}

INSTANTIATE_TEST_SUITE_P(Keys, KXCIntegerMapTableKeys, testing::Values(0, 1, -1, kMin, kMax));

}  // namespace
