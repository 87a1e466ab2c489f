#include "kxacore/Imaging/KXCCroppedShape.h"

#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <unordered_set>

namespace {

TEST(KXCCroppedShape, TypeNames) {
  EXPECT_EQ(KXCCroppedShape::stringFromType(0), "rectangle");
  EXPECT_EQ(KXCCroppedShape::stringFromType(1), "");
  EXPECT_EQ(KXCCroppedShape::typeFromString("oval"), 0);  // unknown names read as a rectangle
  EXPECT_EQ(KXCCroppedShape::typeFromString(""), 0);
}

TEST(KXCCroppedShape, JsonRoundsHalvesAwayFromZeroInKeyOrder) {
  KXCCroppedShape shape({2.5, -2.5, 10.49, 7.5}, 0);
  shape.setImageSize({640.5, 479.4});
  shape.setImageHash("abc");
  EXPECT_EQ(shape.jsonString(),
            "{\n  \"type\": \"rectangle\",\n  \"x\": 3,\n  \"y\": -3,\n  \"width\": 10,\n"
            "  \"height\": 8,\n  \"imageWidthPixels\": 641,\n  \"imageHeightPixels\": 479,\n"
            "  \"fileHash\": \"abc\",\n  \"croppedFileHash\": \"\"\n}");
  const auto back = KXCCroppedShape::croppedShapeFromJSONString(shape.jsonString());
  ASSERT_TRUE(back.has_value());
  EXPECT_EQ(*back, shape);
  EXPECT_EQ(back->rect().x, 3.0);
  EXPECT_EQ(back->imageHash(), "abc");
}

TEST(KXCCroppedShape, EqualityAndHashUseTheRoundedForm) {
  const KXCCroppedShape a({0.4, 0, 10, 10}, 0), b({0, 0, 10, 10}, 0), c({0.5, 0, 10, 10}, 0);
  EXPECT_EQ(a, b);
  EXPECT_NE(a, c);
  EXPECT_EQ(a.hash(), b.hash());
  std::unordered_set<KXCCroppedShape> set{a, b, c};
  EXPECT_EQ(set.size(), 2u);
  KXCCroppedShape hashed = b;
  hashed.setCroppedFileHash("x");
  EXPECT_NE(hashed, b);
}

struct ReadRow {
  const char* json;
  bool readable;
};

class CroppedShapeReading : public ::testing::TestWithParam<ReadRow> {};

TEST_P(CroppedShapeReading, AcceptsOrRejects) {
  EXPECT_EQ(KXCCroppedShape::croppedShapeFromJSONString(GetParam().json).has_value(),
            GetParam().readable)
      << GetParam().json;
}

INSTANTIATE_TEST_SUITE_P(
    Texts, CroppedShapeReading,
    ::testing::Values(ReadRow{"", false}, ReadRow{"{}", false}, ReadRow{"[1]", false},
                      ReadRow{"{\"type\":\"rectangle\",\"x\":1,\"y\":2,\"width\":3", false},
                      ReadRow{"{\"type\":\"rectangle\",\"x\":1,\"y\":2,\"width\":3}", false},
                      ReadRow{"{\"type\":\"\",\"x\":1,\"y\":2,\"width\":3,\"height\":4}", false},
                      ReadRow{"{\"type\":7,\"x\":1,\"y\":2,\"width\":3,\"height\":4}", false},
                      ReadRow{"{\"type\":\"oval\",\"x\":1,\"y\":2,\"width\":3,\"height\":4}", true},
                      ReadRow{"{\"type\":\"r\",\"x\":null,\"y\":2,\"width\":3,\"height\":4}", false},
                      ReadRow{"{\"type\":\"r\",\"x\":\"12px\",\"y\":2.9,\"width\":-3.9,\"height\":"
                              "1e300}",
                              true}));

TEST(KXCCroppedShape, ReadingFillsDefaultsAndIntegerValues) {
  const auto shape = KXCCroppedShape::croppedShapeFromJSONString(
      "{\"type\":\"r\",\"x\":\"12px\",\"y\":2.9,\"width\":-3.9,\"height\":4}");
  ASSERT_TRUE(shape.has_value());
  EXPECT_EQ(shape->rect().x, 12.0);
  EXPECT_EQ(shape->rect().y, 2.0);
  EXPECT_EQ(shape->rect().width, -3.0);
  EXPECT_EQ(shape->imageSize().width, 0.0);
  EXPECT_EQ(shape->imageHash(), "");
  EXPECT_EQ(shape->croppedFileHash(), "");
  EXPECT_EQ(shape->type(), 0);
}

TEST(KXCCroppedShape, CroppedByWholeImage) {
  const struct {
    KXCRect rect;
    KXCSize image;
    bool whole;
  } rows[] = {
      {{0, 0, 100, 50}, {100, 50}, true},    {{-5, -5, 200, 200}, {100, 50}, true},
      {{1, 0, 100, 50}, {100, 50}, false},   {{0, 0, 99.5, 50}, {100, 50}, false},
      {{100, 50, -100, -50}, {100, 50}, true}, {{0, 0, 10, 10}, {0, 0}, false},
      {{0, 0, NAN, 10}, {10, 10}, false},
  };
  for (const auto& row : rows) {
    KXCCroppedShape shape(row.rect, 0);
    shape.setImageSize(row.image);
    EXPECT_EQ(shape.croppedByWholeImage(), row.whole) << row.rect.x << " " << row.rect.width;
  }
}

TEST(KXCCroppedShape, OddNumbersStayWritable) {
  KXCCroppedShape shape({NAN, INFINITY, 1e300, -1e300}, 5);
  shape.setImageHash(std::string("\xff\xfe", 2));
  const std::string json = shape.jsonString();
  EXPECT_NE(json.find("\"x\": 0"), std::string::npos);
  EXPECT_NE(json.find("\"type\": \"\""), std::string::npos);
  EXPECT_NE(json.find("9223372036854775807"), std::string::npos);
}

}  // namespace
