// kxacore story: story packages read, edited and made. Each editing verb
// waits for the package to be written before it exits; a failed write exits
// with status 1 and leaves the package as it was.

#include <algorithm>
#include <atomic>
#include <cctype>
#include <csignal>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "kxacore/Files/Archives/KXFArchiver.h"
#include "kxacore/Files/Archives/KXFLibZipArchiver.h"
#include "kxacore/Files/Story/KXCQuilloFileManager.h"
#include "kxacore/Platform/KXAImage.h"
#include "kxacore/Platform/KXANotificationCenter.h"
#include "tools/kxacore/Commands.h"

namespace {

namespace fs = std::filesystem;
using Json = nlohmann::ordered_json;

// The cache key: absolute and lexically normal.
fs::path packageURL(const std::string& argument) { return fs::absolute(argument).lexically_normal(); }

std::string isoUtc(fs::file_time_type time) {
  const auto system = std::chrono::file_clock::to_sys(time);
  const std::time_t seconds = std::chrono::system_clock::to_time_t(
      std::chrono::floor<std::chrono::seconds>(system));
  std::tm utc{};
  gmtime_r(&seconds, &utc);
  char text[32];
  std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", &utc);
  return text;
}

std::vector<std::uint8_t> readWholeFile(const std::string& path) {
  std::ifstream stream(path, std::ios::binary);
  if (!stream) throw KXACommandError(path + ": cannot be read");
  std::vector<std::uint8_t> bytes((std::istreambuf_iterator<char>(stream)), std::istreambuf_iterator<char>());
  if (stream.bad()) throw KXACommandError(path + ": cannot be read");
  return bytes;
}

// A manager of the run's own, and the package's unpacked folder removed at the end.
class StorySession {
 public:
  explicit StorySession(const std::string& package) : url_(packageURL(package)) {
    // A file-size limit must fail the write, not kill the process mid-way.
    std::signal(SIGXFSZ, SIG_IGN);
  }
  StorySession(const StorySession&) = delete;
  StorySession& operator=(const StorySession&) = delete;
  ~StorySession() {
    manager_->waitForFileOperationsToComplete();
    manager_->clearCacheForQuilloFileAtURL(url_);
  }

  const fs::path& url() const { return url_; }
  KXCQuilloFileManager& manager() { return *manager_; }

  std::unique_ptr<KXCQuilloFileMetadata> open() {
    auto metadata = manager_->metadataForQuilloFileAtURL(url_);
    if (!metadata) throw KXACommandError(url_.string() + ": not a readable story package");
    return metadata;
  }

 private:
  fs::path url_;
  std::shared_ptr<KXCQuilloFileManager> manager_ = KXCQuilloFileManager::make();
};

// True once the manager announced a write of `url`.
class WriteWatch {
 public:
  explicit WriteWatch(fs::path url) : url_(std::move(url)) {
    token_ = KXANotificationCenter::defaultCenter().addObserver(
        kKXCQuilloFileDidChangeNotification, [this](const KXANotification& note) {
          const auto* path = std::any_cast<fs::path>(&note.object);
          if (path && *path == url_) written_ = true;
        });
  }
  ~WriteWatch() { KXANotificationCenter::defaultCenter().removeObserver(token_); }
  WriteWatch(const WriteWatch&) = delete;
  WriteWatch& operator=(const WriteWatch&) = delete;
  bool written() const { return written_; }

