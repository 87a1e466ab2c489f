#include "kxacore/Files/Archives/KXFFileExtractHelper.h"

#include <algorithm>

namespace {

// Compared with '\' taken as '/': the walk only normalises names after the
// skip question, and callers ask for "dir/file" either way.
bool sameEntryName(std::string_view a, std::string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](char x, char y) {
    return (x == '\\' ? '/' : x) == (y == '\\' ? '/' : y);
  });
}

}  // namespace

std::optional<std::vector<std::uint8_t>> KXFFileExtractHelper::extractDataForFile(std::string_view fileName,
                                                                                  KXFUnarchiver& unarchiver) {
  KXFUnarchiverDelegate* const formerDelegate = unarchiver.delegate();
  unarchiver.setDelegate(this);
  setFileToExtract(fileName);
  std::optional<std::vector<std::uint8_t>> found;
  const bool walked = unarchiver.enumerateFilesWithBlock(
      [&](const std::string& name, std::vector<std::uint8_t>& bytes, bool& stop) {
        if (!sameEntryName(name, fileToExtract_)) return;
        found = std::move(bytes);
        stop = true;
      });
  unarchiver.setDelegate(formerDelegate);
  if (!walked) return std::nullopt;
  return found;
}

void KXFFileExtractHelper::unarchiverWillUnarchiveFileTo(KXFUnarchiver&, const std::string& fileName, bool,
                                                         bool& shouldSkip, bool&) {
  if (!sameEntryName(fileName, fileToExtract_)) shouldSkip = true;
}
