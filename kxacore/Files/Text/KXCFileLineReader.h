// KXCFileLineReader: a text file line by line, one line in memory at a time,
// for files too large to load whole.
//
//   auto reader = KXCFileLineReader::withFilePath("big.ged", kKXCUTF8StringEncoding);
//   if (!reader) return;                         // cannot open, or unknown encoding
//   while (auto line = reader->readLine()) use(*line);
//
// Lines end at LF; the LF and a CR before it are removed, a lone CR stays in
// the line. The last line may lack its LF. Each line's bytes are decoded on
// their own, up to the first NUL byte, strictly: a line that does not decode
// in the encoding gives nullopt, which a caller cannot tell from the end of
// the file (kept for callers written against that contract; decode with
// KXCTextDecoder to see such lines). Byte-oriented splitting suits ASCII-based
// encodings, ANSEL included; UTF-16 files are not split correctly.
//
// The file is read in blocks of 64 KiB, from which each line is copied into
// a line buffer, as a C-library line read would copy it: the buffer is kept
// between calls and grows to twice its size plus 100 bytes whenever fewer
// than 100 bytes of room remain.
//
// Thread safety: one thread at a time.
#pragma once

#include <cstdio>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCStringEncoding.h"

class KXCFileLineReader {
 private:
  struct ConstructionToken {
    explicit ConstructionToken() = default;
  };
  struct FileCloser {
    void operator()(std::FILE* file) const { std::fclose(file); }
  };
  using FilePtr = std::unique_ptr<std::FILE, FileCloser>;

 public:
  // Opens the file for reading; nullptr when it cannot be opened (a directory
  // included) or when `encoding` is unknown.
  static std::unique_ptr<KXCFileLineReader> withFilePath(const std::filesystem::path& path,
                                                         KXCStringEncoding encoding);

  // For withFilePath only (the token is private).
  KXCFileLineReader(ConstructionToken, FilePtr file, std::unique_ptr<KXCTextDecoder> decoder);
  KXCFileLineReader(const KXCFileLineReader&) = delete;
  KXCFileLineReader& operator=(const KXCFileLineReader&) = delete;
  ~KXCFileLineReader();

  // The next line without its line end; nullopt at the end of the file, on a
  // read error, or when the line does not decode.
  std::optional<std::string> readLine();

  // True once readLine() found nothing left to read: after readLine() gave
  // nullopt, false means the line did not decode (or the buffer could not grow).
  [[nodiscard]] bool atEndOfFile() const { return atEnd_; }

  // Bytes the line buffer holds now (0 before the first line and after the end).
  [[nodiscard]] std::size_t bufferCapacity() const { return buffer_.size(); }

 private:
  // Copies up to and including the next LF into the line buffer, setting
  // `length`; false when nothing was left. Throws std::bad_alloc when the
  // buffer cannot grow.
  bool readRawLine(std::size_t& length);

  FilePtr file_;
  std::unique_ptr<KXCTextDecoder> decoder_;
  std::vector<char> buffer_;
  std::vector<char> block_;  // read-ahead, cut into lines
  std::size_t blockPos_ = 0;
  std::size_t blockEnd_ = 0;
  bool atEnd_ = false;
};
