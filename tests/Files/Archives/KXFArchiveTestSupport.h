// Helpers shared by the archive tests: a scratch folder per test, file
// contents, a delegate that records every call, and running the peer tools
// (Python's zipfile, Info-ZIP, 7-Zip) when they are installed.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <algorithm>
#include <sys/wait.h>
#include <unistd.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <optional>
#include <iterator>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Files/Archives/KXFArchiver.h"
#include "kxacore/Files/Archives/KXFUnarchiver.h"

namespace fs = std::filesystem;

inline void kxfWriteFile(const fs::path& path, std::string_view contents) {
  fs::create_directories(path.parent_path());
  std::ofstream out(path, std::ios::binary);
  out.write(contents.data(), static_cast<std::streamsize>(contents.size()));
}

inline std::string kxfReadFile(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// Bytes that deflate a little but not to nothing.
inline std::string kxfSampleBytes(std::size_t size, unsigned seed = 1) {
  std::string bytes(size, '\0');
  std::uint32_t state = seed * 2654435761u + 1;
  for (std::size_t i = 0; i < size; ++i) {
    state = state * 1103515245u + 12345u;
    bytes[i] = static_cast<char>((i % 7 == 0) ? (state >> 24) : ('a' + (i % 23)));
  }
  return bytes;
}

// Runs a shell command; its exit status, or -1.
inline int kxfRun(const std::string& command) {
  const int status = std::system(command.c_str());
  return (status != -1 && WIFEXITED(status)) ? WEXITSTATUS(status) : -1;
}

inline bool kxfHaveTool(const std::string& name) {
  return kxfRun("command -v " + name + " >/dev/null 2>&1") == 0;
}

// Runs Python code with the scratch folder as argv[1]; status 0 on success.
inline int kxfRunPython(const fs::path& folder, const std::string& code) {
  const fs::path script = folder / "script.py";
  kxfWriteFile(script, code);
  return kxfRun("python3 '" + script.string() + "' '" + folder.string() + "' >/dev/null 2>&1");
}

class KXFArchiveTest : public ::testing::Test {
 protected:
  void SetUp() override {
    const auto* info = ::testing::UnitTest::GetInstance()->current_test_info();
    std::string name = std::string(info->test_suite_name()) + "-" + info->name();
    for (char& c : name) {
      if (c == '/') c = '_';
    }
    folder_ = fs::temp_directory_path() / ("kxazip-" + std::to_string(::getpid())) / name;
    fs::remove_all(folder_);
    fs::create_directories(folder_);
  }
  void TearDown() override { fs::remove_all(folder_); }

  // Writes `files` (name, contents) under source/ and archives them with those names.
  fs::path makeArchive(const std::vector<std::pair<std::string, std::string>>& files,
                       std::optional<std::string> password = std::nullopt, const std::string& name = "a.zip") {
    const fs::path archivePath = folder_ / name;
    auto archiver = KXFArchiver::forPath(archivePath, std::move(password));
    EXPECT_NE(archiver, nullptr);
    for (const auto& [entryName, contents] : files) {
      const fs::path source = folder_ / "source" / std::to_string(std::hash<std::string>{}(entryName));
      kxfWriteFile(source, contents);
      EXPECT_TRUE(archiver->addFileToArchiveAtPath(source, entryName));
    }
    EXPECT_TRUE(archiver->close());
    return archivePath;
  }

  fs::path folder_;
};

// Records every unarchiver delegate call.
struct KXFRecordingUnarchiverDelegate : KXFUnarchiverDelegate {
  struct Error {
    std::int64_t code;
    std::string description;
  };
  std::vector<Error> errors;
  std::vector<std::string> willNames;
  std::vector<bool> willDirectories;
  std::vector<std::string> progressNames;
  std::vector<std::string> didNames;
  std::string skipName;
  std::function<std::string(const std::string&)> correct;
  int stopAfterDid = -1;
  bool stopInProgress = false;

  void unarchiverDidRaiseError(KXFUnarchiver&, std::int64_t code, const std::string& description) override {
    errors.push_back({code, description});
  }
  std::string correctedNameForUnarchiverAndFileName(KXFUnarchiver&, const std::string& fileName) override {
    return correct ? correct(fileName) : fileName;
  }
  void unarchiverWillUnarchiveFileTo(KXFUnarchiver&, const std::string& fileName, bool isDirectory, bool& skip,
                                     bool&) override {
    willNames.push_back(fileName);
    willDirectories.push_back(isDirectory);
    if (fileName == skipName) skip = true;
  }
  void unarchiverUnarchivingFileTo(KXFUnarchiver&, const std::string& fileName, std::uint64_t,
                                   bool& stop) override {
    progressNames.push_back(fileName);
    if (stopInProgress) stop = true;
  }
  void unarchiverDidUnarchiveFileTo(KXFUnarchiver&, const std::string& fileName, bool& stop) override {
    didNames.push_back(fileName);
    if (static_cast<int>(didNames.size()) == stopAfterDid) stop = true;
  }
};
