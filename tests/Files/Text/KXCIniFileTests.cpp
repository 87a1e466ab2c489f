#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "kxacore/Files/Text/KXCIniFile.h"
#include "kxacore/Files/Text/KXCIniFileSerialization.h"

namespace {

TEST(KXCIniFileTest, SectionSharesTheFilesDictionary) {
  KXCIniFile ini;
  KXCIniSection section = KXCIniSection::sectionWithName("Main");
  ini.setSection(section);
  section.setValue("1", "a");  // after setSection: still the same dictionary
  auto fetched = ini.sectionForName("Main");
  ASSERT_TRUE(fetched);
  EXPECT_EQ(fetched->valueForKey("a"), "1");
  fetched->setValue("2", "b");
  fetched->removeValueForKey("a");
  fetched->removeValueForKey("missing");
  EXPECT_EQ(ini.sectionForName("Main")->allKeys(), std::vector<std::string>{"b"});
  EXPECT_FALSE(ini.sectionForName("main"));  // names are case-sensitive
}

TEST(KXCIniFileTest, SetSectionReplacesAndRemoveDeletes) {
  KXCIniFile ini;
  KXCIniSection first = KXCIniSection::sectionWithName("S");
  first.setValue("old", "k");
  ini.setSection(first);
  ini.setSection(KXCIniSection::sectionWithName("S"));
  ini.setSection(KXCIniSection::sectionWithName("A"));
  EXPECT_EQ(ini.sectionsNames(), (std::vector<std::string>{"A", "S"}));
  EXPECT_TRUE(ini.sectionForName("S")->allKeys().empty());
  ini.removeSectionForName("S");
  ini.removeSectionForName("never there");
  EXPECT_EQ(ini.sectionsNames(), std::vector<std::string>{"A"});
}

// Key-value coding: what each key does with each kind of value.
struct KeyValueCase {
  const char* name;
  const char* key;
  nlohmann::json value;
  bool accepted;
  const char* sectionName;  // after the call
  nlohmann::json content;   // after the call
};

class KeyValueCodingTest : public testing::TestWithParam<KeyValueCase> {};

TEST_P(KeyValueCodingTest, StoresStringsAndRefusesTheRest) {
  const KeyValueCase& c = GetParam();
  KXCIniSection section = KXCIniSection::sectionWithName("S");
  section.setValue("1", "a");
  bool accepted = false;
  EXPECT_NO_THROW(accepted = section.setValue(c.value, c.key)) << c.name;
  EXPECT_EQ(accepted, c.accepted) << c.name;
  EXPECT_EQ(section.name(), c.sectionName) << c.name;
  EXPECT_EQ(section.jsonValueForKey("content"), c.content) << c.name;
}

INSTANTIATE_TEST_SUITE_P(
    Keys, KeyValueCodingTest,
    testing::Values(
        KeyValueCase{"string entry", "b", "2", true, "S", {{"a", "1"}, {"b", "2"}}},
        KeyValueCase{"overwrite", "a", "x", true, "S", {{"a", "x"}}},
        KeyValueCase{"number refused", "b", 2, false, "S", {{"a", "1"}}},
        KeyValueCase{"null refused", "a", nullptr, false, "S", {{"a", "1"}}},
        KeyValueCase{"array refused", "b", nlohmann::json::array({"x"}), false, "S", {{"a", "1"}}},
        KeyValueCase{"name renames", "name", "T", true, "T", {{"a", "1"}}},
        KeyValueCase{"name takes strings only", "name", 5, false, "S", {{"a", "1"}}},
        KeyValueCase{"content replaced", "content", {{"z", "9"}}, true, "S", {{"z", "9"}}},
        KeyValueCase{"content with a number refused", "content", {{"z", 9}}, false, "S",
                     {{"a", "1"}}},
        KeyValueCase{"content as string refused", "content", "x", false, "S", {{"a", "1"}}}));

TEST(KXCIniFileTest, ValueForKeyAddressesProperties) {
  KXCIniSection section = KXCIniSection::sectionWithName("S");
  section.setValue(std::string("v"), "k");
  EXPECT_EQ(section.valueForKey("name"), "S");
  EXPECT_EQ(section.valueForKey("content"), std::nullopt);
  EXPECT_EQ(section.valueForKey("k"), "v");
  EXPECT_EQ(section.valueForKey("missing"), std::nullopt);
  EXPECT_EQ(section.jsonValueForKey("missing"), nullptr);
}

TEST(KXCIniFileTest, ReplacedContentLeavesTheFileAlone) {
  KXCIniFile ini;
  ini.setSection(KXCIniSection::sectionWithName("S"));
  auto section = ini.sectionForName("S");
  ASSERT_TRUE(section->setValue(nlohmann::json{{"k", "v"}}, "content"));
  EXPECT_TRUE(ini.sectionForName("S")->allKeys().empty());
}

TEST(KXCIniFileTest, Descriptions) {
  KXCIniFile ini;
  KXCIniSection section = KXCIniSection::sectionWithName("Main");
  section.setValue("1", "a");
  section.setValue("two words", "b c");
  ini.setSection(section);
  EXPECT_EQ(section.description(), "section:Main \n{\n    a = 1;\n    \"b c\" = \"two words\";\n}");
  EXPECT_EQ(ini.description(),
            "ini:\n{\n    Main = {\n        a = 1;\n        \"b c\" = \"two words\";\n    };\n}");
}

TEST(KXCIniFileTest, UnknownFormatsReadNothingAndWriteNothing) {
  for (const std::int64_t format : {-1, 2, 100}) {
    EXPECT_FALSE(KXCIniFileSerializator::serializatorForFormat(format));
    EXPECT_FALSE(KXCIniFile::iniWithContentsOfFile("/dev/null", format));
    EXPECT_FALSE(KXCIniFile().writeToFile("/tmp/kxacore-never-written.ini", format));
  }
  EXPECT_FALSE(std::filesystem::exists("/tmp/kxacore-never-written.ini"));
  const KXCIniFileSerializator base;
  EXPECT_FALSE(base.iniFromFile("/dev/null"));
  EXPECT_FALSE(base.writeIni(KXCIniFile(), "/tmp/kxacore-never-written.ini"));
}

}  // namespace
