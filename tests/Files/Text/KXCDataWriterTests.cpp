#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCDataReader.h"
#include "kxacore/Files/Text/KXCDataWriter.h"

namespace {

using Bytes = std::vector<std::uint8_t>;

// The 7-bit integer is the one .NET's BinaryWriter.Write7BitEncodedInt
// writes; these rows are its documented vectors plus the group boundaries.
struct IntegerCase {
  std::uint32_t value;
  Bytes bytes;
};

class SevenBitIntegerTest : public testing::TestWithParam<IntegerCase> {};

TEST_P(SevenBitIntegerTest, MatchesBinaryWriterAndReadsBack) {
  const IntegerCase& c = GetParam();
  KXCDataWriter writer;
  writer.write7BitEncodedInt(c.value);
  EXPECT_EQ(writer.data(), c.bytes) << c.value;
  KXCDataReader reader(writer.data());
  EXPECT_EQ(static_cast<std::uint32_t>(reader.get7BitEncodedInt()), c.value);
  EXPECT_EQ(reader.location(), c.bytes.size());
}

INSTANTIATE_TEST_SUITE_P(
    Vectors, SevenBitIntegerTest,
    testing::Values(IntegerCase{0, {0x00}}, IntegerCase{1, {0x01}}, IntegerCase{127, {0x7F}},
                    IntegerCase{128, {0x80, 0x01}}, IntegerCase{300, {0xAC, 0x02}},
                    IntegerCase{16383, {0xFF, 0x7F}}, IntegerCase{16384, {0x80, 0x80, 0x01}},
                    IntegerCase{2097151, {0xFF, 0xFF, 0x7F}},
                    IntegerCase{2097152, {0x80, 0x80, 0x80, 0x01}},
                    IntegerCase{268435455, {0xFF, 0xFF, 0xFF, 0x7F}},
                    IntegerCase{268435456, {0x80, 0x80, 0x80, 0x80, 0x01}},
                    IntegerCase{0x7FFFFFFF, {0xFF, 0xFF, 0xFF, 0xFF, 0x07}},
                    // -1 passed as its unsigned bit pattern, as BinaryWriter does.
                    IntegerCase{0xFFFFFFFF, {0xFF, 0xFF, 0xFF, 0xFF, 0x0F}}));

TEST(KXCDataWriterTest, EncodedLengthGrowsAtEachSevenBitBoundary) {
  for (int bits = 0; bits < 32; ++bits) {
    const std::uint64_t power = std::uint64_t{1} << bits;
    for (const std::uint64_t value : {power - 1, power, power + 1}) {
      if (value > std::numeric_limits<std::uint32_t>::max()) continue;
      KXCDataWriter writer;
      writer.write7BitEncodedInt(static_cast<std::uint32_t>(value));
      int significant = 0;
      for (std::uint64_t v = value; v != 0; v >>= 1) ++significant;
      const std::size_t expected = significant == 0 ? 1 : (significant + 6) / 7;
      EXPECT_EQ(writer.data().size(), expected) << value;
    }
  }
}

struct StringCase {
  const char* name;
  std::optional<std::string> text;
  Bytes bytes;
};

class WriteStringTest : public testing::TestWithParam<StringCase> {};

TEST_P(WriteStringTest, WritesLengthPrefixedUTF8) {
  const StringCase& c = GetParam();
  KXCDataWriter writer;
  writer.writeString(c.text);
  EXPECT_EQ(writer.data(), c.bytes) << c.name;
}

INSTANTIATE_TEST_SUITE_P(
    Strings, WriteStringTest,
    testing::Values(
        // Where .NET's BinaryWriter.Write(string) agrees:
        StringCase{"empty", std::string(), {0x00}},
        StringCase{"ascii", std::string("ab"), {0x02, 'a', 'b'}},
        StringCase{"e acute", std::string("\xC3\xA9"), {0x02, 0xC3, 0xA9}},
        StringCase{"four-byte character", std::string("\xF0\x9F\x98\x80"),
                   {0x04, 0xF0, 0x9F, 0x98, 0x80}},
        // Where the formats differ: .NET throws on null and writes the NUL;
        // this stream writes 00 for none and cuts at the NUL.
        StringCase{"none", std::nullopt, {0x00}},
        StringCase{"embedded NUL", std::string("ab\0cd", 5), {0x02, 'a', 'b'}},
        StringCase{"leading NUL", std::string("\0x", 2), {0x00}},
        StringCase{"invalid UTF-8", std::string("a\xFF"), {0x00}}));

TEST(KXCDataWriterTest, LongStringTakesTwoBytePrefix) {
  const std::string text(200, 'x');
  KXCDataWriter writer;
  writer.writeString(text);
  ASSERT_EQ(writer.data().size(), 202u);
  EXPECT_EQ(writer.data()[0], 0xC8);
  EXPECT_EQ(writer.data()[1], 0x01);
  EXPECT_EQ(std::string(writer.data().begin() + 2, writer.data().end()), text);
}

TEST(KXCDataWriterTest, FixedWidthValuesAreLittleEndian) {
  KXCDataWriter writer;
  writer.writeByte(0x1FF);  // only the low 8 bits
  writer.writeByte(-1);
  writer.writeUInt32(0x01020304);
  writer.writeSingle(1.5f);
  writer.appendBytes("\x0A\x0B", 2);
  writer.appendBytes(nullptr, 0);
  EXPECT_EQ(writer.data(), (Bytes{0xFF, 0xFF, 0x04, 0x03, 0x02, 0x01, 0x00, 0x00, 0xC0, 0x3F,
                                  0x0A, 0x0B}));
}

TEST(KXCDataWriterTest, AppendsToTheCallersBuffer) {
  auto buffer = std::make_shared<KXCDataWriter::Buffer>(Bytes{0xAA});
  KXCDataWriter writer(buffer);
  writer.writeByte(1);
  EXPECT_EQ(*buffer, (Bytes{0xAA, 0x01}));
  EXPECT_EQ(&writer.data(), buffer.get());
  KXCDataWriter fresh(nullptr);
  fresh.writeByte(2);
  EXPECT_EQ(fresh.data(), Bytes{0x02});
}

}  // namespace
