#include "kxacore/Files/Text/KXCTextFileReader.h"

#include <gtest/gtest.h>

#include "tests/Files/Text/KXCTextTestSupport.h"

namespace {

struct FallbackCase {
  std::string name;
  std::string bytes;
  KXCStringEncoding requested;
  KXCStringEncoding used;
  std::vector<std::string> lines;
};

class TextFileFallbackTest : public testing::TestWithParam<FallbackCase> {};

TEST_P(TextFileFallbackTest, UsesTheFirstEncodingThatDecodes) {
  const FallbackCase& c = GetParam();
  const KXCScratchFile file("text-reader-" + c.name + ".txt", c.bytes);
  const auto reader = KXCTextFileReader::withFilePath(file.path(), c.requested);
  ASSERT_TRUE(reader);
  EXPECT_EQ(reader->encoding(), c.used);
  EXPECT_EQ(reader->lines(), c.lines);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, TextFileFallbackTest,
    testing::Values(
        FallbackCase{"fits", "caf\xC3\xA9\n", kKXCUTF8StringEncoding, kKXCUTF8StringEncoding, {"caf\xC3\xA9"}},
        // UTF-8 asked for as ASCII: ASCII fails, UTF-8 is next.
        FallbackCase{"utf8-as-ascii", "J\xC3\xBCrgen", kKXCASCIIStringEncoding, kKXCUTF8StringEncoding, {"J\xC3\xBCrgen"}},
        FallbackCase{"cp1252-as-utf8", "\xC6gir \x96 \xF0", kKXCUTF8StringEncoding, kKXCWindowsCP1252StringEncoding,
                     {kxcUTF8({0xC6, 'g', 'i', 'r', ' ', 0x2013, ' ', 0xF0})}},
        // 0x81 is undefined in Windows-1252, so a DOS file lands on Mac Roman, which takes every byte.
        FallbackCase{"dos-as-utf8", "M\x81ller", kKXCUTF8StringEncoding, kKXCMacOSRomanStringEncoding,
                     {kxcUTF8({'M', 0xC5, 'l', 'l', 'e', 'r'})}},
        FallbackCase{"utf16-bom", std::string("\xFF\xFE" "a\0\n\0b\0", 8), kKXCUTF8StringEncoding,
                     kKXCUnicodeStringEncoding, {"a", "b"}},
        // Asked for by name, UTF-16 needs no BOM.
        FallbackCase{"utf16-asked", std::string("\0a\0\r\0\n\0b", 8), kKXCUnicodeStringEncoding,
                     kKXCUnicodeStringEncoding, {"a", "b"}},
        FallbackCase{"ansel", "\xE2" "e\r\xE8u", kKXCANSELStringEncoding, kKXCANSELStringEncoding,
                     {kxcUTF8({'e', 0x301}), kxcUTF8({'u', 0x308})}},
        FallbackCase{"line-ends", "a\r\nb\rc\nd\xE2\x80\xA8" "e\n\nf", kKXCUTF8StringEncoding, kKXCUTF8StringEncoding,
                     {"a", "b", "c", "d", "e", "", "f"}},
        FallbackCase{"empty", "", kKXCUTF8StringEncoding, kKXCUTF8StringEncoding, {}}));

TEST(TextFileReaderTest, ReadsLinesInOrderAndByIndex) {
  const KXCScratchFile file("text-reader-lines.txt", "one\ntwo\nthree\n");
  const auto reader = KXCTextFileReader::withFilePath(file.path(), kKXCUTF8StringEncoding);
  ASSERT_TRUE(reader);
  EXPECT_EQ(reader->lineCount(), 3u);
  EXPECT_EQ(reader->lineAtIndex(2), "three");
  EXPECT_EQ(reader->lineAtIndex(3), std::nullopt);
  EXPECT_EQ(reader->readLine(), "one");
  EXPECT_EQ(reader->readLine(), "two");
  EXPECT_EQ(reader->lineNum(), 2u);
  EXPECT_EQ(reader->readLine(), "three");
  EXPECT_EQ(reader->readLine(), std::nullopt);
  EXPECT_EQ(reader->lineNum(), 3u);  // stays at the end
  reader->reset();
  EXPECT_EQ(reader->readLine(), "one");
}

TEST(TextFileReaderTest, UnreadableFilesAndUnknownEncodingsGiveNoReader) {
  EXPECT_FALSE(KXCTextFileReader::withFilePath("/nonexistent/file.txt", kKXCUTF8StringEncoding));
  EXPECT_FALSE(KXCTextFileReader::withFilePath(testing::TempDir(), kKXCUTF8StringEncoding));
  const KXCScratchFile file("text-reader-unknown.txt", "abc");
  EXPECT_FALSE(KXCTextFileReader::withFilePath(file.path(), 2));
}

// The ANSEL GEDCOM files of the shared data set are not checked in (their
// licences vary); what is checked in is the digest of the decoded text and a
// few lines with diacritics, verified against the file's own descriptions of
// each code and by a separate decoder written for the purpose.
std::filesystem::path sharedGedcom(const char* name) {
  return std::filesystem::path(KXA_SOURCE_DIR) / ".." / "shared" / "data" / "gedcom" / name;
}

std::string withMark(std::string_view letters, char32_t mark) {
  std::string out;
  for (const char letter : letters) out += kxcUTF8({static_cast<char32_t>(letter), mark});
  return out;
}

TEST(TextFileReaderTest, DecodesTheANSELTortureTestFile) {
  const auto path = sharedGedcom("TGC55C.ged");
  if (!std::filesystem::exists(path)) GTEST_SKIP() << "no shared data at " << path;
  const auto reader = KXCTextFileReader::withFilePath(path, kKXCANSELStringEncoding);
  ASSERT_TRUE(reader);
  ASSERT_EQ(reader->lineCount(), 2197u);  // CR line ends
  EXPECT_EQ(reader->lineAtIndex(27), kxcUTF8({'1', ' ', 'C', 'O', 'P', 'R', ' ', 0xA9}) +
                                         " 1997 by H. Eichmann, parts " + kxcUTF8({0xA9}) + " 1999-2000 by J. A. Nairn.");
  EXPECT_EQ(reader->lineAtIndex(1850), "1 CONT      " + withMark("ABCDEFGHIJKLM", 0x309));  // E0 hook above
  EXPECT_EQ(reader->lineAtIndex(1900), "1 CONT      " + withMark("abcdefghijklm", 0x308));  // E8 diaeresis
  EXPECT_EQ(reader->lineAtIndex(2033), "1 CONT A1 slash l - uppercase (" + kxcUTF8({0x141}) + ")");
  EXPECT_EQ(reader->lineAtIndex(2046), "1 CONT AE left half ring (" + kxcUTF8({0x2BC}) + ")");
  EXPECT_EQ(reader->lineAtIndex(2071), "1 CONT CF es zet (" + kxcUTF8({0xDF}) + ")");

  std::ifstream in(path, std::ios::binary);
  const std::string bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  const std::string decoded = KXCTextFileReader::stringFromANSELData(kxcBytes(bytes));
  EXPECT_EQ(kxcSHA256(decoded), "6a7c78010eef4d03ef99a93ec1af60cb6ebbda06c0004c66f8019863dbc5f9fd");
}

TEST(TextFileReaderTest, ANSELWithoutEightBitBytesIsUnchanged) {
  const auto path = sharedGedcom("royal92.ged");
  if (!std::filesystem::exists(path)) GTEST_SKIP() << "no shared data at " << path;
  std::ifstream in(path, std::ios::binary);
  const std::string bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  EXPECT_EQ(KXCTextFileReader::stringFromANSELData(kxcBytes(bytes)), bytes);
}

}  // namespace
