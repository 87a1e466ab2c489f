#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <unordered_set>
#include <vector>

#include "kxacore/Data/Places/KXDPlaceName.h"

namespace {

using Text = std::optional<std::string>;
constexpr auto kAbsent = std::nullopt;
constexpr float kInf = std::numeric_limits<float>::infinity();
constexpr std::int64_t kMaxCode = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kMinCode = std::numeric_limits<std::int64_t>::min();

// Every decoded field, levels listed the way records list them.
struct Fields {
  // A constructor rather than an aggregate, so table rows may stop early.
  Fields(Text geo4 = kAbsent, Text geo3 = kAbsent, Text geo2 = kAbsent, Text geo1 = kAbsent,
         Text country = kAbsent, Text rawText = kAbsent, std::int64_t code = 0,
         float latitude = 0, float longitude = 0)
      : geo4(std::move(geo4)), geo3(std::move(geo3)), geo2(std::move(geo2)),
        geo1(std::move(geo1)), country(std::move(country)), rawText(std::move(rawText)),
        code(code), latitude(latitude), longitude(longitude) {}
  Text geo4, geo3, geo2, geo1, country, rawText;
  std::int64_t code;
  float latitude, longitude;
};

Fields fieldsOf(const KXDPlaceName& p) {
  return {p.geo4(), p.geo3(),    p.geo2(),     p.geo1(),     p.country(),
          p.rawText(), p.code(), p.latitude(), p.longitude()};
}

std::string show(const Text& t) { return t ? '"' + *t + '"' : "absent"; }

void expectFields(const KXDPlaceName& place, const Fields& want, const std::string& label) {
  const Fields got = fieldsOf(place);
  EXPECT_EQ(show(got.geo4), show(want.geo4)) << label;
  EXPECT_EQ(show(got.geo3), show(want.geo3)) << label;
  EXPECT_EQ(show(got.geo2), show(want.geo2)) << label;
  EXPECT_EQ(show(got.geo1), show(want.geo1)) << label;
  EXPECT_EQ(show(got.country), show(want.country)) << label;
  EXPECT_EQ(show(got.rawText), show(want.rawText)) << label;
  EXPECT_EQ(got.code, want.code) << label;
  EXPECT_EQ(got.latitude, want.latitude) << label;
  EXPECT_EQ(got.longitude, want.longitude) << label;
}

struct DecodeCase {
  const char* shape;
  std::string record;
  Fields expected;
};

class PlaceDecodeTest : public testing::TestWithParam<DecodeCase> {};

TEST_P(PlaceDecodeTest, DecodesEveryField) {
  const DecodeCase& c = GetParam();
  const KXDPlaceName place = KXDPlaceName::placeNameWithRecordData(c.record);
  expectFields(place, c.expected, std::string(c.shape) + ": \"" + c.record + "\"");
  // Until something drops it, the record comes back byte for byte.
  EXPECT_EQ(place.recordData(), c.record);
  EXPECT_TRUE(place.hasStoredRecord());
}

// Levels read before a structured attempt fails keep their values: a free
// text record leaves its "/"-separated pieces in geo4, geo3 ...
INSTANTIATE_TEST_SUITE_P(
    Structured, PlaceDecodeTest,
    testing::Values(
        DecodeCase{"all levels, no numbers", "/a/b/c/d/e///", {"a", "b", "c", "d", "e"}},
        DecodeCase{"country only", "/////Canada///", {kAbsent, kAbsent, kAbsent, kAbsent, "Canada"}},
        DecodeCase{"nothing at all", "////////", {}},
        DecodeCase{"numbers",
                   "/Main St//Sangamon/Illinois/USA/42/39.7817001343/-89.6501007080",
                   {"Main St", kAbsent, "Sangamon", "Illinois", "USA", kAbsent, 42, 39.7817f,
                    -89.6501f}},
        DecodeCase{"white space around everything",
                   " / Main St / x /  / Ohio\t/ USA / 5 / 1.5 / -2.5 \n",
                   {"Main St", "x", kAbsent, "Ohio", "USA", kAbsent, 5, 1.5f, -2.5f}},
        DecodeCase{"unicode spaces trimmed", "/\xC2\xA0Lyon\xE3\x80\x80////France///",
                   {"Lyon", kAbsent, kAbsent, kAbsent, "France"}},
        DecodeCase{"a bar is only text here", "/a|b////c///",
                   {"a|b", kAbsent, kAbsent, kAbsent, "c"}},
        DecodeCase{"latitude only", "/////e//1.5/", {kAbsent, kAbsent, kAbsent, kAbsent, "e",
                                                     kAbsent, 0, 1.5f, 0}},
        DecodeCase{"longitude only", "/////e///-2",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, 0, 0, -2}},
        DecodeCase{"code only, negative", "/////e/-7//",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, -7, 0, 0}}));

