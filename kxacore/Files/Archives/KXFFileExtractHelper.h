// Pulls one named entry of an open unarchiver out as bytes, by walking the
// entries with itself as the unarchiver's delegate (skipping every other
// name) and putting the former delegate back afterwards.
//
// One thread at a time; the unarchiver is borrowed for the call only.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Files/Archives/KXFUnarchiver.h"

class KXFFileExtractHelper : public KXFUnarchiverDelegate {
 public:
  [[nodiscard]] const std::string& fileToExtract() const noexcept { return fileToExtract_; }
  void setFileToExtract(std::string_view name) { fileToExtract_ = std::string(name); }

  // The bytes of the entry named `fileName` ('\' and '/' count as equal);
  // none when the walk failed or no entry has that name. Errors of the walk
  // are not forwarded to the former delegate.
  [[nodiscard]] std::optional<std::vector<std::uint8_t>> extractDataForFile(std::string_view fileName,
                                                                            KXFUnarchiver& unarchiver);

  // Skips every entry whose name is not fileToExtract() ('\' and '/' count as equal).
  void unarchiverWillUnarchiveFileTo(KXFUnarchiver& unarchiver, const std::string& fileName, bool isDirectory,
                                     bool& shouldSkip, bool& shouldStop) override;

 private:
  std::string fileToExtract_;
};
