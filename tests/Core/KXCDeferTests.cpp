#include "kxacore/Core/KXCDefer.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <type_traits>

namespace {

// Copying or moving a guard would run its block twice or early.
static_assert(!std::is_copy_constructible_v<KXCDefer>);
static_assert(!std::is_move_constructible_v<KXCDefer>);
static_assert(!std::is_copy_assignable_v<KXCDefer>);

TEST(KXCDefer, RunsWhenAnExceptionLeavesTheScope) {
  bool ran = false;
  EXPECT_THROW(
      {
        const KXCDefer guard([&] { ran = true; });
        throw std::runtime_error("unwind");
      },
      std::runtime_error);
  EXPECT_TRUE(ran);
}

TEST(KXCDefer, GuardsRunAtScopeEndInReverseOrder) {
  std::string order;
  {
    const auto first = KXCDefer::deferWith([&] { order += 'a'; });
    const auto second = KXCDefer::deferWith([&] { order += 'b'; });
    EXPECT_EQ(order, "");
  }
  EXPECT_EQ(order, "ba");
}

TEST(KXCDefer, KeepsItsOwnCopyOfTheBlock) {
  int runs = 0;
  KXCDefer::Block block = [&] { ++runs; };
  {
    const KXCDefer guard(block);
    block = nullptr;  // the caller's copy goes; the guard's stays
  }
  EXPECT_EQ(runs, 1);
}

// Calling an empty std::function would throw inside the destructor and end the process.
TEST(KXCDefer, EmptyBlockRunsNothing) {
  { const KXCDefer guard(KXCDefer::Block{}); }
  SUCCEED();
}

}  // namespace