INSTANTIATE_TEST_SUITE_P(
    FreeText, PlaceDecodeTest,
    testing::Values(
        DecodeCase{"text and numbers", "/Springfield|12/39.7817/-89.6501",
                   {"Springfield|12", "39.7817", "-89.6501", kAbsent, kAbsent, "Springfield", 12,
                    39.7817f, -89.6501f}},
        DecodeCase{"text alone", "/Paris|//", {"Paris|", kAbsent, kAbsent, kAbsent, kAbsent,
                                               "Paris"}},
        DecodeCase{"text with code", "/Paris|3//",
                   {"Paris|3", kAbsent, kAbsent, kAbsent, kAbsent, "Paris", 3}},
        DecodeCase{"empty text", "/|4//", {"|4", kAbsent, kAbsent, kAbsent, kAbsent, kAbsent, 4}},
        DecodeCase{"text trimmed", "/  Old Town , Bern |//",
                   {"Old Town , Bern |", kAbsent, kAbsent, kAbsent, kAbsent, "Old Town , Bern"}}));

INSTANTIATE_TEST_SUITE_P(
    Malformed, PlaceDecodeTest,
    testing::Values(
        DecodeCase{"no leading slash", "Paris, France",
                   {kAbsent, kAbsent, kAbsent, kAbsent, kAbsent, "Paris, France"}},
        DecodeCase{"empty record", "", {kAbsent, kAbsent, kAbsent, kAbsent, kAbsent, ""}},
        DecodeCase{"slash alone", "/", {kAbsent, kAbsent, kAbsent, kAbsent, kAbsent, ""}},
        DecodeCase{"one slash short", "/a/b/c/d/e//",
                   {"a", "b", "c", "d", "e", "a/b/c/d/e//"}},
        DecodeCase{"leading space keeps the slash", " /x",
                   {"x", kAbsent, kAbsent, kAbsent, kAbsent, "/x"}},
        DecodeCase{"code followed by junk keeps the code", "/a/b/c/d/e/12abc//",
                   {"a", "b", "c", "d", "e", "a/b/c/d/e/12abc//", 12}},
        DecodeCase{"trailing junk keeps the longitude", "/a/b/c/d/e///1.5/extra",
                   {"a", "b", "c", "d", "e", "a/b/c/d/e///1.5/extra", 0, 0, 1.5f}},
        DecodeCase{"missing code at the end", "/a/b/c/d/e/",
                   {"a", "b", "c", "d", "e", "a/b/c/d/e/"}},
        DecodeCase{"longitude without its slash", "/a/b/c/d/e/1/2",
                   {"a", "b", "c", "d", "e", "a/b/c/d/e/1/2", 1, 2}},
        DecodeCase{"nine slashes", "/a/b/c/d/e////", {"a", "b", "c", "d", "e", "a/b/c/d/e////"}},
        DecodeCase{"free text cut after the bar", "/Paris|",
                   {"Paris|", kAbsent, kAbsent, kAbsent, kAbsent, "Paris|"}},
        DecodeCase{"free text bar in the numbers", "/x|5/a|b",
                   {"x|5", "a|b", kAbsent, kAbsent, kAbsent, "x|5/a|b", 5}}));

