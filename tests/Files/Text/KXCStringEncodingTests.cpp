#include "kxacore/Files/Text/KXCStringEncoding.h"

#include <gtest/gtest.h>

#include <random>

#include "kxacore/Files/Text/KXCTextFileReader.h"
#include "tests/Files/Text/KXCTextTestSupport.h"

namespace {

// What each ANSEL byte decodes to on its own, stated here rather than taken
// from the library's table.
constexpr char16_t kANSELExpected[256] = {
    0x0000, 0x0001, 0x0002, 0x0003, 0x0004, 0x0005, 0x0006, 0x0007, 0x0008, 0x0009, 0x000A, 0x000B, 0x000C, 0x000D, 0x000E, 0x000F,  // 00
    0x0010, 0x0011, 0x0012, 0x0013, 0x0014, 0x0015, 0x0016, 0x0017, 0x0018, 0x0019, 0x001A, 0x001B, 0x001C, 0x001D, 0x001E, 0x001F,  // 10
    0x0020, 0x0021, 0x0022, 0x0023, 0x0024, 0x0025, 0x0026, 0x0027, 0x0028, 0x0029, 0x002A, 0x002B, 0x002C, 0x002D, 0x002E, 0x002F,  // 20
    0x0030, 0x0031, 0x0032, 0x0033, 0x0034, 0x0035, 0x0036, 0x0037, 0x0038, 0x0039, 0x003A, 0x003B, 0x003C, 0x003D, 0x003E, 0x003F,  // 30
    0x0040, 0x0041, 0x0042, 0x0043, 0x0044, 0x0045, 0x0046, 0x0047, 0x0048, 0x0049, 0x004A, 0x004B, 0x004C, 0x004D, 0x004E, 0x004F,  // 40
    0x0050, 0x0051, 0x0052, 0x0053, 0x0054, 0x0055, 0x0056, 0x0057, 0x0058, 0x0059, 0x005A, 0x005B, 0x005C, 0x005D, 0x005E, 0x005F,  // 50
    0x0060, 0x0061, 0x0062, 0x0063, 0x0064, 0x0065, 0x0066, 0x0067, 0x0068, 0x0069, 0x006A, 0x006B, 0x006C, 0x006D, 0x006E, 0x006F,  // 60
    0x0070, 0x0071, 0x0072, 0x0073, 0x0074, 0x0075, 0x0076, 0x0077, 0x0078, 0x0079, 0x007A, 0x007B, 0x007C, 0x007D, 0x007E, 0x007F,  // 70
    0x0080, 0x0081, 0x0082, 0x0083, 0x0084, 0x0085, 0x0086, 0x0087, 0x0098, 0x009C, 0x008A, 0x008B, 0x008C, 0x200D, 0x200C, 0x008F,  // 80
    0x0090, 0x0091, 0x0092, 0x0093, 0x0094, 0x0095, 0x0096, 0x0097, 0x0098, 0x0099, 0x009A, 0x009B, 0x009C, 0x009D, 0x009E, 0x009F,  // 90
    0x00A0, 0x0141, 0x00D8, 0x0110, 0x00DE, 0x00C6, 0x0152, 0x02B9, 0x00B7, 0x266D, 0x00AE, 0x00B1, 0x01A0, 0x01AF, 0x02BC, 0x00AF,  // A0
    0x02BB, 0x0142, 0x00F8, 0x0111, 0x00FE, 0x00E6, 0x0153, 0x02BA, 0x0131, 0x00A3, 0x00F0, 0x00BB, 0x01A1, 0x01B0, 0x00BE, 0x00BF,  // B0
    0x00B0, 0x2113, 0x2117, 0x00A9, 0x266F, 0x00BF, 0x00A1, 0x00C7, 0x00C8, 0x00C9, 0x00CA, 0x00CB, 0x00CC, 0x00CD, 0x00CE, 0x00DF,  // C0
    0x00D0, 0x00D1, 0x00D2, 0x00D3, 0x00D4, 0x00D5, 0x00D6, 0x00D7, 0x00D8, 0x00D9, 0x00DA, 0x00DB, 0x00DC, 0x00DD, 0x00DE, 0x00DF,  // D0
    0x0309, 0x0300, 0x0301, 0x0302, 0x0303, 0x0304, 0x0306, 0x0307, 0x0308, 0x030C, 0x030A, 0xFE20, 0xFE21, 0x0315, 0x030B, 0x0310,  // E0
    0x0327, 0x0328, 0x0323, 0x0324, 0x0325, 0x0333, 0x0332, 0x0326, 0x031C, 0x032E, 0xFE22, 0xFE23, 0x00FC, 0x00FD, 0x0313, 0x00FF,  // F0
};

bool isANSELMark(unsigned byte) { return (byte >= 0xE0 && byte <= 0xFB) || byte == 0xFE; }

std::string ansel(std::initializer_list<std::uint8_t> bytes) {
  return KXCTextFileReader::stringFromANSELData(std::vector<std::uint8_t>(bytes));
}

TEST(ANSELTest, EveryByteAloneAndBeforeALetter) {
  for (unsigned byte = 0; byte < 256; ++byte) {
    const std::string expected = kxcUTF8({kANSELExpected[byte]});
    const auto b = static_cast<std::uint8_t>(byte);
    EXPECT_EQ(ansel({b}), expected) << "byte " << byte;
    // Followed by a letter: a mark moves after it, anything else stays first.
    EXPECT_EQ(ansel({b, 'x'}), isANSELMark(byte) ? "x" + expected : expected + "x") << "byte " << byte;
  }
}

struct ANSELCase {
  std::vector<std::uint8_t> bytes;
  std::string expected;
};

class ANSELSwapTest : public testing::TestWithParam<ANSELCase> {};

TEST_P(ANSELSwapTest, MovesMarksAfterTheirLetter) {
  EXPECT_EQ(KXCTextFileReader::stringFromANSELData(GetParam().bytes), GetParam().expected);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, ANSELSwapTest,
    testing::Values(ANSELCase{{0xE2, 0x65}, kxcUTF8({'e', 0x301})},
                    ANSELCase{{0xE2, 0x0D}, kxcUTF8({0x301, '\r'})},              // a mark stays before a CR
                    ANSELCase{{0xE1, 0xE2, 0x61}, kxcUTF8({0x301, 'a', 0x300})},  // second mark, letter, first
                    ANSELCase{{0xE1, 0xE2, 0xE3, 0x61}, kxcUTF8({0x301, 0x302, 'a', 0x300})},
                    ANSELCase{{'a', 0xE2}, kxcUTF8({'a', 0x301})},                // a mark at the end stays last
                    ANSELCase{{0xE2, 0x0A}, kxcUTF8({'\n', 0x301})},              // only CR is exempt
                    ANSELCase{{0xE2, 0xCF}, kxcUTF8({0xDF, 0x301})},
                    ANSELCase{{0xFC, 0x65}, kxcUTF8({0xFC, 'e'})},                // 0xFC and 0xFD are no marks
                    ANSELCase{{0xE8, 0x75, 0xE8, 0x6F}, kxcUTF8({'u', 0x308, 'o', 0x308})},
                    ANSELCase{{0xE2, 0x0D, 0x65}, kxcUTF8({0x301, '\r', 'e'})},
                    ANSELCase{{}, ""}));

// Long texts cross the decoder's internal pieces and its ASCII blocks at
// every alignment; the walk over UTF-16 units, written out literally, is the
// oracle.
TEST(ANSELTest, LongTextsMatchTheWalkOverUTF16Units) {
  std::mt19937 random(1537);
  for (const int highPercent : {1, 10, 60}) {
    std::vector<std::uint8_t> bytes(20000);
    for (auto& byte : bytes) {
      byte = static_cast<int>(random() % 100) < highPercent ? static_cast<std::uint8_t>(0x80 + random() % 128)
                                                             : static_cast<std::uint8_t>(random() % 128);
    }
    std::vector<char16_t> units(bytes.size());
    for (std::size_t i = 0; i < bytes.size(); ++i) {
      units[i] = kANSELExpected[bytes[i]];
      if (i > 0 && isANSELMark(bytes[i - 1]) && bytes[i] != 0x0D) std::swap(units[i], units[i - 1]);
    }
    std::string expected;
    for (const char16_t unit : units) expected += kxcUTF8({unit});
    EXPECT_EQ(KXCTextFileReader::stringFromANSELData(bytes), expected) << highPercent << "% high bytes";
  }
}

// Decoding in pieces must give the bytes of decoding whole, for every
// encoding; random texts mix the bytes that hold state (marks, lead bytes,
// surrogates, CR) with ordinary ones.
TEST(KXCTextDecoderTest, ChunkBoundariesNeverChangeTheOutput) {
  std::mt19937 random(20261123);
  const std::uint8_t interesting[] = {0x00, 0x0D, 0x0A, 'a', 0x7F, 0x80, 0x81, 0xBF, 0xC2, 0xC3, 0xDF, 0xE0,
                                      0xE2, 0xED, 0xEF, 0xF0, 0xF4, 0xFE, 0xFF, 0xD8, 0xDC, 0xA0, 0x9F, 0x8D};
  std::vector<KXCStringEncoding> encodings;
  for (const KXCStringEncodingInfo& info : KXCAvailableStringEncodings()) encodings.push_back(info.number);
  encodings.push_back(kKXCANSELStringEncoding);
  for (const KXCStringEncoding encoding : encodings) {
    for (int round = 0; round < 40; ++round) {
      std::vector<std::uint8_t> bytes(random() % 64);
      for (auto& byte : bytes) {
        byte = random() % 2 ? interesting[random() % sizeof interesting] : static_cast<std::uint8_t>(random());
      }
      auto whole = KXCTextDecoder::decoderForEncoding(encoding);
      ASSERT_TRUE(whole) << encoding;
      std::string expected;
      whole->decode(bytes, expected);
      whole->finish(expected);
      auto pieces = KXCTextDecoder::decoderForEncoding(encoding);
      std::string actual;
      for (std::size_t pos = 0; pos < bytes.size();) {
        const std::size_t length = std::min<std::size_t>(random() % 5, bytes.size() - pos);
        pieces->decode(std::span(bytes).subspan(pos, length), actual);
        pos += length;
      }
      pieces->finish(actual);
      ASSERT_EQ(actual, expected) << "encoding " << encoding << ", round " << round;
      EXPECT_EQ(pieces->invalidSequences(), whole->invalidSequences()) << encoding;
    }
  }
}

struct DecodeCase {
  KXCStringEncoding encoding;
  std::string bytes;
  std::string expected;  // with U+FFFD for each invalid sequence
  std::uint64_t invalid;
};

class DecodeTest : public testing::TestWithParam<DecodeCase> {};

TEST_P(DecodeTest, DecodesAndCountsInvalidSequences) {
  const DecodeCase& c = GetParam();
  auto decoder = KXCTextDecoder::decoderForEncoding(c.encoding);
  ASSERT_TRUE(decoder);
  std::string out;
  decoder->decode(kxcBytes(c.bytes), out);
  decoder->finish(out);
  EXPECT_EQ(out, c.expected);
  EXPECT_EQ(decoder->invalidSequences(), c.invalid);
  const auto strict = KXCDecodeString(kxcBytes(c.bytes), c.encoding);
  EXPECT_EQ(strict.has_value(), c.invalid == 0);
  if (strict) {
    EXPECT_EQ(*strict, c.expected);
  }
}

const std::string kFFFD = "\xEF\xBF\xBD";

INSTANTIATE_TEST_SUITE_P(
    UTF8, DecodeTest,
    testing::Values(
        DecodeCase{kKXCUTF8StringEncoding, "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80", "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80", 0},
        DecodeCase{kKXCUTF8StringEncoding, "\xEF\xBB\xBFx", "\xEF\xBB\xBFx", 0},  // the BOM stays
        DecodeCase{kKXCUTF8StringEncoding, std::string("a\0b", 3), std::string("a\0b", 3), 0},
        DecodeCase{kKXCUTF8StringEncoding, "\xC0\xAF", kFFFD + kFFFD, 2},          // overlong
        DecodeCase{kKXCUTF8StringEncoding, "\xED\xA0\x80", kFFFD + kFFFD + kFFFD, 3},  // surrogate
        DecodeCase{kKXCUTF8StringEncoding, "\xF4\x90\x80\x80", kFFFD + kFFFD + kFFFD + kFFFD, 4},  // > U+10FFFF
        DecodeCase{kKXCUTF8StringEncoding, "\xE2\x82x", kFFFD + "x", 1},           // maximal subpart
        DecodeCase{kKXCUTF8StringEncoding, "ok\xE2\x82", "ok" + kFFFD, 1},        // cut at the end
        DecodeCase{kKXCUTF8StringEncoding, "\xFF", kFFFD, 1}));

INSTANTIATE_TEST_SUITE_P(
    SingleByte, DecodeTest,
    testing::Values(
        DecodeCase{kKXCASCIIStringEncoding, "a\x7F\x80", "a\x7F" + kFFFD, 1},
        DecodeCase{kKXCISOLatin1StringEncoding, "\xE9\xFF\x80", kxcUTF8({0xE9, 0xFF, 0x80}), 0},
        DecodeCase{kKXCWindowsCP1252StringEncoding, "\x80\x9F\xE9", kxcUTF8({0x20AC, 0x178, 0xE9}), 0},
        // The five bytes the code page leaves undefined.
        DecodeCase{kKXCWindowsCP1252StringEncoding, "\x81\x8D\x8F\x90\x9D", kFFFD + kFFFD + kFFFD + kFFFD + kFFFD, 5},
        DecodeCase{kKXCMacOSRomanStringEncoding, "\x8E\x9F\xA5", kxcUTF8({0xE9, 0xFC, 0x2022}), 0},
        DecodeCase{kKXCDOSLatinUSStringEncoding, "\x81\x84\xE1", kxcUTF8({0xFC, 0xE4, 0xDF}), 0},
        DecodeCase{kKXCDOSLatin1StringEncoding, "\x81\x9B", kxcUTF8({0xFC, 0xF8}), 0},
        DecodeCase{kKXCWindowsCP1251StringEncoding, "\xC0\xFF", kxcUTF8({0x410, 0x44F}), 0},
        DecodeCase{kKXCWindowsCP1250StringEncoding, "\x8A\xB9", kxcUTF8({0x160, 0x105}), 0},
        DecodeCase{kKXCISOLatin2StringEncoding, "\xA1\xB1", kxcUTF8({0x104, 0x105}), 0},
        DecodeCase{kKXCISOLatin9StringEncoding, "\xA4", kxcUTF8({0x20AC}), 0}));

INSTANTIATE_TEST_SUITE_P(
    UTF16, DecodeTest,
    testing::Values(
        DecodeCase{kKXCUnicodeStringEncoding, std::string("\xFF\xFE" "a\0\x3D\xD8\x00\xDE", 8), kxcUTF8({'a', 0x1F600}), 0},
        DecodeCase{kKXCUnicodeStringEncoding, std::string("\xFE\xFF\0a", 4), "a", 0},
        DecodeCase{kKXCUnicodeStringEncoding, std::string("\0a", 2), "a", 0},  // big-endian without a BOM
        DecodeCase{kKXCUTF16LittleEndianStringEncoding, std::string("a\0\x00\xDC", 4), "a" + kFFFD, 1},
        DecodeCase{kKXCUTF16BigEndianStringEncoding, std::string("\0a\0", 3), "a" + kFFFD, 1}));

TEST(StringEncodingTest, MacRomanDefinesEveryByte) {
  // The trial order relies on it: nothing after Mac Roman is ever guessed.
  std::vector<std::uint8_t> all(256);
  for (unsigned byte = 0; byte < 256; ++byte) all[byte] = static_cast<std::uint8_t>(byte);
  EXPECT_TRUE(KXCDecodeString(all, kKXCMacOSRomanStringEncoding));
  EXPECT_TRUE(KXCDecodeString(all, kKXCISOLatin1StringEncoding));
  EXPECT_TRUE(KXCDecodeString(all, kKXCANSELStringEncoding));
}

TEST(StringEncodingTest, TrialOrderIsStrictFirstLatin1Last) {
  const auto list = KXCAvailableStringEncodings();
  ASSERT_GE(list.size(), 4u);
  EXPECT_EQ(list[0].number, kKXCASCIIStringEncoding);
  EXPECT_EQ(list[1].number, kKXCUTF8StringEncoding);
  EXPECT_EQ(list.back().number, kKXCISOLatin1StringEncoding);
  const auto position = [&](KXCStringEncoding encoding) {
    return std::find_if(list.begin(), list.end(), [&](const auto& info) { return info.number == encoding; }) -
           list.begin();
  };
  EXPECT_LT(position(kKXCWindowsCP1252StringEncoding), position(kKXCMacOSRomanStringEncoding));
  EXPECT_EQ(position(kKXCANSELStringEncoding), static_cast<std::ptrdiff_t>(list.size()));  // never guessed
  for (const auto& info : list) EXPECT_TRUE(KXCTextDecoder::decoderForEncoding(info.number)) << info.name;
}

TEST(StringEncodingTest, UTF16IsTriedOnlyAfterAByteOrderMark) {
  const std::vector<std::uint8_t> little = {0xFF, 0xFE, 'a', 0};
  const std::vector<std::uint8_t> big = {0xFE, 0xFF, 0, 'a'};
  const std::vector<std::uint8_t> none = {0, 'a'};
  EXPECT_TRUE(KXCStringEncodingIsTriable(kKXCUnicodeStringEncoding, little));
  EXPECT_TRUE(KXCStringEncodingIsTriable(kKXCUnicodeStringEncoding, big));
  EXPECT_FALSE(KXCStringEncodingIsTriable(kKXCUnicodeStringEncoding, none));
  EXPECT_TRUE(KXCStringEncodingIsTriable(kKXCUTF16LittleEndianStringEncoding, little));
  EXPECT_FALSE(KXCStringEncodingIsTriable(kKXCUTF16LittleEndianStringEncoding, big));
  EXPECT_FALSE(KXCStringEncodingIsTriable(kKXCANSELStringEncoding, none));
  EXPECT_TRUE(KXCStringEncodingIsTriable(kKXCWindowsCP1252StringEncoding, none));
}

struct NameCase {
  std::string name;
  std::optional<KXCStringEncoding> expected;
};

class EncodingNameTest : public testing::TestWithParam<NameCase> {};

TEST_P(EncodingNameTest, ResolvesNamesAliasesAndNumbers) {
  EXPECT_EQ(KXCStringEncodingFromName(GetParam().name), GetParam().expected);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, EncodingNameTest,
    testing::Values(NameCase{"utf-8", kKXCUTF8StringEncoding}, NameCase{"UTF8", kKXCUTF8StringEncoding},
                    NameCase{"latin1", kKXCISOLatin1StringEncoding}, NameCase{"ISO-8859-1", kKXCISOLatin1StringEncoding},
                    NameCase{"cp1252", kKXCWindowsCP1252StringEncoding},
                    NameCase{"Windows_1252", kKXCWindowsCP1252StringEncoding},
                    NameCase{"ANSI", kKXCWindowsCP1252StringEncoding}, NameCase{"IBMPC", kKXCDOSLatinUSStringEncoding},
                    NameCase{"ansel", kKXCANSELStringEncoding}, NameCase{"1537", kKXCANSELStringEncoding},
                    NameCase{"30", kKXCMacOSRomanStringEncoding}, NameCase{"MacRoman", kKXCMacOSRomanStringEncoding},
                    NameCase{"0x94000100", kKXCUTF16LittleEndianStringEncoding},
                    NameCase{"unicode", kKXCUnicodeStringEncoding},
                    NameCase{"2", std::nullopt},  // a platform number this library does not decode
                    NameCase{"", std::nullopt}, NameCase{"klingon", std::nullopt}, NameCase{"-4", std::nullopt},
                    NameCase{"99999999999999999999999", std::nullopt}));

TEST(StringEncodingTest, EveryListedNameResolvesToItsNumber) {
  for (const auto& info : KXCAvailableStringEncodings()) {
    EXPECT_EQ(KXCStringEncodingFromName(info.name), info.number) << info.name;
    EXPECT_EQ(KXCStringEncodingFromName(std::to_string(info.number)), info.number) << info.name;
  }
}

TEST(StringEncodingTest, UnknownEncodingsGiveNothing) {
  EXPECT_FALSE(KXCTextDecoder::decoderForEncoding(2));
  EXPECT_FALSE(KXCDecodeString(kxcBytes("a"), 2));
  EXPECT_FALSE(KXCStringEncodingInfoFor(2));
}

}  // namespace
