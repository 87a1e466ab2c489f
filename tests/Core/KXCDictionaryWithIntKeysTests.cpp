#include "kxacore/Core/KXCDictionaryWithIntKeys.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <type_traits>

namespace {

using Strings = KXCDictionaryWithIntKeys<std::string>;

// An implicit copy would silently be read-only; copy() says so in the call.
static_assert(!std::is_copy_constructible_v<Strings>);

std::shared_ptr<std::string> text(const char* value) { return std::make_shared<std::string>(value); }

struct Opaque {};

TEST(KXCDictionaryWithIntKeys, NullLeavesAnExistingEntryInPlace) {
  Strings dictionary;
  const auto anna = text("Anna");
  ASSERT_TRUE(dictionary.setObject(anna, 7));
  EXPECT_FALSE(dictionary.setObject(nullptr, 7));
  EXPECT_FALSE(dictionary.setObject(nullptr, 8));
  EXPECT_EQ(dictionary.objectForIntegerKey(7), anna);
  EXPECT_EQ(dictionary.objectForIntegerKey(8), nullptr);
  EXPECT_EQ(dictionary.count(), 1U);
}

TEST(KXCDictionaryWithIntKeys, SetReplacesAndRemoveReportsWhatItDid) {
  Strings dictionary(16);
  dictionary.setObject(text("a"), -3);
  dictionary.setObject(text("b"), -3);
  EXPECT_EQ(*dictionary.objectForIntegerKey(-3), "b");
  EXPECT_EQ(dictionary.count(), 1U);
  EXPECT_FALSE(dictionary.removeObjectForIntegerKey(4));
  EXPECT_TRUE(dictionary.removeObjectForIntegerKey(-3));
  EXPECT_EQ(dictionary.count(), 0U);
  EXPECT_TRUE(dictionary.allValues().empty());
}

// The copy is for reading: its mutators refuse, and neither side sees the
// other's later changes.
TEST(KXCDictionaryWithIntKeys, CopyIsReadOnlyAndIndependent) {
  Strings dictionary;
  dictionary.setObject(text("a"), 1);
  dictionary.setObject(text("b"), 2);
  const Strings copied = dictionary.copy();
  Strings copy = dictionary.copy();

  EXPECT_TRUE(copy.isReadOnly());
  EXPECT_FALSE(dictionary.isReadOnly());
  EXPECT_FALSE(copy.setObject(text("c"), 3));
  EXPECT_FALSE(copy.removeObjectForIntegerKey(1));
  EXPECT_EQ(copy.count(), 2U);
  EXPECT_EQ(copy.objectForIntegerKey(1), dictionary.objectForIntegerKey(1)) << "objects are shared";

  EXPECT_TRUE(dictionary.removeObjectForIntegerKey(2));
  EXPECT_TRUE(dictionary.setObject(text("z"), 1));
  EXPECT_EQ(*copied.objectForIntegerKey(1), "a");
  EXPECT_EQ(copied.count(), 2U);
  EXPECT_TRUE(copied.copy().isReadOnly());
}

TEST(KXCDictionaryWithIntKeys, DescriptionListsKeysAscending) {
  Strings dictionary;
  EXPECT_EQ(dictionary.description(), "{}");
  dictionary.setObject(text("Bert"), 7);
  dictionary.setObject(text("Anna"), -1);
  dictionary.setObject(text(""), 100);
  EXPECT_EQ(dictionary.description(), "{-1: Anna, 7: Bert, 100: }");

  KXCDictionaryWithIntKeys<Opaque> opaque;
  opaque.setObject(std::make_shared<Opaque>(), 3);
  const std::string described = opaque.description();
  EXPECT_TRUE(described.starts_with("{3: <0x") && described.ends_with(">}")) << described;
}

}  // namespace
