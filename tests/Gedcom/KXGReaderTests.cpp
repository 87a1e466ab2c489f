// KXGReader: line ends and chunking, continuations, character sets and
// their contradictions, and input that is not GEDCOM at all.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "kxacore/Gedcom/KXGReader.h"

namespace {

struct Collected {
  std::vector<std::string> lines;  // "number level xref tag value" per record line
  std::vector<std::string> codes;
  KXCStringEncoding encoding = 0;
  std::uint64_t lineCount = 0;
};

struct Collector final : KXGReaderDelegate {
  Collected* out;
  explicit Collector(Collected* target) : out(target) {}
  void readerDidReadRecord(KXGReader&, const KXGRecord& record) override {
    for (const KXGLine& line : record.lines()) {
      out->lines.push_back(std::to_string(line.number) + " " + std::to_string(line.level) + " " +
                           line.xref + (line.xref.empty() ? "" : " ") + line.tag + "|" + line.value);
    }
  }
  void readerDidFindProblem(KXGReader&, const KXGFinding& finding) override {
    out->codes.push_back(std::to_string(finding.line) + ":" + finding.code);
  }
};

// Reads `bytes` in chunks of `chunk` bytes (0: all at once).
Collected read(const std::string& bytes, std::size_t chunk = 0) {
  Collected result;
  Collector collector(&result);
  KXGReader reader(&collector);
  const auto* data = reinterpret_cast<const std::uint8_t*>(bytes.data());
  if (chunk == 0) chunk = bytes.size() + 1;
  for (std::size_t pos = 0; pos < bytes.size(); pos += chunk) {
    reader.appendBytes({data + pos, std::min(chunk, bytes.size() - pos)});
  }
  reader.finish();
  result.encoding = reader.encoding();
  result.lineCount = reader.lineCount();
  return result;
}

std::string valueOf(const Collected& collected, const std::string& tag) {
  for (const std::string& line : collected.lines) {
    const std::size_t bar = line.find('|');
    if (line.substr(0, bar).ends_with(" " + tag)) return line.substr(bar + 1);
  }
  return "<none>";
}

TEST(KXGReaderTest, LineEndsAndChunkBoundariesNeverChangeTheRecords) {
  const std::string lf = "0 HEAD\n1 CHAR UTF-8\n0 @I1@ INDI\n1 NAME J\xC3\xBCrgen /M\xC3\xBCller/\n0 TRLR\n";
  const Collected expected = read(lf);
  ASSERT_EQ(expected.lines.size(), 5u);
  EXPECT_EQ(expected.lines[2], "3 0 @I1@ INDI|");
  EXPECT_EQ(expected.lines[3], "4 1 NAME|J\xC3\xBC" "rgen /M\xC3\xBCller/");
  for (const char* end : {"\r\n", "\r", "\n"}) {
    std::string text;
    for (const char c : lf) {
      if (c == '\n') {
        text += end;
      } else {
        text.push_back(c);
      }
    }
    for (const std::size_t chunk : {0, 1, 2, 3, 7}) {
      const Collected got = read(text, chunk);
      EXPECT_EQ(got.lines, expected.lines) << "chunk " << chunk;
      EXPECT_TRUE(got.codes.empty()) << "chunk " << chunk;
      EXPECT_EQ(got.lineCount, 5u);
    }
  }
  // No final line end: the last line still counts.
  EXPECT_EQ(read("0 HEAD\n0 TRLR").lines.back(), "2 0 TRLR|");
}

TEST(KXGReaderTest, ContinuationsJoinIntoTheLineAbove) {
  const Collected got = read(
      "0 @N1@ NOTE First\n1 CONC  part\n1 CONT second line\n1 CONT\n1 CONC end\n"
      "0 @I1@ INDI\n1 BIRT\n2 PLAC Rome, \n3 CONC Italy\n2 DATE 1850\n");
  EXPECT_EQ(valueOf(got, "NOTE"), "First part\nsecond line\nend");
  EXPECT_EQ(valueOf(got, "PLAC"), "Rome, Italy");
  EXPECT_EQ(valueOf(got, "DATE"), "1850");
  EXPECT_TRUE(got.codes.empty());
}

TEST(KXGReaderTest, MalformedLinesAreReportedWithTheirNumberAndReadPast) {
  const struct {
    std::string line;
    std::string code;
    bool kept;
  } rows[] = {
      {"", "line-blank", false},
      {"   ", "line-blank", false},
      {"  1 SEX M", "line-leading-space", true},
      {"1  SEX M", "line-extra-space", true},
      {"1\tSEX M", "line-extra-space", true},
      {"X SEX M", "line-malformed-level", false},
      {"-1 SEX M", "line-malformed-level", false},
      {"123 SEX M", "line-malformed-level", false},
      {"1SEX M", "line-malformed-level", false},
      {"1", "line-missing-tag", false},
      {"1 @X@", "line-missing-tag", false},
      {"1 SE.X M", "line-malformed-tag", true},
      {"1 @X SEX M", "line-malformed-id", true},
      {"1 @@ SEX M", "line-malformed-id", true},
      {"3 SEX M", "line-level-jump", true},
      {"1 SEX " + std::string(260, 'M'), "line-too-long", true},
  };
  for (const auto& row : rows) {
    const Collected got = read("0 @I1@ INDI\n" + row.line + "\n1 NAME A /B/\n");
    EXPECT_EQ(got.codes, std::vector<std::string>{"2:" + row.code}) << "[" << row.line << "]";
    EXPECT_EQ(got.lines.size(), row.kept ? 3u : 2u) << "[" << row.line << "]";
    EXPECT_EQ(got.lines.back(), "3 1 NAME|A /B/") << "[" << row.line << "]";
  }
  // A line below no record is dropped.
  EXPECT_EQ(read("1 NAME A\n0 TRLR\n").codes, std::vector<std::string>{"1:line-level-jump"});
}

TEST(KXGReaderTest, ALineOfAnyLengthKeepsMemoryBounded) {
  // 3 MiB without a line end: one line, its first kMaxLineBytes kept.
  const std::string huge = "0 @N1@ NOTE " + std::string(3 << 20, 'x');
  for (const std::size_t chunk : {0, 65536}) {
    const Collected got = read(huge, chunk);
    EXPECT_EQ(got.lineCount, 1u);
    EXPECT_EQ(got.codes, std::vector<std::string>{"1:line-too-long"});
    ASSERT_EQ(got.lines.size(), 1u);
    EXPECT_EQ(got.lines[0].size() - got.lines[0].find('|') - 1, KXGReader::kMaxLineBytes - 12);
  }
}

TEST(KXGReaderTest, EmptyAndBinaryInput) {
  const Collected empty = read("");
  EXPECT_TRUE(empty.lines.empty());
  EXPECT_TRUE(empty.codes.empty());
  EXPECT_EQ(empty.lineCount, 0u);

  std::string binary(1000, '\0');
  for (std::size_t i = 0; i < binary.size(); ++i) binary[i] = static_cast<char>(i * 131 % 256);
  for (const std::size_t chunk : {0, 3}) {
    const Collected got = read(binary, chunk);
    EXPECT_FALSE(got.codes.empty());
  }
}

// "1 NAME Jürgen" in each character set, with the header that declares it.
struct CharsetRow {
  const char* name;
  std::string bytes;
  KXCStringEncoding encoding;
};

std::string header(const std::string& charset, const std::string& nameLine) {
  return "0 HEAD\r\n1 CHAR " + charset + "\r\n0 @I1@ INDI\r\n" + nameLine + "\r\n0 TRLR\r\n";
}

// UTF-8 text of one- and two-byte sequences as UTF-16.
std::string utf16From(const std::string& utf8, bool little) {
  std::string out;
  for (std::size_t i = 0; i < utf8.size(); ++i) {
    unsigned unit = static_cast<unsigned char>(utf8[i]);
    if (unit >= 0xC0) unit = ((unit & 0x1F) << 6) | (static_cast<unsigned char>(utf8[++i]) & 0x3F);
    const char high = static_cast<char>(unit >> 8);
    const char low = static_cast<char>(unit & 0xFF);
    out.push_back(little ? low : high);
    out.push_back(little ? high : low);
  }
  return out;
}

std::string utf16Juergen(bool little, bool bom) {
  const std::string mark = little ? "\xFF\xFE" : "\xFE\xFF";
  return (bom ? mark : "") + utf16From(header("UNICODE", "1 NAME J\xC3\xBCrgen"), little);
}

TEST(KXGReaderTest, EveryCharacterSetDecodesAKnownLine) {
  const std::vector<CharsetRow> rows = {
      {"ANSEL", header("ANSEL", "1 NAME J\xE8urgen"), kKXCANSELStringEncoding},
      {"UTF-8", header("UTF-8", "1 NAME J\xC3\xBCrgen"), kKXCUTF8StringEncoding},
      {"UTF8 with BOM", "\xEF\xBB\xBF" + header("UTF8", "1 NAME J\xC3\xBCrgen"), kKXCUTF8StringEncoding},
      {"ANSI", header("ANSI", "1 NAME J\xFCrgen"), kKXCWindowsCP1252StringEncoding},
      {"WINDOWS-1252", header("windows-1252", "1 NAME J\xFCrgen"), kKXCWindowsCP1252StringEncoding},
      {"LATIN1", header("ISO-8859-1", "1 NAME J\xFCrgen"), kKXCISOLatin1StringEncoding},
      {"IBMPC", header("IBMPC", "1 NAME J\x81rgen"), kKXCDOSLatinUSStringEncoding},
      {"IBM PC", header("IBM PC", "1 NAME J\x81rgen"), kKXCDOSLatinUSStringEncoding},
      {"MACINTOSH", header("MACINTOSH", "1 NAME J\x9Frgen"), kKXCMacOSRomanStringEncoding},
      {"UTF-16LE with BOM", utf16Juergen(true, true), kKXCUTF16LittleEndianStringEncoding},
      {"UTF-16BE with BOM", utf16Juergen(false, true), kKXCUTF16BigEndianStringEncoding},
      {"UTF-16LE without BOM", utf16Juergen(true, false), kKXCUTF16LittleEndianStringEncoding},
      {"UTF-16BE without BOM", utf16Juergen(false, false), kKXCUTF16BigEndianStringEncoding},
  };
  for (const CharsetRow& row : rows) {
    for (const std::size_t chunk : {0, 1, 5}) {
      const Collected got = read(row.bytes, chunk);
      EXPECT_EQ(valueOf(got, "NAME"), "J\xC3\xBCrgen") << row.name << " chunk " << chunk;
      EXPECT_EQ(got.encoding, row.encoding) << row.name;
      EXPECT_TRUE(got.codes.empty()) << row.name << " " << (got.codes.empty() ? "" : got.codes[0]);
      EXPECT_EQ(got.lines.size(), 5u) << row.name;
    }
  }
  // ASCII has no u-umlaut: a plain line passes untouched.
  EXPECT_EQ(valueOf(read(header("ASCII", "1 NAME John")), "NAME"), "John");
}

TEST(KXGReaderTest, BytesThatContradictTheDeclarationAreSaidOnceAndReadTheWayThatWorks) {
  const std::string utf8Name = "1 NAME J\xC3\xBCrgen\r\n1 NOTE Gr\xC3\xBC\xC3\x9F" "e";
  for (const char* declared : {"ANSEL", "ANSI", "ASCII", "IBMPC"}) {
    const Collected got = read(header(declared, utf8Name));
    EXPECT_EQ(got.codes, std::vector<std::string>{"4:charset-mismatch"}) << declared;
    EXPECT_EQ(valueOf(got, "NAME"), "J\xC3\xBCrgen") << declared;
    EXPECT_EQ(valueOf(got, "NOTE"), "Gr\xC3\xBC\xC3\x9F" "e") << declared;
    EXPECT_EQ(got.encoding, kKXCUTF8StringEncoding) << declared;
  }
  // Declared UTF-8, written in Windows-1252.
  const Collected ansi = read(header("UTF-8", "1 NAME J\xFCrgen\r\n1 NOTE \x80 5"));
  EXPECT_EQ(ansi.codes, std::vector<std::string>{"4:charset-mismatch"});
  EXPECT_EQ(valueOf(ansi, "NAME"), "J\xC3\xBCrgen");
  EXPECT_EQ(valueOf(ansi, "NOTE"), "\xE2\x82\xAC 5");
  // No declaration: silently whatever the bytes are.
  const Collected undeclared = read("0 HEAD\n0 @I1@ INDI\n1 NAME J\xC3\xBCrgen\n");
  EXPECT_TRUE(undeclared.codes.empty());
  EXPECT_EQ(valueOf(undeclared, "NAME"), "J\xC3\xBCrgen");
  // Invalid UTF-8 after valid UTF-8 is replaced and reported on its line.
  const Collected invalid = read(header("UTF-8", "1 NAME J\xC3\xBCrgen\r\n1 NOTE a\xFF" "b"));
  EXPECT_EQ(invalid.codes, std::vector<std::string>{"5:text-invalid"});
  EXPECT_EQ(valueOf(invalid, "NOTE"), "a\xEF\xBF\xBD" "b");
}

TEST(KXGReaderTest, TheThreeSamplesHoldTheSameRecords) {
  const auto readFile = [](const char* name) {
    std::ifstream in(std::filesystem::path(KXA_SOURCE_DIR) / "samples" / name, std::ios::binary);
    return read(std::string((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>()));
  };
  Collected ansel = readFile("family-ansel.ged");
  Collected utf8 = readFile("family-utf8.ged");
  Collected utf16 = readFile("family-utf16.ged");
  ASSERT_GT(ansel.lines.size(), 100u);
  // The CHAR lines differ, and the UTF-8 file holds one byte that is not text.
  for (Collected* collected : {&ansel, &utf8, &utf16}) {
    for (std::string& line : collected->lines) {
      if (line.find(" CHAR|") != std::string::npos) line = "CHAR";
      if (line.find("a byte that is not text") != std::string::npos) line = "INVALID";
    }
  }
  EXPECT_EQ(ansel.lines, utf8.lines);
  EXPECT_EQ(ansel.lines, utf16.lines);
  // Composed: the ANSEL marks join their letters.
  const std::string jose = "13 1 NAME|Jos\xC3\xA9 /Garc\xC3\xAD" "a/";
  EXPECT_NE(std::find(ansel.lines.begin(), ansel.lines.end(), jose), ansel.lines.end());
}

}  // namespace
