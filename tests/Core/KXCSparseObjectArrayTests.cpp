#include "kxacore/Core/KXCSparseObjectArray.h"

#include <gtest/gtest.h>

#include "tests/Core/KXCHangGuard.h"

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <limits>
#include <memory>
#include <set>
#include <string>
#include <thread>
#include <vector>

namespace {

using Strings = KXCSparseObjectArray<std::string>;

std::shared_ptr<std::string> text(const char* value) { return std::make_shared<std::string>(value); }

// Has no ==, so the array can only compare it by identity.
struct Opaque {
  int value = 0;
};

// Both kinds are tested: the safed one goes through the lock and the guard.
class KXCSparseObjectArrayEdges : public testing::TestWithParam<bool> {};

TEST_P(KXCSparseObjectArrayEdges, NullRemovesAndUnsetIndexesAreNull) {
  Strings array(GetParam());
  constexpr std::uint64_t kLast = std::numeric_limits<std::uint64_t>::max();
  array.setObject(text("zero"), 0);
  array.setObject(text("last"), kLast);
  array.setObject(text("mid"), 1700);
  ASSERT_EQ(array.count(), 3U);

  array.setObject(nullptr, 1700);
  EXPECT_EQ(array.count(), 2U);
  EXPECT_FALSE(array.hasIndex(1700));
  EXPECT_EQ(array.objectAtIndex(1700), nullptr);
  EXPECT_EQ(array.objectAtIndex(1), nullptr) << "never set";
  EXPECT_EQ(*array.objectAtIndex(0), "zero");
  EXPECT_EQ(*array.objectAtIndex(kLast), "last");

  array.setObject(nullptr, 5);  // nothing there: nothing changes
  EXPECT_EQ(array.count(), 2U);
  array.removeObjectAtIndex(0);
  EXPECT_EQ(array.count(), 1U);
  array.removeAllObjects();
  EXPECT_EQ(array.count(), 0U);
}

TEST_P(KXCSparseObjectArrayEdges, HasObjectComparesValuesAndIdentity) {
  Strings array(GetParam());
  EXPECT_FALSE(array.hasObject(text("a"))) << "empty";
  const auto held = text("a");
  array.setObject(held, 3);
  EXPECT_FALSE(array.hasObject(nullptr));
  EXPECT_FALSE(array.hasObjectIdenticalTo(nullptr));
  EXPECT_TRUE(array.hasObject(text("a"))) << "an equal string elsewhere";
  EXPECT_FALSE(array.hasObjectIdenticalTo(text("a")));
  EXPECT_TRUE(array.hasObjectIdenticalTo(held));
  EXPECT_FALSE(array.hasObject(text("b")));

  KXCSparseObjectArray<Opaque> opaque(GetParam());
  const auto one = std::make_shared<Opaque>();
  opaque.setObject(one, 1);
  EXPECT_TRUE(opaque.hasObject(one));
  EXPECT_FALSE(opaque.hasObject(std::make_shared<Opaque>())) << "no ==: identity only";
}

TEST_P(KXCSparseObjectArrayEdges, ListsEveryEntryOnce) {
  Strings array(GetParam());
  std::set<std::uint64_t> expected;
  for (std::uint64_t index = 0; index < 3000; index += 7) {
    array.setObject(text("x"), index);
    expected.insert(index);
  }
  const auto indexes = array.allIndexesAsNumbers();
  EXPECT_EQ(std::set<std::uint64_t>(indexes.begin(), indexes.end()), expected);
  EXPECT_EQ(indexes.size(), expected.size());
  EXPECT_EQ(array.allObjects().size(), expected.size());
}

TEST_P(KXCSparseObjectArrayEdges, EnumerationStopsAndToleratesChanges) {
  Strings array(GetParam());
  for (std::uint64_t index = 0; index < 10; ++index) array.setObject(text("x"), index);

  int visited = 0;
  array.enumerateIndexesAndObjectsUsingBlock([&](std::uint64_t, const auto&, bool& stop) { stop = ++visited == 3; });
  EXPECT_EQ(visited, 3);

  // The block calls back in (the recursive lock) and empties the array:
  // the walk goes on over its snapshot.
  visited = 0;
  array.enumerateIndexesAndObjectsUsingBlock([&](std::uint64_t, const auto& object, bool&) {
    EXPECT_TRUE(object);
    array.removeAllObjects();
    ++visited;
  });
  EXPECT_EQ(visited, 10);
  EXPECT_EQ(array.count(), 0U);
}

TEST_P(KXCSparseObjectArrayEdges, SubscriptsReadAndWrite) {
  Strings array(GetParam());
  array[4] = text("four");
  EXPECT_EQ(*array.objectAtIndex(4), "four");
  const Strings& readOnly = array;
  EXPECT_EQ(*readOnly[4], "four");
  EXPECT_EQ(readOnly[5], nullptr);
  array[4] = nullptr;
  EXPECT_FALSE(array.hasIndex(4));
}

TEST_P(KXCSparseObjectArrayEdges, CopyKeepsSafedAndIsIndependent) {
  Strings array(GetParam());
  array.setObject(text("a"), 1);
  Strings copy(array);
  EXPECT_EQ(copy.safed(), GetParam());
  EXPECT_TRUE(copy.isEqual(array));
  copy.setObject(text("b"), 2);
  EXPECT_EQ(array.count(), 1U);
  EXPECT_EQ(copy.objectAtIndex(1), array.objectAtIndex(1)) << "objects are shared";

  Strings assigned(!GetParam());
  assigned = copy;
  EXPECT_EQ(assigned.safed(), GetParam());
  EXPECT_EQ(assigned.count(), 2U);
}

INSTANTIATE_TEST_SUITE_P(PlainAndSafed, KXCSparseObjectArrayEdges, testing::Bool());

struct EqualityCase {
  const char* name;
  std::vector<std::pair<std::uint64_t, const char*>> left;
  std::vector<std::pair<std::uint64_t, const char*>> right;
  bool equal;
};

class KXCSparseObjectArrayEquality : public testing::TestWithParam<EqualityCase> {};

TEST_P(KXCSparseObjectArrayEquality, EqualContentsAreEqualAndHashAlike) {
  const EqualityCase& row = GetParam();
  // Inserted in opposite orders and with opposite locking, which must not matter.
  Strings left(true);
  Strings right(false);
  for (const auto& [index, value] : row.left) left.setObject(text(value), index);
  for (auto it = row.right.rbegin(); it != row.right.rend(); ++it) right.setObject(text(it->second), it->first);
  EXPECT_EQ(left.isEqual(right), row.equal) << row.name;
  EXPECT_EQ(right.isEqual(left), row.equal) << row.name;
  if (row.equal) {
    EXPECT_EQ(left.hash(), right.hash()) << row.name;
  }
  EXPECT_TRUE(left.isEqual(left));
}

INSTANTIATE_TEST_SUITE_P(
    Cases, KXCSparseObjectArrayEquality,
    testing::Values(EqualityCase{"both empty", {}, {}, true},
                    EqualityCase{"same entries", {{1, "a"}, {9, "b"}, {400, "c"}}, {{1, "a"}, {9, "b"}, {400, "c"}}, true},
                    EqualityCase{"value differs", {{1, "a"}, {2, "b"}}, {{1, "a"}, {2, "c"}}, false},
                    EqualityCase{"index differs", {{1, "a"}, {2, "b"}}, {{1, "a"}, {3, "b"}}, false},
                    EqualityCase{"one more entry", {{1, "a"}}, {{1, "a"}, {2, "b"}}, false},
                    EqualityCase{"values swapped", {{1, "a"}, {2, "b"}}, {{1, "b"}, {2, "a"}}, false}));

TEST(KXCSparseObjectArray, IdentityTypesHashByObject) {
  KXCSparseObjectArray<Opaque> a;
  KXCSparseObjectArray<Opaque> b;
  const auto shared = std::make_shared<Opaque>();
  a.setObject(shared, 1);
  b.setObject(shared, 1);
  EXPECT_TRUE(a.isEqual(b));
  EXPECT_EQ(a.hash(), b.hash());
  b.setObject(std::make_shared<Opaque>(), 1);
  EXPECT_FALSE(a.isEqual(b));
}

// Four threads on one safed array: each owns a band of indexes and checks
// it, while all of them read, list, copy and compare the whole.
TEST(KXCSparseObjectArrayConcurrent, SafedArrayFromFourThreads) {
  const KXCTestThreads::HangGuard guard("safed array from four threads");
  constexpr std::uint64_t kThreads = 4;
  constexpr std::uint64_t kPerThread = 300;
  const std::shared_ptr<Strings> shared = Strings::newSafe();
  std::atomic<int> failures{0};

  std::vector<std::thread> threads;
  for (std::uint64_t t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      const std::uint64_t base = t * 1'000'000;
      for (std::uint64_t i = 0; i < kPerThread; ++i) {
        const auto object = std::make_shared<std::string>(std::to_string(base + i));
        (*shared)[base + i] = object;
        if (shared->objectAtIndex(base + i) != object || !shared->hasObjectIdenticalTo(object)) ++failures;
        if (i % 3 == 0) shared->setObject(nullptr, base + i);
        if (i % 50 == 0) {
          const Strings snapshot(*shared);
          if (!snapshot.isEqual(snapshot)) ++failures;
          (void)shared->isEqual(snapshot);
          (void)snapshot.isEqual(*shared);
          (void)shared->hash();
          shared->enumerateIndexesAndObjectsUsingBlock([&](std::uint64_t index, const auto& held, bool&) {
            if (*held != std::to_string(index)) ++failures;
          });
        }
      }
    });
  }
  for (auto& thread : threads) thread.join();

  EXPECT_EQ(failures, 0);
  // Every third index was removed again: 100 of each 300 are gone.
  EXPECT_EQ(shared->count(), kThreads * (kPerThread - kPerThread / 3));
}

// Two threads comparing two safed arrays in opposite directions take the
// two locks in opposite orders; this must neither deadlock nor race.
TEST(KXCSparseObjectArrayConcurrent, OppositeComparisonsDoNotDeadlock) {
  const KXCTestThreads::HangGuard guard("opposite comparisons");
  Strings a(true);
  Strings b(true);
  for (std::uint64_t index = 0; index < 64; ++index) {
    a.setObject(text("v"), index);
    b.setObject(text("v"), index);
  }
  std::atomic<int> unequal{0};
  auto compare = [&](const Strings& left, const Strings& right) {
    for (int round = 0; round < 2000; ++round) {
      if (!left.isEqual(right)) ++unequal;
    }
  };
  std::thread forward(compare, std::cref(a), std::cref(b));
  std::thread backward(compare, std::cref(b), std::cref(a));
  forward.join();
  backward.join();
  EXPECT_EQ(unequal, 0);
}

}  // namespace
