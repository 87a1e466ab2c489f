#include "kxacore/Data/Format/KXDFormatInfo.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <thread>
#include <type_traits>
#include <vector>

#include "kxacore/RegExp/KXCRegExp.h"

static_assert(!std::is_copy_constructible_v<KXDFormatInfo>);
static_assert(!std::is_copy_assignable_v<KXDFormatInfo>);
static_assert(std::is_trivially_copyable_v<KXDFormatObject>);

namespace {

// A value of our own to format: any type binds to KXDFormatObject.
struct Item {
  std::string key;  // empty: not cacheable
  std::string name;
};

// Prints Item terms: "name" becomes the item's name, "drop" disappears, the
// rest stays. Counts its hook calls so tests can see what the engine asks.
class ItemFormatInfo : public KXDFormatInfo {
 public:
  explicit ItemFormatInfo(std::string_view format = "G") : KXDFormatInfo(format, "ItemFormatInfo") {}

  std::optional<std::string> cacheKeyForObject(KXDFormatObject object) const override {
    const Item* item = object.get<Item>();
    if (!item || item->key.empty()) return std::nullopt;
    return item->key;
  }
  std::optional<std::string> innerStringForObject(KXDFormatObject object, std::string_view format,
                                                  KXDFormatInfo* provider) override {
    ++innerCalls;
    if (format == "none") return std::nullopt;
    return KXDFormatInfo::innerStringForObject(object, format, provider);
  }
  std::any contextInfoForObject(KXDFormatObject object) const override {
    ++contextCalls;
    const Item* item = object.get<Item>();
    return item ? item->name : std::string("?");
  }
  std::optional<std::string> replaceTerm(std::string_view term, const std::any& context) override {
    terms.emplace_back(term);
    if (term == "drop") return std::nullopt;
    if (term == "name") return std::any_cast<std::string>(context);
    return std::string(term);
  }
  std::string postFormat(std::string text) const override {
    text.insert(text.begin(), '[');
    text.push_back(']');
    return text;
  }

