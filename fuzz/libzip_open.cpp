// Arbitrary bytes opened as an archive by KXFLibZipArchiver, without and with
// a password: every entry is located, read and extracted into a scratch
// folder, then every change is discarded.
//
// Properties checked (abort on failure):
//   - reading an entry gives nothing or an empty buffer, never bytes;
//   - extraction writes at most the one target below the scratch folder, and
//     nothing beside it;
//   - the archive file itself is never changed.
#include <unistd.h>
#include <zip.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "kxacore/Files/Archives/KXFLibZipArchiver.h"

namespace {

namespace fs = std::filesystem;

void check(bool condition) {
  if (!condition) std::abort();
}

const fs::path& scratch() {
  static const fs::path folder = [] {
    const fs::path made = fs::temp_directory_path() / ("kxacore-fuzz-libzip-" + std::to_string(::getpid()));
    fs::remove_all(made);
    fs::create_directories(made / "out");
    return made;
  }();
  return folder;
}

std::string contents(const fs::path& file) {
  std::ifstream stream(file, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>());
}

void walk(const fs::path& archivePath, const std::optional<std::string>& password) {
  auto archiver = KXFLibZipArchiver::archiverForPath(archivePath, password);
  if (!archiver) return;
  const zip_int64_t count = zip_get_num_entries(archiver->zipFile(), 0);
  for (zip_int64_t i = 0; i < count && i < 64; ++i) {
    const char* name = zip_get_name(archiver->zipFile(), static_cast<zip_uint64_t>(i), 0);
    if (!name) continue;
    const std::string entry(name);
    static_cast<void>(archiver->checkContainsFile(entry));
    const auto data = archiver->fileDataForFileWithName(entry);
    check(!data || data->empty());
    const fs::path out = scratch() / "out";
    static_cast<void>(archiver->extractFileWithName(entry, out));
    std::size_t written = 0;
    for (const auto& item : fs::recursive_directory_iterator(out)) {
      static_cast<void>(item);
      ++written;
    }
    check(written <= 1);
    std::size_t beside = 0;
    for (const auto& item : fs::directory_iterator(scratch())) {
      static_cast<void>(item);
      ++beside;
    }
    check(beside == 2);  // the archive and "out"
    for (const auto& item : fs::directory_iterator(out)) fs::remove_all(item.path());
  }
  archiver->discardChanges();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const fs::path archivePath = scratch() / "input.zip";
  const std::string input(reinterpret_cast<const char*>(data), size);
  std::ofstream(archivePath, std::ios::binary | std::ios::trunc) << input;
  walk(archivePath, std::nullopt);
  walk(archivePath, "pw");
  // Opening an empty file prepares a new archive; closing it writes nothing.
  if (!input.empty()) check(contents(archivePath) == input);
  return 0;
}
