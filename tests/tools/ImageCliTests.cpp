// kxacore image: real PNG and JPEG files through the program, compared with
// the library called directly.

#include "kxacore/Imaging/IPLPixelOperations.h"
#include "kxacore/Platform/KXAImage.h"
#include "tests/tools/KXACliRun.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

class ImageCli : public ::testing::Test {
 protected:
  void SetUp() override {
    folder_ = fs::temp_directory_path() / ("kxacore-image-cli-" + std::to_string(::getpid()));
    fs::create_directories(folder_);
    // A photo-like colour gradient with some texture, opaque.
    KXAImage photo(37, 23, KXAPixelLayout::argb32);
    for (std::size_t y = 0; y < photo.height(); ++y)
      for (std::size_t x = 0; x < photo.width(); ++x) {
        std::uint8_t* pixel = photo.row(y) + 4 * x;
        pixel[0] = 255;
        pixel[1] = static_cast<std::uint8_t>(x * 7);
        pixel[2] = static_cast<std::uint8_t>(y * 11);
        pixel[3] = static_cast<std::uint8_t>((x * y * 13) % 256);
      }
    ASSERT_TRUE(photo.writeToFile(path("photo.png")));
    photo_ = photo;
  }
  void TearDown() override {
    std::error_code ignored;
    fs::remove_all(folder_, ignored);
  }
  std::string path(const std::string& name) const { return (folder_ / name).string(); }

  fs::path folder_;
  KXAImage photo_;
};

bool samePixels(const KXAImage& a, const KXAImage& b) {
  if (a.width() != b.width() || a.height() != b.height() || a.layout() != b.layout()) return false;
  for (std::size_t y = 0; y < a.height(); ++y)
    if (!std::equal(a.row(y), a.row(y) + a.width() * a.bytesPerPixel(), b.row(y))) return false;
  return true;
}

TEST_F(ImageCli, PngRoundTripsExactly) {
  const auto back = KXAImage::imageWithContentsOfFile(path("photo.png"));
  ASSERT_TRUE(back);
  EXPECT_TRUE(samePixels(*back, photo_));
}

TEST_F(ImageCli, BlurWritesWhatTheLibraryComputes) {
  const auto run = runKxacore({"image", "blur", path("photo.png"), path("out.png"), "--radius", "4", "--json"});
  ASSERT_EQ(run.status, 0);
  EXPECT_NE(run.output.find("\"operation\":\"blur\""), std::string::npos);
  KXAImage expected = photo_;
  for (std::size_t channel = 0; channel < 4; ++channel)
    IPLBoxBlur(expected.bytes() + channel, expected.bytes() + channel, 37, 23, 4, 4, expected.rowBytes(),
               expected.rowBytes(), 4);
  const auto written = KXAImage::imageWithContentsOfFile(path("out.png"));
  ASSERT_TRUE(written);
  EXPECT_TRUE(samePixels(*written, expected));
}

TEST_F(ImageCli, ToneReportsTheAmountsUsed) {
  const auto run = runKxacore({"image", "tone", path("photo.png"), path("toned.jpg"), "--brightness", "0.6",
                               "--contrast", "0.6"});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output, "brightness 0.556191 contrast 0.556191\n");
  EXPECT_TRUE(fs::exists(path("toned.jpg")));
}

TEST_F(ImageCli, GreyImagesKeepOneChannel) {
  ASSERT_EQ(runKxacore({"image", "ellipse-mask", "40", "30", path("oval.png"), "--soft"}).status, 0);
  ASSERT_EQ(runKxacore({"image", "erode", path("oval.png"), path("eroded.png"), "--radius", "2"}).status, 0);
  const auto eroded = KXAImage::imageWithContentsOfFile(path("eroded.png"));
  ASSERT_TRUE(eroded);
  EXPECT_EQ(eroded->layout(), KXAPixelLayout::grey8);
  EXPECT_EQ(eroded->width(), 40u);
}

TEST_F(ImageCli, ShapePrintsNormalisedJson) {
  const auto run = runKxacore({"image", "shape", "--json",
                               R"({"type":"oval","x":0.4,"y":0,"width":100,"height":50,"imageWidthPixels":100,)"
                               R"("imageHeightPixels":50})"});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output,
            "{\"shape\":{\"type\":\"rectangle\",\"x\":0,\"y\":0,\"width\":100,\"height\":50,\"imageWidthPixels\":100,"
            "\"imageHeightPixels\":50,\"fileHash\":\"\",\"croppedFileHash\":\"\"},\"croppedByWholeImage\":true}\n");
}

TEST_F(ImageCli, FailuresExitWithTwoAndWriteNothing) {
  ASSERT_TRUE(KXAImage(5, 5, KXAPixelLayout::grey8).writeToFile(path("photo-small.png")));
  const std::vector<std::vector<std::string>> failing = {
      {"image", "blur", path("missing.png"), path("out.png")},
      {"image", "blur", path("photo.png"), path("out.png"), "--radius", "-1"},
      {"image", "tint", path("photo.png"), path("out.png"), "--amount", "256"},
      {"image", "whiten", path("photo.png"), path("out.png"), "--x", "30", "--y", "0", "--size", "10"},
      {"image", "mask", path("photo.png"), path("out.png"), "--mask", path("photo-small.png")},
      {"image", "ellipse-mask", "0", "10", path("out.png")},
      {"image", "blur", path("photo.png"), path("out.unknown")},
      {"image", "shape", "{\"x\":1}"},
      {"image", "blur", path("photo.png")},
  };
  for (const auto& arguments : failing) {
    const auto run = runKxacore(arguments, true);
    EXPECT_EQ(run.status, 2) << arguments[1] << " " << arguments[2];
    EXPECT_FALSE(run.output.empty()) << arguments[1];
    EXPECT_FALSE(fs::exists(path("out.png"))) << arguments[1];
  }
}

}  // namespace