// How numbers read: signs, points, exponents, overflow. The record is
// "/////e/" CODE "/" LAT "/" LON.
INSTANTIATE_TEST_SUITE_P(
    Numbers, PlaceDecodeTest,
    testing::Values(
        DecodeCase{"plus signs", "/////e/+5/+1.25/+.5",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, 5, 1.25f, 0.5f}},
        DecodeCase{"bare points", "/////e//5./-.25",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, 0, 5, -0.25f}},
        DecodeCase{"exponents", "/////e//1e2/-2.5E-1",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, 0, 100, -0.25f}},
        DecodeCase{"overflow to infinity", "/////e//1e39/-1e999",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, 0, kInf, -kInf}},
        DecodeCase{"underflow to zero", "/////e//1e-999/0.0000000000001",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, 0, 0, 1e-13f}},
        DecodeCase{"long digit strings", "/////e//000000000000000000000000000042.5/",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, 0, 42.5f, 0}},
        DecodeCase{"code clamps high", "/////e/99999999999999999999//",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, kMaxCode}},
        DecodeCase{"code clamps low", "/////e/-99999999999999999999//",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", kAbsent, kMinCode}},
        DecodeCase{"exponent without digits", "/////e//1e/",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", "////e//1e/", 0, 1}},
        DecodeCase{"spelled infinity", "/////e//inf/",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", "////e//inf/"}},
        DecodeCase{"hexadecimal", "/////e//0x10/",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", "////e//0x10/"}},
        DecodeCase{"sign alone", "/////e/-//",
                   {kAbsent, kAbsent, kAbsent, kAbsent, "e", "////e/-//"}}));

struct EncodeCase {
  const char* shape;
  KXDPlaceName place;
  std::string record;
};

class PlaceEncodeTest : public testing::TestWithParam<EncodeCase> {};

TEST_P(PlaceEncodeTest, WritesTheRecord) {
  const EncodeCase& c = GetParam();
  EXPECT_FALSE(c.place.hasStoredRecord());
  EXPECT_EQ(c.place.recordData(), c.record) << c.shape;
}

KXDPlaceName structured(Text geo4, Text geo3, Text geo2, Text geo1, Text country,
                        std::int64_t code = 0, float latitude = 0, float longitude = 0) {
  return KXDPlaceName::placeNameWithGeo1(geo1, geo2, geo3, geo4, country, code, latitude,
                                         longitude);
}

INSTANTIATE_TEST_SUITE_P(
    Records, PlaceEncodeTest,
    testing::Values(
        EncodeCase{"country only", structured(kAbsent, kAbsent, kAbsent, kAbsent, "Canada"),
                   "/////Canada///"},
        EncodeCase{"empty strings as absent ones", structured("", "", "", "", "Canada"),
                   "/////Canada///"},
        EncodeCase{"empty place", KXDPlaceName(), "////////"},
        EncodeCase{"everything",
                   structured("Main St", kAbsent, "Sangamon", "Illinois", "USA", 42, 39.7817f,
                              -89.6501f),
                   "/Main St//Sangamon/Illinois/USA/42/39.7817001343/-89.6501007080"},
        EncodeCase{"no longitude: nothing after the last slash",
                   structured("a", "b", "c", "d", "e", 0, 1.5f, 0), "/a/b/c/d/e//1.5000000000/"},
        EncodeCase{"longitude alone", structured(kAbsent, kAbsent, kAbsent, kAbsent, "e", 0, 0, 2),
                   "/////e///2.0000000000"},
        EncodeCase{"negative code", structured(kAbsent, kAbsent, kAbsent, kAbsent, "e", -7),
                   "/////e/-7//"},
        EncodeCase{"smallest code", structured(kAbsent, kAbsent, kAbsent, kAbsent, "e", kMinCode),
                   "/////e/-9223372036854775808//"},
        // n/2048 has exactly eleven decimals: the tie rounds to even, as printf does.
        EncodeCase{"ten decimals round ties to even",
                   structured(kAbsent, kAbsent, kAbsent, kAbsent, "e", 0, 1.0f / 2048,
                              -3.0f / 2048),
                   "/////e//0.0004882812/-0.0014648438"},
        EncodeCase{"coordinate at epsilon is written",
                   structured(kAbsent, kAbsent, kAbsent, kAbsent, "e", 0,
                              KXDPlaceName::kCoordinateEpsilon, -KXDPlaceName::kCoordinateEpsilon),
                   "/////e//0.0000001192/-0.0000001192"},
        EncodeCase{"coordinate below epsilon is not",
                   structured(kAbsent, kAbsent, kAbsent, kAbsent, "e", 0,
                              std::nextafter(KXDPlaceName::kCoordinateEpsilon, 0.0f), -1e-30f),
                   "/////e///"},
        EncodeCase{"NaN is no coordinate",
                   structured(kAbsent, kAbsent, kAbsent, kAbsent, "e", 0,
                              std::numeric_limits<float>::quiet_NaN(), 0),
                   "/////e///"},
        EncodeCase{"free text", KXDPlaceName::placeNameWithText("Springfield", 12, 39.7817f,
                                                                -89.6501f),
                   "/Springfield|12/39.7817001343/-89.6501007080"},
        EncodeCase{"free text alone", KXDPlaceName::placeNameWithText("Paris", 0, 0, 0),
                   "/Paris|//"},
        EncodeCase{"empty free text is structured", KXDPlaceName::placeNameWithText("", 3, 0, 0),
                   "//////3//"}));

// Structured places: decoding the encoding gives an equal place.
TEST(PlaceRoundTripTest, StructuredPlacesSurviveEncoding) {
  const std::vector<KXDPlaceName> places = {
      KXDPlaceName(),
      structured(kAbsent, kAbsent, kAbsent, kAbsent, "Canada"),
      structured("Main St", kAbsent, "Sangamon", "Illinois", "USA", 42, 39.7817f, -89.6501f),
      structured("a|b", "x y", "\xC3\xA9vreux", "Normandie", "France", kMaxCode, -90, 180),
      structured(kAbsent, "Cook", kAbsent, kAbsent, kAbsent, kMinCode, 0, -0.5f),
  };
  for (const KXDPlaceName& place : places) {
    const KXDPlaceName back = KXDPlaceName::placeNameWithRecordData(place.recordData());
    EXPECT_EQ(back, place) << place.description() << "\n" << back.description();
  }
}

// Ten decimals hold every float from 0.01 up exactly.
TEST(PlaceRoundTripTest, CoordinatesSurviveEncoding) {
  for (float degrees = -180.0f; degrees <= 180.0f; degrees += 0.37f) {
    for (const float value : {degrees, degrees / 1000.0f + 0.01f, std::nextafter(degrees, 200.0f)}) {
      const KXDPlaceName place =
          structured(kAbsent, kAbsent, kAbsent, kAbsent, "x", 0, value, -value);
      const KXDPlaceName back = KXDPlaceName::placeNameWithRecordData(place.recordData());
      if (std::fabs(value) < 0.01f) continue;
      ASSERT_EQ(back.latitude(), value) << place.recordData();
      ASSERT_EQ(back.longitude(), -value) << place.recordData();
    }
  }
}

std::string reencoded(const KXDPlaceName& place) {
  return KXDPlaceName::placeNameWithPlaceName(place, place.latitude(), place.longitude(),
                                              place.code())
      .recordData();
}

// Tiny coordinates lose digits; one round trip later the record is stable
// (it may have dropped a coordinate that rounded below epsilon).
TEST(PlaceRoundTripTest, SmallCoordinatesSettleAfterOneRoundTrip) {
  for (float value = KXDPlaceName::kCoordinateEpsilon; value < 0.02f; value *= 1.7f) {
    const std::string first =
        structured(kAbsent, kAbsent, kAbsent, kAbsent, "x", 0, value, value).recordData();
    const KXDPlaceName once = KXDPlaceName::placeNameWithRecordData(first);
    EXPECT_NEAR(once.latitude(), value, 0.6e-10) << first;
    const std::string second = reencoded(once);
    EXPECT_EQ(reencoded(KXDPlaceName::placeNameWithRecordData(second)), second);
  }
}

TEST(PlaceRoundTripTest, FreeTextKeepsTextCodeAndCoordinates) {
  const KXDPlaceName place = KXDPlaceName::placeNameWithText("St. Mary's, Cork", -3, 51.9f, -8.47f);
  const KXDPlaceName back = KXDPlaceName::placeNameWithRecordData(place.recordData());
  EXPECT_EQ(back.rawText(), place.rawText());
  EXPECT_EQ(back.code(), -3);
  EXPECT_EQ(back.latitude(), 51.9f);
  EXPECT_EQ(back.longitude(), -8.47f);
  // Re-encoding writes the free-text form again, whatever geo4 picked up.
  EXPECT_EQ(KXDPlaceName::placeNameWithPlaceName(back, 51.9f, -8.47f, -3).recordData(),
            place.recordData());
}

TEST(PlaceEqualityTest, AbsentAndEmptyDiffer) {
  const KXDPlaceName absent = structured("a", kAbsent, "c", "d", "e");
  const KXDPlaceName empty = structured("a", "", "c", "d", "e");
  EXPECT_NE(absent, empty);
  EXPECT_EQ(absent.recordData(), empty.recordData());  // the record cannot tell them apart
  EXPECT_NE(KXDPlaceName::placeNameWithText(kAbsent, 0, 0, 0),
            KXDPlaceName::placeNameWithText("", 0, 0, 0));
}

TEST(PlaceEqualityTest, EachFieldTakesPart) {
  const KXDPlaceName base = structured("a", "b", "c", "d", "e", 1, 2, 3);
  const std::vector<KXDPlaceName> changed = {
      structured("A", "b", "c", "d", "e", 1, 2, 3), structured("a", "B", "c", "d", "e", 1, 2, 3),
      structured("a", "b", "C", "d", "e", 1, 2, 3), structured("a", "b", "c", "D", "e", 1, 2, 3),
      structured("a", "b", "c", "d", "E", 1, 2, 3), structured("a", "b", "c", "d", "e", 9, 2, 3),
      structured("a", "b", "c", "d", "e", 1, 2.5f, 3),
      structured("a", "b", "c", "d", "e", 1, 2, 3.5f),
      structured("a", "b", "c", "d", "e", 1, 1e-9f, 3),  // below epsilon, but not equal
  };
  for (const KXDPlaceName& other : changed) EXPECT_NE(base, other) << other.description();
  EXPECT_EQ(KXDPlaceName::placeNameWithRecordData("/a/b/c/d/e/1/2/3"), base);
}

// Equal places hash alike, whatever record they came from.
TEST(PlaceEqualityTest, HashFollowsEquality) {
  const std::vector<std::pair<KXDPlaceName, KXDPlaceName>> equalPairs = {
      {KXDPlaceName::placeNameWithRecordData("/a/b/c/d/e/1/2/3"),
       KXDPlaceName::placeNameWithRecordData("  /a / b/c/d/e/+1/2.0/3e0  ")},
      {structured(kAbsent, kAbsent, kAbsent, kAbsent, "x", 0, 0.0f, -0.0f),
       structured(kAbsent, kAbsent, kAbsent, kAbsent, "x", 0, -0.0f, 0.0f)},
      {KXDPlaceName::placeNameWithRecordData("/////Canada///"),
       structured(kAbsent, kAbsent, kAbsent, kAbsent, "Canada")},
  };
  for (const auto& [a, b] : equalPairs) {
    ASSERT_EQ(a, b) << a.description() << "\n" << b.description();
    EXPECT_EQ(std::hash<KXDPlaceName>{}(a), std::hash<KXDPlaceName>{}(b)) << a.description();
  }
  // Absent and "" hash apart (they are unequal, so they should rarely collide).
  EXPECT_NE(structured(kAbsent, "", kAbsent, kAbsent, kAbsent).hash(),
            structured("", kAbsent, kAbsent, kAbsent, kAbsent).hash());
}

TEST(PlaceEqualityTest, NaNCoordinateEqualsNothing) {
  const KXDPlaceName place = structured(kAbsent, kAbsent, kAbsent, kAbsent, "x", 0,
                                        std::numeric_limits<float>::quiet_NaN(), 0);
  const KXDPlaceName copy = place;
  EXPECT_FALSE(place == copy);
}

TEST(PlaceEqualityTest, KeysAnUnorderedSet) {
  std::unordered_set<KXDPlaceName> set;
  for (const char* record : {"/////Canada///", " /////Canada/// ", "/////Canada/0//", "/Ottawa|//",
                             "/ Ottawa |0/0/0", "/Ottawa////Canada///", "//Ottawa///Canada///"}) {
    set.insert(KXDPlaceName::placeNameWithRecordData(record));
  }
  // Canada three ways; the two free texts differ in the pieces their
  // structured attempt left in geo4 ("Ottawa|", "Ottawa |0") and below; the
  // two structured Ottawas sit at different levels.
  EXPECT_EQ(set.size(), 5u);
  EXPECT_TRUE(set.contains(structured(kAbsent, kAbsent, kAbsent, kAbsent, "Canada")));
  EXPECT_FALSE(set.contains(structured("", kAbsent, kAbsent, kAbsent, "Canada")));
}

TEST(PlaceAuthorityTest, NamePartsListCountryFirst) {
  const KXDPlaceName place = structured("Main St", kAbsent, "Ohio", "", "USA");
  const std::array<std::string, 5> expected = {"USA", "", "Ohio", "", "Main St"};
  EXPECT_EQ(place.nameParts(), expected);
  EXPECT_EQ(KXDPlaceName().nameParts(), (std::array<std::string, 5>{}));
}

TEST(PlaceAuthorityTest, EmptyPartsKeepFields) {
  KXDPlaceName place = KXDPlaceName::placeNameWithRecordData("/////USA///");
  place.setFromNameParts({"", "Ohio"});
  EXPECT_EQ(place.country(), "USA");
  EXPECT_EQ(place.geo1(), "Ohio");
  EXPECT_EQ(place.geo2(), std::nullopt);
  EXPECT_FALSE(place.hasStoredRecord());
  EXPECT_EQ(place.recordData(), "////Ohio/USA///");
}

TEST(PlaceAuthorityTest, SetsUpToFiveParts) {
  KXDPlaceName place = structured("old4", "old3", "old2", "old1", "Old");
  const std::vector<std::string> parts = {"C", "", "g2", "", "g4", "ignored"};
  place.setFromNameParts(parts);
  EXPECT_EQ(fieldsOf(place).country, "C");
  EXPECT_EQ(place.nameParts(), (std::array<std::string, 5>{"C", "old1", "g2", "old3", "g4"}));
  // nameParts() feeds setFromNameParts() back unchanged.
  KXDPlaceName copy = structured(kAbsent, kAbsent, kAbsent, kAbsent, kAbsent);
  copy.setFromNameParts(place.nameParts());
  EXPECT_EQ(copy.nameParts(), place.nameParts());
  place.setFromNameParts({});
  EXPECT_EQ(place.nameParts(), copy.nameParts());
}

TEST(PlaceAuthorityTest, ReplacingNumbersDropsTheRecord) {
  const KXDPlaceName decoded = KXDPlaceName::placeNameWithRecordData(" /a/b/c/d/e/1/2/3 ");
  const KXDPlaceName moved = KXDPlaceName::placeNameWithPlaceName(decoded, 10, -20, 7);
  EXPECT_EQ(moved.recordData(), "/a/b/c/d/e/7/10.0000000000/-20.0000000000");
  EXPECT_EQ(moved.geo4(), "a");
  EXPECT_EQ(decoded.recordData(), " /a/b/c/d/e/1/2/3 ");  // the original keeps its record
}

TEST(PlaceDescriptionTest, ListsEveryField) {
  const std::string text =
      KXDPlaceName::placeNameWithRecordData("/a//c/d/e/5/1.5/").description();
  for (const char* part : {"\"a\"", "geo3: (absent)", "\"c\"", "\"d\"", "\"e\"", "5",
                           "1.5000000000", "\"/a//c/d/e/5/1.5/\""}) {
    EXPECT_NE(text.find(part), std::string::npos) << part << " in " << text;
  }
}

}  // namespace