 private:
  fs::path url_;
  KXANotificationCenter::Token token_ = 0;
  std::atomic<bool> written_{false};
};

void printDone(bool json, const fs::path& url, const char* action) {
  if (json) printJsonLine({{"package", url.string()}, {"action", action}, {"written", true}});
}

void runInfo(const std::string& package, bool json) {
  StorySession session(package);
  const auto metadata = session.open();
  const auto persons = metadata->personList().value_or(std::vector<KXCQuilloPerson>{});
  const auto modified = metadata->contentModificationDate();
  const std::string modifiedText = modified ? isoUtc(*modified) : "";
  if (json) {
    Json personList = Json::array();
    for (const auto& person : persons) personList.push_back({{"treeId", person.treeId}, {"id", person.id}});
    const auto original = metadata->originalImageFileName();
    printJsonLine({{"package", session.url().string()},
                   {"imageFileName", metadata->imageFileName().value_or("")},
                   {"originalImageFileName", original ? Json(*original) : Json(nullptr)},
                   {"spotCount", metadata->spotCount().value_or(0)},
                   {"spotCountWoIntroSpot", metadata->spotCountWoIntroSpot().value_or(0)},
                   {"persons", personList},
                   {"modified", modifiedText}});
    return;
  }
  std::cout << "image: " << metadata->imageFileName().value_or("") << '\n'
            << "original image: " << metadata->originalImageFileName().value_or("-") << '\n'
            << "spots: " << metadata->spotCount().value_or(0) << " ("
            << metadata->spotCountWoIntroSpot().value_or(0) << " without intro)\n"
            << "persons: " << persons.size() << '\n';
  for (const auto& person : persons) std::cout << "  " << person.treeId << ' ' << person.id << '\n';
  std::cout << "modified: " << modifiedText << '\n';
}

void runData(const std::string& package, bool json) {
  StorySession session(package);
  const auto metadata = session.open();
  const auto data = metadata->storyData();
  if (!data) throw KXACommandError(session.url().string() + ": Data.json cannot be read");
  if (json) {
    const auto object = metadata->storyDataObject();
    if (!object) throw KXACommandError(session.url().string() + ": Data.json is not JSON");
    printJsonLine(*object);
    return;
  }
  std::cout.write(reinterpret_cast<const char*>(data->data()), static_cast<std::streamsize>(data->size()));
  if (!data->empty() && data->back() != '\n') std::cout << '\n';
}

// New story data must leave a package that still opens: a JSON object whose
// "spots", when present, is an array and whose image is the package's.
void checkStoryData(const std::vector<std::uint8_t>& bytes, const std::string& file,
                    const KXCQuilloFileMetadata& metadata) {
  const auto story = Json::parse(bytes.begin(), bytes.end(), nullptr, false);
  if (story.is_discarded() || !story.is_object()) throw KXACommandError(file + ": not a JSON object");
  if (story.contains("spots") && !story["spots"].is_array()) {
    throw KXACommandError(file + ": \"spots\" is not an array");
  }
  std::string imageName;
  if (story.contains("imageFileName") && story["imageFileName"].is_string()) {
    imageName = story["imageFileName"].get<std::string>();
  }
  if (imageName.empty() && story.contains("id") && story["id"].is_string() &&
      !story["id"].get<std::string>().empty()) {
    imageName = story["id"].get<std::string>() + "_story_image.png";
  }
  if (imageName != metadata.imageFileName().value_or("")) {
    throw KXACommandError(file + ": names the image \"" + imageName + "\", the package holds \"" +
                          metadata.imageFileName().value_or("") + "\"");
  }
}

void runSetData(const std::string& package, const std::string& file, bool json) {
  StorySession session(package);
  const auto metadata = session.open();
  auto bytes = readWholeFile(file);
  checkStoryData(bytes, file, *metadata);
  const WriteWatch watch(session.url());
  if (!session.manager().updateStoryDataForQuilloFileAtURL(session.url(), std::move(bytes))) {
    throw KXACommandError(session.url().string() + ": not a readable story package");
  }
  session.manager().saveStoryDataForQuilloFileAtURL(session.url());
  session.manager().waitForFileOperationsToComplete();
  if (!watch.written()) throw KXACommandError(session.url().string() + ": cannot be written");
  printDone(json, session.url(), "set-data");
}

void runImageEdit(const std::string& package, const std::optional<std::string>& image,
                  const std::optional<std::string>& backupName, bool json) {
  StorySession session(package);
  static_cast<void>(session.open());
  std::atomic<bool> succeeded{false};
  const auto completion = [&succeeded](bool result) { succeeded = result; };
  if (image) {
    const fs::path imageURL = fs::absolute(*image);
    if (!KXAImage::thumbnailWithContentsOfFile(imageURL, 1)) throw KXACommandError(*image + ": not a readable image");
    session.manager().updateImageForQuilloFileAtURL(session.url(), imageURL, backupName, completion);
  } else {
    if (!session.open()->originalImageFileName()) {
      throw KXACommandError(session.url().string() + ": has no original image to go back to");
    }
    session.manager().revertImageToOriginalForQuilloFileAtURL(session.url(), completion);
  }
  session.manager().waitForFileOperationsToComplete();
  if (!succeeded) throw KXACommandError(session.url().string() + ": cannot be written");
  printDone(json, session.url(), image ? "set-image" : "revert-image");
}

void runExtract(const std::string& package, const std::string& destination, bool json) {
  const fs::path url = packageURL(package);
  std::error_code error;
  fs::create_directories(destination, error);
  if (!KXCQuilloFileManager::isQuilloFileAtURL(url)) throw KXACommandError(package + ": not a story package");
  if (fs::exists(fs::path(destination) / KXCQuilloFileManager::kDescriptionFileName, error)) {
    throw KXACommandError(destination + ": already holds Data.json");
  }
  if (!KXCQuilloFileManager::extractQuilloDescriptionFileAtURL(url, destination)) {
    throw KXACommandError(package + ": Data.json cannot be extracted into " + destination);
  }
  if (json) printJsonLine({{"package", url.string()}, {"extracted", (fs::path(destination) / "Data.json").string()}});
}

void runNew(const std::string& package, const std::string& id, const std::string& image, bool json) {
  std::signal(SIGXFSZ, SIG_IGN);
  const fs::path url = packageURL(package);
  std::error_code error;
  std::string name = url.filename().string();
  std::transform(name.begin(), name.end(), name.begin(), [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  if (name.size() <= 7 || !name.ends_with(KXCQuilloFileManager::kPackageExtension)) {
    throw KXACommandError(package + ": a story package's name ends in .quillo");
  }
  if (fs::exists(url, error)) throw KXACommandError(package + ": already exists");
  if (id.empty()) throw KXACommandError("--id must not be empty");
  if (!KXAImage::thumbnailWithContentsOfFile(image, 1)) throw KXACommandError(image + ": not a readable image");
  std::string extension = fs::path(image).extension().string();
  if (extension.empty()) extension = ".png";
  const std::string imageName = id + "_story_image" + extension;
  if (!KXFLibZipArchiver::isSafeEntryName(imageName)) throw KXACommandError("--id makes an unusable entry name");

  const Json story = {{"id", id}, {"imageFileName", imageName}, {"spots", Json::array()}, {"persons", Json::array()}};
  std::string hidden(".");  // appended piece by piece: GCC 12 misreads "." + string at -O3
  hidden.append(url.filename().string());
  const fs::path partial = url.parent_path() / (hidden + ".new");
  const fs::path description = url.parent_path() / (hidden + ".Data.json");
  bool made = false;
  {
    std::ofstream stream(description, std::ios::binary | std::ios::trunc);
    stream << story.dump(2) << '\n';
    made = static_cast<bool>(stream.flush());
  }
  if (made) {
    auto archiver = KXFArchiver::forPath(partial);
    made = archiver && archiver->addFileToArchiveAtPath(description, KXCQuilloFileManager::kDescriptionFileName) &&
           archiver->addFileToArchiveAtPath(image, imageName) && archiver->close();
  }
  // Published by rename, so the name never holds half a package.
  if (made) {
    fs::rename(partial, url, error);
    made = !error;
  }
  fs::remove(description, error);
  fs::remove(partial, error);
  if (!made) throw KXACommandError(package + ": cannot be written");
  if (json) printJsonLine({{"package", url.string()}, {"id", id}, {"imageFileName", imageName}});
}

}  // namespace

void registerStoryCommands(CLI::App& app) {
  CLI::App* story = app.add_subcommand("story", "Story packages: metadata, story data and image, safely edited");
  story->require_subcommand(1);

  struct Options {
    std::string package, file, destination, id, image;
    std::optional<std::string> backupName;
    bool json = false;
  };
  const auto options = std::make_shared<Options>();

  CLI::App* info = story->add_subcommand("info", "The package's metadata");
  info->add_option("PACKAGE", options->package, "Story package")->required();
  info->add_flag("--json", options->json, "One JSON object");
  info->callback([options] { runInfo(options->package, options->json); });

  CLI::App* data = story->add_subcommand("data", "Prints the package's Data.json");
  data->add_option("PACKAGE", options->package, "Story package")->required();
  data->add_flag("--json", options->json, "Parsed and printed on one line");
  data->callback([options] { runData(options->package, options->json); });

  CLI::App* setData = story->add_subcommand("set-data", "Replaces Data.json and writes the package");
  setData->add_option("PACKAGE", options->package, "Story package")->required();
  setData->add_option("FILE", options->file, "New Data.json")->required();
  setData->add_flag("--json", options->json, "One JSON object on success");
  setData->callback([options] { runSetData(options->package, options->file, options->json); });

  CLI::App* setImage = story->add_subcommand("set-image", "Replaces the image, keeping the original once");
  setImage->add_option("PACKAGE", options->package, "Story package")->required();
  setImage->add_option("IMAGE", options->image, "New image")->required();
  setImage->add_option("--backup-name", options->backupName, "Entry name of the original's backup");
  setImage->add_flag("--json", options->json, "One JSON object on success");
  setImage->callback(
      [options] { runImageEdit(options->package, options->image, options->backupName, options->json); });

  CLI::App* revert = story->add_subcommand("revert-image", "Puts the original image back");
  revert->add_option("PACKAGE", options->package, "Story package")->required();
  revert->add_flag("--json", options->json, "One JSON object on success");
  revert->callback([options] { runImageEdit(options->package, std::nullopt, std::nullopt, options->json); });

  CLI::App* extract = story->add_subcommand("extract", "Extracts Data.json into a folder");
  extract->add_option("PACKAGE", options->package, "Story package")->required();
  extract->add_option("DEST", options->destination, "Folder (made when missing)")->required();
  extract->add_flag("--json", options->json, "One JSON object");
  extract->callback([options] { runExtract(options->package, options->destination, options->json); });

  CLI::App* make = story->add_subcommand("new", "Makes a package from an identifier and an image");
  make->add_option("PACKAGE", options->package, "New package (NAME.quillo)")->required();
  make->add_option("--id", options->id, "Story identifier")->required();
  make->add_option("--image", options->image, "Story image")->required();
  make->add_flag("--json", options->json, "One JSON object");
  make->callback([options] { runNew(options->package, options->id, options->image, options->json); });
}
