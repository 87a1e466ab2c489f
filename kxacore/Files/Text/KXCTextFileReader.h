// KXCTextFileReader: a whole text file in memory as UTF-8 lines, decoded from
// the encoding the caller names, or from the first encoding that fits when
// the named one does not; and the ANSEL decoder of genealogy exchange files.
//
//   auto reader = KXCTextFileReader::withFilePath("family.ged", kKXCANSELStringEncoding);
//   if (!reader) return;                        // unreadable, or no encoding fits
//   while (auto line = reader->readLine()) use(*line);
//
// Loading: ANSEL (1537) decodes the bytes as they are (every byte decodes).
// Any other encoding must decode every byte; when it does not, the encodings
// of KXCAvailableStringEncodings() are tried in their order (the UTF-16 ones
// only after a byte order mark) and the first that decodes without error is
// used; encoding() tells which. Lines are split at LF, CR LF, lone CR, VT, FF,
// NEL, U+2028 and U+2029; a final line end adds no empty line, and no line
// holds a line end.
//
// Thread safety: const members from any thread; readLine and reset need the
// caller to serialize.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCStringEncoding.h"

class KXCTextFileReader {
 public:
  // Loads the file at `path`. nullptr when the file cannot be read, when
  // `encoding` is unknown, or when neither it nor any available encoding
  // decodes the bytes (cannot happen in practice: ISO Latin-1 takes every byte).
  static std::unique_ptr<KXCTextFileReader> withFilePath(const std::filesystem::path& path,
                                                         KXCStringEncoding encoding);

  KXCTextFileReader(const KXCTextFileReader&) = delete;
  KXCTextFileReader& operator=(const KXCTextFileReader&) = delete;

  // The file's lines, without line ends.
  [[nodiscard]] const std::vector<std::string>& lines() const { return lines_; }
  // Index of the line readLine() returns next.
  [[nodiscard]] std::uint64_t lineNum() const { return lineNum_; }
  [[nodiscard]] std::uint64_t lineCount() const { return lines_.size(); }
  // The encoding the text was decoded with: the one asked for, or the one the fallback found.
  [[nodiscard]] KXCStringEncoding encoding() const { return encoding_; }

  // The line at `index`; nullopt when `index` is not below lineCount().
  [[nodiscard]] std::optional<std::string> lineAtIndex(std::uint64_t index) const;
  // The line at lineNum(), advancing lineNum(); nullopt once every line was read.
  std::optional<std::string> readLine();
  // Starts reading from the first line again.
  void reset() { lineNum_ = 0; }

  // ANSEL bytes to UTF-8: exactly one character per byte. ANSEL writes a
  // combining mark before its letter and Unicode after it, so the character
  // after a mark swaps places with it. Deliberately kept: a mark before a CR
  // stays before it; two marks in a row come out as second mark, letter,
  // first mark; a mark at the very end stays last. Never fails.
  [[nodiscard]] static std::string stringFromANSELData(std::span<const std::uint8_t> bytes);

 private:
  struct ConstructionToken {
    explicit ConstructionToken() = default;
  };

 public:
  // For withFilePath only (the token is private).
  KXCTextFileReader(ConstructionToken, std::vector<std::string> lines, KXCStringEncoding encoding)
      : lines_(std::move(lines)), encoding_(encoding) {}

 private:

  std::vector<std::string> lines_;
  std::uint64_t lineNum_ = 0;
  KXCStringEncoding encoding_;
};

// Appends the UTF-8 form of ANSEL `bytes` to `out` (as stringFromANSELData),
// for callers that reuse one buffer.
void KXCAppendANSELAsUTF8(std::span<const std::uint8_t> bytes, std::string& out);
