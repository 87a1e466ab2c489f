#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>

#include <nlohmann/json.hpp>

#include "kxacore/Platform/KXAImage.h"
#include "tests/tools/KXACliRun.h"

namespace fs = std::filesystem;

namespace {

std::string readText(const fs::path& path) {
  std::ifstream stream(path, std::ios::binary);
  return std::string((std::istreambuf_iterator<char>(stream)), std::istreambuf_iterator<char>());
}

// Every test gets a folder named after it with a package made by `story new`.
class StoryCliTest : public testing::Test {
 protected:
  void SetUp() override {
    folder_ = fs::temp_directory_path() /
              ("kxa-story-cli-" + std::string(testing::UnitTest::GetInstance()->current_test_info()->name()));
    fs::remove_all(folder_);
    fs::create_directories(folder_);
    image_ = writeImage("old.png", 6, 4);
    package_ = (folder_ / "s.quillo").string();
    ASSERT_EQ(runKxacore({"story", "new", package_, "--id", "s", "--image", image_}).status, 0);
  }
  void TearDown() override { fs::remove_all(folder_); }

  std::string writeImage(const std::string& name, std::size_t width, std::size_t height) {
    const KXAImage image(width, height, KXAPixelLayout::argb32);
    EXPECT_TRUE(image.writeToFile(folder_ / name));
    return (folder_ / name).string();
  }
  nlohmann::json info() {
    const auto run = runKxacore({"story", "info", package_, "--json"});
    EXPECT_EQ(run.status, 0);
    return nlohmann::json::parse(run.output, nullptr, false);
  }

  fs::path folder_;
  std::string image_, package_;
};

TEST_F(StoryCliTest, InfoHasItsStableKeys) {
  const auto json = info();
  EXPECT_EQ(json["imageFileName"], "s_story_image.png");
  EXPECT_TRUE(json["originalImageFileName"].is_null());
  EXPECT_EQ(json["spotCount"], 0);
  EXPECT_EQ(json["spotCountWoIntroSpot"], 0);
  EXPECT_EQ(json["persons"], nlohmann::json::array());
  // ISO 8601 in UTC to the second.
  EXPECT_EQ(json["modified"].get<std::string>().size(), 20u);
  EXPECT_EQ(json["modified"].get<std::string>().back(), 'Z');
}

TEST_F(StoryCliTest, SetDataThenDataAndExtract) {
  const fs::path data = folder_ / "new.json";
  std::ofstream(data) << R"({"id":"s","imageFileName":"s_story_image.png","spots":[{"playIdx":-1},{"playIdx":1}],)"
                         R"("persons":[{"nestboxPersonIdentifier":"I1","nestboxTreeIndentifier":"T1"}]})";
  ASSERT_EQ(runKxacore({"story", "set-data", package_, data.string()}).status, 0);
  const auto json = info();
  EXPECT_EQ(json["spotCount"], 2);
  EXPECT_EQ(json["spotCountWoIntroSpot"], 1);
  EXPECT_EQ(json["persons"], nlohmann::json::parse(R"([{"treeId":"T1","id":"I1"}])"));
  EXPECT_EQ(nlohmann::json::parse(runKxacore({"story", "data", package_}).output),
            nlohmann::json::parse(readText(data)));
  ASSERT_EQ(runKxacore({"story", "extract", package_, (folder_ / "out").string()}).status, 0);
  EXPECT_EQ(readText(folder_ / "out" / "Data.json"), readText(data));
  EXPECT_EQ(runKxacore({"story", "extract", package_, (folder_ / "out").string()}).status, 1);
}

TEST_F(StoryCliTest, RefusedEditsExitOneAndLeaveThePackage) {
  const std::string before = readText(package_);
  std::ofstream(folder_ / "bad.json") << R"({"id":)";
  std::ofstream(folder_ / "spots.json") << R"({"id":"s","imageFileName":"s_story_image.png","spots":7})";
  std::ofstream(folder_ / "other.json") << R"({"id":"t"})";
  std::ofstream(folder_ / "text.png") << "not an image";
  const std::vector<std::vector<std::string>> refused = {
      {"story", "set-data", package_, (folder_ / "bad.json").string()},
      {"story", "set-data", package_, (folder_ / "spots.json").string()},
      {"story", "set-data", package_, (folder_ / "other.json").string()},
      {"story", "set-data", package_, (folder_ / "missing.json").string()},
      {"story", "set-image", package_, (folder_ / "text.png").string()},
      {"story", "revert-image", package_},
      {"story", "info", (folder_ / "missing.quillo").string()},
      {"story", "info", image_},
      {"story", "new", package_, "--id", "s", "--image", image_},
      {"story", "new", (folder_ / "t.zip").string(), "--id", "t", "--image", image_},
  };
  for (const auto& arguments : refused) {
    const auto run = runKxacore(arguments, true);
    EXPECT_EQ(run.status, 1) << arguments[1] << " " << arguments.back();
    EXPECT_EQ(run.output.rfind("kxacore: ", 0), 0u) << run.output;
  }
  EXPECT_EQ(readText(package_), before);
  EXPECT_EQ(runKxacore({"story", "set-image", package_}).status, 2);
  EXPECT_EQ(runKxacore({"story", "new", package_, "--id", "s"}).status, 2);
}

TEST_F(StoryCliTest, ImageReplacedTwiceThenReverted) {
  const std::string second = writeImage("second.png", 7, 5);
  const std::string third = writeImage("third.png", 8, 5);
  ASSERT_EQ(runKxacore({"story", "set-image", package_, second, "--backup-name", "first.png"}).status, 0);
  ASSERT_EQ(runKxacore({"story", "set-image", package_, third, "--backup-name", "ignored.png"}).status, 0);
  EXPECT_EQ(info()["originalImageFileName"], "first.png");
  ASSERT_EQ(runKxacore({"story", "revert-image", package_, "--json"}).status, 0);
  EXPECT_TRUE(info()["originalImageFileName"].is_null());
  EXPECT_FALSE(fs::exists(folder_ / ".s.quillo.kxa-replace"));
}

}  // namespace
