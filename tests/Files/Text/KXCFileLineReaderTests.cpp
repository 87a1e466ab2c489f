#include "kxacore/Files/Text/KXCFileLineReader.h"

#include <gtest/gtest.h>

#include "tests/Files/Text/KXCTextTestSupport.h"

namespace {

struct LineCase {
  std::string name;
  std::string bytes;
  KXCStringEncoding encoding;
  std::vector<std::string> lines;
};

class FileLineReaderTest : public testing::TestWithParam<LineCase> {};

std::vector<std::string> readAll(KXCFileLineReader& reader) {
  std::vector<std::string> lines;
  while (auto line = reader.readLine()) lines.push_back(std::move(*line));
  return lines;
}

TEST_P(FileLineReaderTest, ReadsEachLineWithoutItsLineEnd) {
  const LineCase& c = GetParam();
  const KXCScratchFile file("line-reader-" + c.name + ".txt", c.bytes);
  const auto reader = KXCFileLineReader::withFilePath(file.path(), c.encoding);
  ASSERT_TRUE(reader);
  EXPECT_EQ(readAll(*reader), c.lines);
  EXPECT_TRUE(reader->atEndOfFile());
  EXPECT_EQ(reader->readLine(), std::nullopt);  // stays at the end
  EXPECT_EQ(reader->bufferCapacity(), 0u);      // freed at the end
}

INSTANTIATE_TEST_SUITE_P(
    Cases, FileLineReaderTest,
    testing::Values(LineCase{"crlf", "abc\r\ndef\n", kKXCUTF8StringEncoding, {"abc", "def"}},
                    LineCase{"empty-line", "a\n\nb\n", kKXCUTF8StringEncoding, {"a", "", "b"}},
                    LineCase{"lone-cr", "a\rb\r\r\n", kKXCUTF8StringEncoding, {"a\rb\r"}},
                    LineCase{"no-final-lf", "a\nlast", kKXCUTF8StringEncoding, {"a", "last"}},
                    LineCase{"only-lf", "\n", kKXCUTF8StringEncoding, {""}},
                    LineCase{"empty-file", "", kKXCUTF8StringEncoding, {}},
                    LineCase{"nul-ends-line", std::string("ab\0cd\nx\n", 8), kKXCUTF8StringEncoding, {"ab", "x"}},
                    LineCase{"latin1", "M\xFCller\n", kKXCISOLatin1StringEncoding, {"M\xC3\xBCller"}},
                    LineCase{"ansel", "\xE2" "e\n\xE8", kKXCANSELStringEncoding, {kxcUTF8({'e', 0x301}), kxcUTF8({0x308})}},
                    // Exactly filling the first buffer, then spanning several growths.
                    LineCase{"long", std::string(98, 'x') + "\n" + std::string(5000, 'y') + "\r\nz",
                             kKXCUTF8StringEncoding, {std::string(98, 'x'), std::string(5000, 'y'), "z"}}));

TEST(FileLineReaderGrowthTest, GrowsToTwiceThePreviousSizePlusOneHundred) {
  const KXCScratchFile file("line-reader-growth.txt", "short\n" + std::string(150, 'a') + "\nshort\n");
  const auto reader = KXCFileLineReader::withFilePath(file.path(), kKXCUTF8StringEncoding);
  ASSERT_TRUE(reader);
  EXPECT_EQ(reader->bufferCapacity(), 0u);
  EXPECT_EQ(reader->readLine(), "short");
  EXPECT_EQ(reader->bufferCapacity(), 100u);
  EXPECT_EQ(reader->readLine(), std::string(150, 'a'));
  EXPECT_EQ(reader->bufferCapacity(), 300u);  // 100 * 2 + 100
  EXPECT_EQ(reader->readLine(), "short");
  EXPECT_EQ(reader->bufferCapacity(), 300u);  // kept between lines
}

TEST(FileLineReaderGrowthTest, ALineThatDoesNotDecodeLooksLikeTheEnd) {
  const KXCScratchFile file("line-reader-invalid.txt", "good\nbad \xFF\nafter\n");
  const auto reader = KXCFileLineReader::withFilePath(file.path(), kKXCUTF8StringEncoding);
  ASSERT_TRUE(reader);
  EXPECT_EQ(reader->readLine(), "good");
  EXPECT_EQ(reader->readLine(), std::nullopt);
  EXPECT_FALSE(reader->atEndOfFile());  // how a caller can tell the two apart
  EXPECT_EQ(reader->readLine(), "after");
}

TEST(FileLineReaderGrowthTest, UnopenableFilesAndUnknownEncodingsGiveNoReader) {
  EXPECT_FALSE(KXCFileLineReader::withFilePath("/nonexistent/file.txt", kKXCUTF8StringEncoding));
  EXPECT_FALSE(KXCFileLineReader::withFilePath(testing::TempDir(), kKXCUTF8StringEncoding));
  const KXCScratchFile file("line-reader-unknown.txt", "abc");
  EXPECT_FALSE(KXCFileLineReader::withFilePath(file.path(), 2));
}

}  // namespace