  int innerCalls = 0;
  mutable int contextCalls = 0;
  std::vector<std::string> terms;
};

// ---- Splitting formats into terms and literals --------------------------------

struct SplitCase {
  std::string format;
  KXDTermPieces pieces;
};

class TermSplitTest : public testing::TestWithParam<SplitCase> {};

TEST_P(TermSplitTest, SplitsAndCachesPieces) {
  const SplitCase& c = GetParam();
  // The base engine prints a format unchanged: every term replaces itself.
  KXDFormatInfo formatter;
  EXPECT_EQ(formatter.stringForObject(Item{}, c.format), c.format);
  const auto cache = KXDFormatInfo::termsPatternCache();
  const auto it = cache->find(c.format);
  if (c.pieces.empty()) {
    EXPECT_EQ(it, cache->end()) << "an empty split is not cached";
  } else {
    ASSERT_NE(it, cache->end()) << c.format;
    EXPECT_EQ(it->second, c.pieces) << c.format;
  }
}

INSTANTIATE_TEST_SUITE_P(
    Formats, TermSplitTest,
    testing::Values(SplitCase{"", {}}, SplitCase{"G", {{true, "G"}}},
                    SplitCase{"Mmmm of yyyy",
                              {{true, "Mmmm"}, {false, " "}, {true, "of"}, {false, " "},
                               {true, "yyyy"}}},
                    SplitCase{"  x_1.b2, ", {{false, "  "}, {true, "x_1"}, {false, "."},
                                             {true, "b2"}, {false, ", "}}},
                    SplitCase{"é-d", {{false, "é-"}, {true, "d"}}},
                    SplitCase{"--", {{false, "--"}}}));

TEST(KXDFormatInfoTest, ReplacesTermsWithLazyContext) {
  ItemFormatInfo formatter;
  const Item item{"", "Oslo"};
  EXPECT_EQ(formatter.stringForObject(item, "name, drop x1!"), "[Oslo,  x1!]");
  EXPECT_EQ(formatter.terms, (std::vector<std::string>{"name", "drop", "x1"}));
  EXPECT_EQ(formatter.contextCalls, 1) << "context is made once per substitution";

  formatter.contextCalls = 0;
  EXPECT_EQ(formatter.stringForObject(item, "--"), "[--]");
  EXPECT_EQ(formatter.contextCalls, 0) << "no term, no context";
}

TEST(KXDFormatInfoTest, FormatFallsBackToDefaultThenG) {
  ItemFormatInfo formatter("name!");
  const Item item{"", "Oslo"};
  EXPECT_EQ(formatter.stringForObject(item), "[Oslo!]");
  formatter.setDefaultFormat(std::nullopt);
  EXPECT_EQ(formatter.stringForObject(item), "[G]");
  formatter.setDefaultFormat("");
  EXPECT_EQ(formatter.stringForObject(item), "[]") << "an empty format is a format";
}

TEST(KXDFormatInfoTest, ProviderHooksDoTheWork) {
  KXDFormatInfo receiver("receiver");
  ItemFormatInfo provider("name");
  const Item item{"", "Bergen"};
  EXPECT_EQ(receiver.stringForObject(item, std::nullopt, &provider), "[Bergen]");
  EXPECT_EQ(provider.innerCalls, 1);
  EXPECT_EQ(receiver.stringForObject(item, "name", nullptr), "name");
}

TEST(KXDFormatInfoTest, NoneFromInnerStringIsNone) {
  ItemFormatInfo formatter;
  EXPECT_EQ(formatter.stringForObject(Item{"k", "x"}, "none"), std::nullopt);
}

// ---- Cache ------------------------------------------------------------------------

TEST(KXDFormatInfoTest, CacheIsOffUntilInstalled) {
  ItemFormatInfo formatter;
  const Item item{"7", "Oslo"};
  EXPECT_EQ(formatter.cache(), nullptr);
  (void)formatter.stringForObject(item, "name");
  (void)formatter.stringForObject(item, "name");
  EXPECT_EQ(formatter.innerCalls, 2);
}

TEST(KXDFormatInfoTest, CachesByClassObjectAndFormat) {
  ItemFormatInfo formatter;
  auto cache = std::make_shared<KXDFormatCache>();
  formatter.setCache(cache);
  Item item{"7", "Oslo"};
  EXPECT_EQ(formatter.stringForObject(item, "name"), "[Oslo]");
  item.name = "renamed";  // a hit returns the stored text
  EXPECT_EQ(formatter.stringForObject(item, "name"), "[Oslo]");
  EXPECT_EQ(formatter.innerCalls, 1);
  EXPECT_EQ(formatter.stringForObject(item, "name!"), "[renamed!]");
  EXPECT_EQ(cache->size(), 2u);
  EXPECT_EQ(cache->at("ItemFormatInfo:7:name"), "[Oslo]");

  // No object key, or no result: nothing stored.
  (void)formatter.stringForObject(Item{"", "x"}, "name");
  (void)formatter.stringForObject(item, "none");
  EXPECT_EQ(cache->size(), 2u);
}

// The receiver's cache decides whether to cache at all; the entries live in
// the provider's cache, under the receiver's class key.
TEST(KXDFormatInfoTest, ProviderCachesOnlyWhenTheReceiverHasACache) {
  struct Case {
    bool receiverCache, providerCache;
    int innerCalls;       // after formatting the same item twice
    std::size_t entries;  // in the provider's cache
  };
  for (const Case& c : {Case{false, true, 2, 0}, Case{true, false, 2, 0}, Case{true, true, 1, 1}}) {
    KXDFormatInfo receiver;
    ItemFormatInfo provider;
    auto receiverCache = std::make_shared<KXDFormatCache>();
    auto providerCache = std::make_shared<KXDFormatCache>();
    if (c.receiverCache) receiver.setCache(receiverCache);
    if (c.providerCache) provider.setCache(providerCache);
    const Item item{"7", "Oslo"};
    for (int i = 0; i < 2; ++i) {
      EXPECT_EQ(receiver.stringForObject(item, "name", &provider), "[Oslo]");
    }
    SCOPED_TRACE(testing::Message() << "receiver cache " << c.receiverCache << ", provider cache "
                                    << c.providerCache);
    EXPECT_EQ(provider.innerCalls, c.innerCalls);
    EXPECT_EQ(providerCache->size(), c.entries);
    EXPECT_TRUE(receiverCache->empty());
    if (c.entries) {
      EXPECT_EQ(providerCache->at("KXDFormatInfo:7:name"), "[Oslo]");
    }
  }
}

TEST(KXDFormatInfoTest, FlushForObjectDropsEveryKeyContainingIt) {
  ItemFormatInfo formatter;
  auto cache = std::make_shared<KXDFormatCache>();
  formatter.setCache(cache);
  for (const char* key : {"12", "123", "4", "5"}) {
    (void)formatter.stringForObject(Item{key, key}, "name");
  }
  ASSERT_EQ(cache->size(), 4u);
  formatter.flushCacheForObject(Item{"12", ""});
  EXPECT_EQ(cache->size(), 2u) << "12 and 123 go together (substring rule)";
  EXPECT_TRUE(cache->contains("ItemFormatInfo:4:name"));
  formatter.flushCacheForObject(Item{"", ""});  // no key: nothing to flush
  EXPECT_EQ(cache->size(), 2u);
  formatter.flushCache();
  EXPECT_TRUE(cache->empty());
}

TEST(KXDFormatInfoTest, CloneCopiesSettingsButNotTheCache) {
  KXDFormatInfo formatter("d yyyy");
  formatter.setCache(std::make_shared<KXDFormatCache>());
  const std::unique_ptr<KXDFormatInfo> copy = formatter.clone();
  EXPECT_EQ(copy->defaultFormat(), "d yyyy");
  EXPECT_EQ(copy->cacheKey(), "KXDFormatInfo");
  EXPECT_EQ(copy->cache(), nullptr);
}

TEST(KXDFormatInfoTest, OneFormatterServesManyThreads) {
  ItemFormatInfo formatter;
  formatter.setCache(std::make_shared<KXDFormatCache>());
  std::vector<std::thread> threads;
  std::vector<int> failures(4, 0);
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; i < 300; ++i) {
        const std::string key = std::to_string(i % 50);
        std::string format = "name";
        if (i % 2 == 0) format.append("-").append(std::to_string(t));
        const auto text = formatter.stringForObject(Item{key, key}, format);
        std::string expected = "[";
        expected.append(key);
        if (i % 2 == 0) expected.append("-").append(std::to_string(t));
        expected.push_back(']');
        if (text != expected) ++failures[static_cast<std::size_t>(t)];
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(failures, std::vector<int>(4, 0));
}

// ---- Whitespace ---------------------------------------------------------------------

struct CollapseCase {
  std::string text;
  std::string expected;
};

class CollapseWhitespaceTest : public testing::TestWithParam<CollapseCase> {};

TEST_P(CollapseWhitespaceTest, CollapsesRuns) {
  EXPECT_EQ(KXDFormatInfo::collapseWhitespaceInString(GetParam().text), GetParam().expected);
}

INSTANTIATE_TEST_SUITE_P(
    Texts, CollapseWhitespaceTest,
    testing::Values(CollapseCase{"", ""}, CollapseCase{"a b", "a b"},
                    CollapseCase{"a\tb", "a\tb"},  // a single blank is kept as it is
                    CollapseCase{"a  b", "a b"}, CollapseCase{"a \t b", "a b"},
                    CollapseCase{"a \n b", "a\nb"}, CollapseCase{"\r\n", "\n"},
                    CollapseCase{"  a  ", " a "},
                    // Non-ASCII text takes the expression path.
                    CollapseCase{"é  \n b  ü", "é\nb ü"}));

// The ASCII fast path must agree with the expression on any text.
TEST(CollapseWhitespaceTest, FastPathAgreesWithTheExpression) {
  std::mt19937 random(7);
  const std::string alphabet = "ab \t\n\r\v\f,";
  for (int i = 0; i < 2000; ++i) {
    std::string text;
    const int length = static_cast<int>(random() % 12);
    for (int j = 0; j < length; ++j) text.push_back(alphabet[random() % alphabet.size()]);
    const std::string expected = KXDFormatInfo::collapsePattern().replaceAllMatchesWithStringEvaluator(
        text, [](std::string_view run) -> std::optional<std::string> {
          return std::string(run.find('\n') != std::string_view::npos ? "\n" : " ");
        });
    ASSERT_EQ(KXDFormatInfo::collapseWhitespaceInString(text), expected) << '"' << text << '"';
  }
}

}  // namespace
