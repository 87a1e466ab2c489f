#include "kxacore/Files/Archives/KXFFileExtractHelper.h"

std::optional<std::vector<std::uint8_t>> KXFFileExtractHelper::extractDataForFile(std::string_view fileName,
                                                                                  KXFUnarchiver& unarchiver) {
  KXFUnarchiverDelegate* const formerDelegate = unarchiver.delegate();
  unarchiver.setDelegate(this);
  setFileToExtract(fileName);
  std::optional<std::vector<std::uint8_t>> found;
  const bool walked = unarchiver.enumerateFilesWithBlock(
      [&](const std::string& name, std::vector<std::uint8_t>& bytes, bool& stop) {
        if (name != fileToExtract_) return;
        found = std::move(bytes);
        stop = true;
      });
  unarchiver.setDelegate(formerDelegate);
  if (!walked) return std::nullopt;
  return found;
}

void KXFFileExtractHelper::unarchiverWillUnarchiveFileTo(KXFUnarchiver&, const std::string& fileName, bool,
                                                         bool& shouldSkip, bool&) {
  if (fileName != fileToExtract_) shouldSkip = true;
}
