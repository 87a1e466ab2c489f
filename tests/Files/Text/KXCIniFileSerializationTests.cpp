#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include <nlohmann/json.hpp>

#include "kxacore/Files/Text/KXCIniFile.h"
#include "kxacore/Files/Text/KXCIniFileSerialization.h"

namespace {

namespace fs = std::filesystem;

nlohmann::json asJson(const KXCIniFile& ini) {
  nlohmann::json sections = nlohmann::json::object();
  for (const auto& [name, content] : ini.content()) {
    nlohmann::json entries = nlohmann::json::object();
    for (const auto& [key, value] : *content) entries[key] = value;
    sections[name] = entries;
  }
  return sections;
}

struct NativeCase {
  const char* name;
  std::string text;
  nlohmann::json sections;
};

class NativeReadTest : public testing::TestWithParam<NativeCase> {};

TEST_P(NativeReadTest, FollowsTheLineRules) {
  const NativeCase& c = GetParam();
  const auto ini = KXCIniFileNativeSerializator::iniFromString(c.text);
  ASSERT_TRUE(ini) << c.name;
  EXPECT_EQ(asJson(*ini), c.sections) << c.name;
}

using J = nlohmann::json;

INSTANTIATE_TEST_SUITE_P(
    Lines, NativeReadTest,
    testing::Values(
        NativeCase{"empty file", "", J::object()},
        NativeCase{"header trimmed, inner spaces kept", "  [ Main Section ]  \nk=v\n",
                   {{"Main Section", {{"k", "v"}}}}},
        NativeCase{"one-character header before any section is dropped", "[A]\nk=v\n",
                   J::object()},
        NativeCase{"one-character header inside a section is a bare key", "[S1]\n[A]\n",
                   {{"S1", {{"[A]", ""}}}}},
        NativeCase{"two characters make a header", "[AB]\n", {{"AB", J::object()}}},
        NativeCase{"key stops at space, value untrimmed", "[S1]\nkey with space = v\n",
                   {{"S1", {{"key", " v"}}}}},
        NativeCase{"empty key", "[S1]\n=x\n", {{"S1", {{"", "x"}}}}},
        NativeCase{"later '=' kept, no unquoting", "[S1]\nk=\"a=b\" ; c\n",
                   {{"S1", {{"k", "\"a=b\" ; c"}}}}},
        NativeCase{"repeated header empties the section", "[S1]\na=1\n[S2]\n[S1]\nb=2\n",
                   {{"S1", {{"b", "2"}}}, {"S2", J::object()}}},
        NativeCase{"lines before the first header dropped", "a=1\nbare\n[S1]\n",
                   {{"S1", J::object()}}},
        NativeCase{"comments only with '#'", "[S1]\n  # c=1\n; d=2\nx # y\n",
                   {{"S1", {{";", "2"}, {"x # y", ""}}}}},
        NativeCase{"bare line kept untrimmed", "[S1]\n  spaced out  \n",
                   {{"S1", {{"  spaced out  ", ""}}}}},
        NativeCase{"key name renames the section object only", "[S1]\nname=Other\nk=v\n",
                   {{"S1", {{"k", "v"}}}}},
        NativeCase{"key content is refused", "[S1]\ncontent=x\n", {{"S1", J::object()}}},
        NativeCase{"every line end", "[S1]\r\na=1\rb=2\xE2\x80\xA8" "c=3\xE2\x80\xA9" "d=4\n\n",
                   {{"S1", {{"a", "1"}, {"b", "2"}, {"c", "3"}, {"d", "4"}}}}},
        NativeCase{"byte-order mark skipped", "\xEF\xBB\xBF[S1]\nk=v",
                   {{"S1", {{"k", "v"}}}}},
        NativeCase{"header with trailing text is a key", "[S1]\n[ab] x\n",
                   {{"S1", {{"[ab] x", ""}}}}},
        NativeCase{"brackets inside a name", "[a]b]\n", {{"a]b", J::object()}}},
        NativeCase{"UTF-8 names", "[Gr\xC3\xBC\xC3\x9F" "e]\n\xC3\xA9=\xC3\xA0\n",
                   {{"Gr\xC3\xBC\xC3\x9F" "e", {{"\xC3\xA9", "\xC3\xA0"}}}}}));

TEST(KXCIniFileNativeTest, InvalidUTF8ReadsAsNone) {
  EXPECT_FALSE(KXCIniFileNativeSerializator::iniFromString("[S1]\nk=\xFF\n"));
}

TEST(KXCIniFileNativeTest, WritesSortedBareKeysForEmptyValues) {
  const auto ini = KXCIniFileNativeSerializator::iniFromString(
      "[Zeta]\nb=2\nflag\na=1\n[Alpha]\n");
  ASSERT_TRUE(ini);
  EXPECT_EQ(KXCIniFileNativeSerializator::stringFromIni(*ini),
            "[Alpha]\n[Zeta]\na=1\nb=2\nflag\n");
}

TEST(KXCIniFileNativeTest, ParsesFromSeveralThreadsAtOnce) {
  std::string text = "[S1]\n";
  for (int i = 0; i < 200; ++i) {
    text.append("k").append(std::to_string(i)).append("=").append(std::to_string(i)).append("\n");
  }
  std::vector<std::thread> threads;
  std::vector<std::size_t> counts(4);
  for (std::size_t t = 0; t < counts.size(); ++t) {
    threads.emplace_back([&, t] {
      for (int round = 0; round < 20; ++round) {
        const auto ini = KXCIniFileNativeSerializator::iniFromString(text);
        counts[t] += ini ? ini->sectionForName("S1")->allKeys().size() : 0;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  for (const std::size_t count : counts) EXPECT_EQ(count, 20u * 200u);
}

std::vector<std::uint8_t> fromHex(std::string_view hex) {
  std::vector<std::uint8_t> bytes;
  for (std::size_t i = 0; i + 1 < hex.size(); i += 2) {
    bytes.push_back(static_cast<std::uint8_t>(std::stoi(std::string(hex.substr(i, 2)), nullptr, 16)));
  }
  return bytes;
}

struct BinaryPlistCase {
  const char* name;
  const char* hex;  // written by Python's plistlib, some edited by hand
  bool readable;
};

class BinaryPlistTest : public testing::TestWithParam<BinaryPlistCase> {};

// A NUL inside a binary list's string would abort the process inside
// libplist; such lists are refused instead.
TEST_P(BinaryPlistTest, RefusesWhatCouldAbort) {
  const BinaryPlistCase& c = GetParam();
  const std::vector<std::uint8_t> bytes = fromHex(c.hex);
  EXPECT_EQ(static_cast<bool>(KXCIniFilePropertyListSerializator::iniFromData(bytes)), c.readable)
      << c.name;
}

INSTANTIATE_TEST_SUITE_P(
    Lists, BinaryPlistTest,
    testing::Values(
        BinaryPlistCase{"plain",
                        "62706c6973743030d101025153d203040506516b516e51761003080b0d121416180000"
                        "00000000010100000000000000070000000000000000000000000000001a",
                        true},
        BinaryPlistCase{"NUL in an ASCII key",
                        "62706c6973743030d101025153d10304536100625178080b0d10140000000000000101"
                        "000000000000000500000000000000000000000000000016",
                        false},
        BinaryPlistCase{"NUL in a value",
                        "62706c6973743030d101025153d10304516b53780079080b0d10120000000000000101"
                        "000000000000000500000000000000000000000000000016",
                        false},
        BinaryPlistCase{"NUL in a UTF-16 key",
                        "62706c6973743030d101025153d1030463006b00e900005176080b0d10170000000000"
                        "000101000000000000000500000000000000000000000000000019",
                        false},
        BinaryPlistCase{"offset table past the end",
                        "62706c6973743030d101025153d10304516b5176080b0d10120000000000000101000000"
                        "0000000005000000000000000000000000000000ff",
                        false},
        BinaryPlistCase{"no trailer", "62706c6973743030d10102", false}));

class IniFilesTest : public testing::Test {
 protected:
  void SetUp() override {
    // Appended piece by piece: GCC 12 misreads `"literal" + string` (a false -Wrestrict).
    std::string name = "kxacore-ini-";
    name.append(std::to_string(::getpid())).append("-");
    name.append(testing::UnitTest::GetInstance()->current_test_info()->name());
    dir_ = fs::temp_directory_path() / name;
    fs::remove_all(dir_);
    fs::create_directories(dir_);
  }
  void TearDown() override { fs::remove_all(dir_); }

  static std::string read(const fs::path& path) {
    std::ifstream stream(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>());
  }
  static void write(const fs::path& path, std::string_view bytes) {
    std::ofstream(path, std::ios::binary) << bytes;
  }

  // Runs a Python snippet with the paths as sys.argv[1:]; false when Python
  // or plistlib is missing.
  static bool python(const std::string& script, const std::vector<fs::path>& paths) {
    if (std::system("python3 -c 'import plistlib' >/dev/null 2>&1") != 0) return false;
    std::string command = "python3 -c '";
    command.append(script).append("'");
    for (const fs::path& path : paths) command.append(" '").append(path.string()).append("'");
    return std::system(command.c_str()) == 0;
  }

  fs::path dir_;
};

const char* const kSample =
    "# sample\n[Main Section]\nhome=/home/user\nempty\n[Colours]\nfg=black\nbg=\xC3\xA9\xE2\x82\xAC\n";

TEST_F(IniFilesTest, NativeToPropertyListToNativeRoundTrips) {
  write(dir_ / "a.ini", kSample);
  const auto native = KXCIniFile::iniWithContentsOfFile(dir_ / "a.ini", KXCIniFileFormatNative);
  ASSERT_TRUE(native);
  ASSERT_TRUE(native->writeToFile(dir_ / "a.plist", KXCIniFileFormatPropertyList));
  const auto plist = KXCIniFile::iniWithContentsOfFile(dir_ / "a.plist", KXCIniFileFormatPropertyList);
  ASSERT_TRUE(plist);
  EXPECT_EQ(asJson(*plist), asJson(*native));
  ASSERT_TRUE(plist->writeToFile(dir_ / "b.ini", KXCIniFileFormatNative));
  const auto back = KXCIniFile::iniWithContentsOfFile(dir_ / "b.ini", KXCIniFileFormatNative);
  ASSERT_TRUE(back);
  EXPECT_EQ(asJson(*back), asJson(*native));
  // A written file is a fixed point.
  ASSERT_TRUE(back->writeToFile(dir_ / "c.ini", KXCIniFileFormatNative));
  EXPECT_EQ(read(dir_ / "c.ini"), read(dir_ / "b.ini"));
  EXPECT_EQ(read(dir_ / "b.ini"),
            "[Colours]\nbg=\xC3\xA9\xE2\x82\xAC\nfg=black\n[Main Section]\nempty\nhome=/home/user\n");
}

TEST_F(IniFilesTest, FailedReadsAndWrites) {
  EXPECT_FALSE(KXCIniFile::iniWithContentsOfFile(dir_ / "missing.ini", KXCIniFileFormatNative));
  EXPECT_FALSE(KXCIniFile::iniWithContentsOfFile(dir_, KXCIniFileFormatNative));
  write(dir_ / "not.plist", "[S1]\nk=v\n");
  EXPECT_FALSE(KXCIniFile::iniWithContentsOfFile(dir_ / "not.plist", KXCIniFileFormatPropertyList));
  write(dir_ / "array.plist",
        "<?xml version=\"1.0\"?><plist version=\"1.0\"><array><string>x</string></array></plist>");
  EXPECT_FALSE(KXCIniFile::iniWithContentsOfFile(dir_ / "array.plist", KXCIniFileFormatPropertyList));
  write(dir_ / "empty.plist", "");
  EXPECT_FALSE(KXCIniFile::iniWithContentsOfFile(dir_ / "empty.plist", KXCIniFileFormatPropertyList));

  KXCIniFile ini;
  ini.setSection(KXCIniSection::sectionWithName("S1"));
  for (const std::int64_t format : {KXCIniFileFormatNative, KXCIniFileFormatPropertyList}) {
    EXPECT_FALSE(ini.writeToFile(dir_ / "no-such-dir" / "x", format));
    EXPECT_FALSE(ini.writeToFile(dir_, format));  // a directory is not replaced
  }
  EXPECT_TRUE(fs::is_directory(dir_));
}

TEST_F(IniFilesTest, PropertyListValuesOfOtherKinds) {
  write(dir_ / "kinds.plist",
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\"><dict>"
        "<key>S</key><dict>"
        "<key>int</key><integer>42</integer><key>neg</key><integer>-7</integer>"
        "<key>real</key><real>0.1</real><key>whole</key><real>2</real>"
        "<key>yes</key><true/><key>no</key><false/>"
        "<key>data</key><data>AAE=</data><key>list</key><array/>"
        "<key>date</key><date>2020-01-01T00:00:00Z</date><key>text</key><string>t</string>"
        "</dict><key>loose</key><string>ignored</string></dict></plist>");
  const auto ini = KXCIniFile::iniWithContentsOfFile(dir_ / "kinds.plist", KXCIniFileFormatPropertyList);
  ASSERT_TRUE(ini);
  EXPECT_EQ(asJson(*ini), (J{{"S",
                              {{"int", "42"},
                               {"neg", "-7"},
                               {"real", "0.1"},
                               {"whole", "2"},
                               {"yes", "1"},
                               {"no", "0"},
                               {"text", "t"}}}}));
}

// Writers take each value through key-value coding, where "name" is the
// section's own name: an entry of that name, which only a property list can
// hold, is written as the section name.
TEST_F(IniFilesTest, EntryNamedNameIsWrittenAsTheSectionName) {
  write(dir_ / "name.plist",
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\"><dict>"
        "<key>S1</key><dict><key>name</key><string>x</string></dict></dict></plist>");
  const auto ini = KXCIniFile::iniWithContentsOfFile(dir_ / "name.plist", KXCIniFileFormatPropertyList);
  ASSERT_TRUE(ini);
  EXPECT_EQ(asJson(*ini), (J{{"S1", {{"name", "x"}}}}));
  EXPECT_EQ(KXCIniFileNativeSerializator::stringFromIni(*ini), "[S1]\nname=S1\n");
  const std::string xml = KXCIniFilePropertyListSerializator::xmlFromIni(*ini);
  EXPECT_NE(xml.find("<key>name</key>\n\t\t<string>S1</string>"), std::string::npos) << xml;
}

// Python's plistlib reads what we write, and we read what it writes in both
// of its forms.
TEST_F(IniFilesTest, PythonPlistlibInterop) {
  const auto ini = KXCIniFileNativeSerializator::iniFromString(kSample);
  ASSERT_TRUE(ini);
  ASSERT_TRUE(ini->writeToFile(dir_ / "ours.plist", KXCIniFileFormatPropertyList));
  const std::string check =
      "import plistlib, sys\n"
      "d = plistlib.load(open(sys.argv[1], \"rb\"))\n"
      "assert d == {\"Main Section\": {\"home\": \"/home/user\", \"empty\": \"\"},"
      " \"Colours\": {\"fg\": \"black\", \"bg\": \"\\u00e9\\u20ac\"}}, d\n";
  if (!python("import plistlib", {})) GTEST_SKIP() << "python3 with plistlib not installed";
  EXPECT_TRUE(python(check, {dir_ / "ours.plist"}));

  const std::string writeBoth =
      "import plistlib, sys\n"
      "d = {\"Main\": {\"k\": \"v\", \"n\": 3, \"u\": \"\\u00fc\\U0001F600\"}, \"x\": 1}\n"
      "plistlib.dump(d, open(sys.argv[1], \"wb\"), fmt=plistlib.FMT_XML)\n"
      "plistlib.dump(d, open(sys.argv[2], \"wb\"), fmt=plistlib.FMT_BINARY)\n";
  ASSERT_TRUE(python(writeBoth, {dir_ / "xml.plist", dir_ / "binary.plist"}));
  const J expected = {{"Main", {{"k", "v"}, {"n", "3"}, {"u", "\xC3\xBC\xF0\x9F\x98\x80"}}}};
  for (const char* name : {"xml.plist", "binary.plist"}) {
    const auto theirs = KXCIniFile::iniWithContentsOfFile(dir_ / name, KXCIniFileFormatPropertyList);
    ASSERT_TRUE(theirs) << name;
    EXPECT_EQ(asJson(*theirs), expected) << name;
  }
}

}  // namespace
