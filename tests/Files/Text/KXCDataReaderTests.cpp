#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <stdexcept>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCDataReader.h"
#include "kxacore/Files/Text/KXCDataWriter.h"

namespace {

using Bytes = std::vector<std::uint8_t>;

struct MalformedCase {
  Bytes bytes;
  std::int32_t value;
  std::uint64_t consumed;
};

class SevenBitReadTest : public testing::TestWithParam<MalformedCase> {};

TEST_P(SevenBitReadTest, ReadsFiveGroupsAtMost) {
  const MalformedCase& c = GetParam();
  KXCDataReader reader(c.bytes);
  EXPECT_EQ(reader.get7BitEncodedInt(), c.value);
  EXPECT_EQ(reader.location(), c.consumed);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, SevenBitReadTest,
    testing::Values(
        // Five continuation bytes: -1, consumed (.NET throws FormatException).
        MalformedCase{{0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x01}, -1, 5},
        // 0xFFFFFFFF reads as -1 too: the two cannot be told apart.
        MalformedCase{{0xFF, 0xFF, 0xFF, 0xFF, 0x0F}, -1, 5},
        // Only the low 4 bits of the fifth group survive (.NET rejects this).
        MalformedCase{{0xFF, 0xFF, 0xFF, 0xFF, 0x7F}, -1, 5},
        MalformedCase{{0x80, 0x80, 0x80, 0x80, 0x10}, 0, 5},
        // Non-minimal encodings are accepted.
        MalformedCase{{0x81, 0x80, 0x00}, 1, 3},
        MalformedCase{{0xFF, 0xFF, 0xFF, 0xFF, 0x07}, 0x7FFFFFFF, 5}));

TEST(KXCDataReaderTest, FixedWidthValues) {
  const Bytes bytes = {0xFE, 0xFF, 0xFF, 0x04, 0x03, 0x02, 0x81, 0x00, 0x00, 0xC0, 0x3F, 0x7F};
  KXCDataReader reader(bytes.data(), bytes.size());
  EXPECT_EQ(reader.getUInt16(), 0xFFFE);
  reader.seekToLocation(0);
  EXPECT_EQ(reader.getInt16(), -2);  // sign-extended
  EXPECT_EQ(reader.getByte(), 0xFF);
  reader.seekToLocation(3);
  EXPECT_EQ(reader.getUInt32(), 0x81020304u);
  reader.seekToLocation(3);
  EXPECT_EQ(reader.getInt32(), static_cast<std::int32_t>(0x81020304u));
  EXPECT_EQ(reader.lastReadLength(), 4u);
  EXPECT_EQ(reader.getSingle(), 1.5f);
  EXPECT_EQ(reader.getByte(), 0x7F);
  EXPECT_EQ(reader.location(), bytes.size());
}

TEST(KXCDataReaderTest, OffsetLeavesEarlierBytesReachable) {
  Bytes bytes(16);
  for (std::size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<std::uint8_t>(i);
  KXCDataReader reader(bytes.data(), 8, 4);
  EXPECT_EQ(reader.size(), 12u);
  EXPECT_EQ(reader.getUInt32(), 0x07060504u);
  EXPECT_EQ(reader.getUInt32(), 0x0B0A0908u);
  EXPECT_THROW(reader.getByte(), std::out_of_range);  // byte 12 is beyond offset + length
  reader.seekToLocation(0);
  EXPECT_EQ(reader.getByte(), 0);
}

// Every read that runs past the end throws and leaves the position alone.
struct PastEndCase {
  const char* name;
  Bytes bytes;
  std::function<void(KXCDataReader&)> read;
};

class PastEndTest : public testing::TestWithParam<PastEndCase> {};

TEST_P(PastEndTest, ThrowsAndKeepsPosition) {
  const PastEndCase& c = GetParam();
  KXCDataReader reader(c.bytes);
  reader.passBytesLength(1);
  EXPECT_THROW(c.read(reader), std::out_of_range) << c.name;
  EXPECT_EQ(reader.location(), 1u) << c.name;
}

INSTANTIATE_TEST_SUITE_P(
    Reads, PastEndTest,
    testing::Values(
        PastEndCase{"byte", {0x00}, [](KXCDataReader& r) { r.getByte(); }},
        PastEndCase{"uint16", {0x00, 0x01}, [](KXCDataReader& r) { r.getUInt16(); }},
        PastEndCase{"int16", {0x00, 0x01}, [](KXCDataReader& r) { r.getInt16(); }},
        PastEndCase{"uint32", {0, 1, 2, 3}, [](KXCDataReader& r) { r.getUInt32(); }},
        PastEndCase{"int32", {0, 1, 2, 3}, [](KXCDataReader& r) { r.getInt32(); }},
        PastEndCase{"single", {0, 1, 2, 3}, [](KXCDataReader& r) { r.getSingle(); }},
        PastEndCase{"7-bit int cut mid-way", {0, 0x80, 0x80},
                    [](KXCDataReader& r) { r.get7BitEncodedInt(); }},
        PastEndCase{"string prefix cut", {0, 0x80}, [](KXCDataReader& r) { r.getString(); }},
        PastEndCase{"string bytes missing", {0, 0x03, 'a', 'b'},
                    [](KXCDataReader& r) { r.getString(); }},
        // A prefix near 2^31 must fail on the bytes left, not on an allocation.
        PastEndCase{"hostile string prefix", {0, 0xFE, 0xFF, 0xFF, 0xFF, 0x07, 'a'},
                    [](KXCDataReader& r) { r.getString(); }},
        PastEndCase{"raw bytes", {0, 1}, [](KXCDataReader& r) {
                      std::uint8_t out[2];
                      r.getBytes(out, 2);
                    }}));

TEST(KXCDataReaderTest, SeekAndPassBeyondTheEndFailOnlyAtTheNextRead) {
  const Bytes bytes = {1, 2};
  KXCDataReader reader(bytes);
  reader.passBytesLength(5);
  EXPECT_EQ(reader.location(), 5u);
  EXPECT_THROW(reader.getByte(), std::out_of_range);
  reader.passBytesLength(std::numeric_limits<std::uint64_t>::max());  // saturates
  EXPECT_EQ(reader.location(), std::numeric_limits<std::uint64_t>::max());
  EXPECT_THROW(reader.getByte(), std::out_of_range);
  reader.seekToLocation(1);
  EXPECT_EQ(reader.getByte(), 2);
}

struct ReadStringCase {
  const char* name;
  Bytes bytes;
  std::optional<std::string> text;
  std::uint64_t consumed;
};

class ReadStringTest : public testing::TestWithParam<ReadStringCase> {};

TEST_P(ReadStringTest, DecodesOrGivesNone) {
  const ReadStringCase& c = GetParam();
  KXCDataReader reader(c.bytes);
  EXPECT_EQ(reader.getString(), c.text) << c.name;
  EXPECT_EQ(reader.location(), c.consumed) << c.name;
}

INSTANTIATE_TEST_SUITE_P(
    Strings, ReadStringTest,
    testing::Values(
        ReadStringCase{"empty is not none", {0x00, 'x'}, std::string(), 1},
        ReadStringCase{"e acute", {0x02, 0xC3, 0xA9}, std::string("\xC3\xA9"), 3},
        ReadStringCase{"malformed prefix", {0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 'a'}, std::nullopt, 5},
        ReadStringCase{"prefix of 2^31", {0x80, 0x80, 0x80, 0x80, 0x08, 'a'}, std::nullopt, 5},
        ReadStringCase{"invalid UTF-8 is consumed", {0x02, 0xC3, 0x28, 'z'}, std::nullopt, 3},
        ReadStringCase{"NUL inside is kept", {0x03, 'a', 0x00, 'b'}, std::string("a\0b", 3), 4}));

TEST(KXCDataReaderTest, WriterRoundTripOverBoundaries) {
  KXCDataWriter writer;
  std::vector<std::uint32_t> values;
  for (int bits = 0; bits < 32; ++bits) {
    const std::uint32_t power = std::uint32_t{1} << bits;
    for (const std::uint32_t v : {power - 1, power, power + 1}) values.push_back(v);
  }
  const std::vector<std::string> texts = {"", "a", std::string(127, 'b'), std::string(128, 'c'),
                                          "Stra\xC3\x9F" "e", std::string(16384, 'd')};
  for (const std::uint32_t v : values) {
    writer.write7BitEncodedInt(v);
    writer.writeUInt32(v);
  }
  for (const std::string& text : texts) writer.writeString(text);
  for (const float f : {0.0f, -0.0f, 1.5f, -3.25e-12f, std::numeric_limits<float>::infinity()}) {
    writer.writeSingle(f);
  }
  KXCDataReader reader(writer.sharedData());
  for (const std::uint32_t v : values) {
    EXPECT_EQ(static_cast<std::uint32_t>(reader.get7BitEncodedInt()), v);
    EXPECT_EQ(reader.getUInt32(), v);
  }
  for (const std::string& text : texts) EXPECT_EQ(reader.getString(), text);
  EXPECT_EQ(reader.getSingle(), 0.0f);
  EXPECT_TRUE(std::signbit(reader.getSingle()));
  EXPECT_EQ(reader.getSingle(), 1.5f);
  EXPECT_EQ(reader.getSingle(), -3.25e-12f);
  EXPECT_EQ(reader.getSingle(), std::numeric_limits<float>::infinity());
  EXPECT_EQ(reader.location(), writer.data().size());
}

TEST(KXCDataReaderTest, EmptyAndNullBuffersReadNothing) {
  KXCDataReader null(nullptr, 0);
  EXPECT_THROW(null.getByte(), std::out_of_range);
  KXCDataReader shared(std::shared_ptr<const KXCDataReader::Buffer>{});
  EXPECT_THROW(shared.getString(), std::out_of_range);
  std::uint8_t unused = 0;
  shared.getBytes(&unused, 0);  // zero bytes at the end are fine
  EXPECT_EQ(shared.location(), 0u);
}

}  // namespace
