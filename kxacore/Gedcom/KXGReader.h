// File: KXGReader.h
//
// KXGReader reads a GEDCOM file as a stream of records: bytes in, any
// size of chunk; one record (a level-0 line and the lines below it) out at
// a time, to a delegate. It never holds more than the current record, one
// line's bytes and the file's first 64 KiB (until the character set is
// known).
//
//   struct Printer : KXGReaderDelegate {
//     void readerDidReadRecord(KXGReader&, const KXGRecord& record) override {
//       std::cout << record.root().tag << '\n';
//     }
//   } printer;
//   KXGReader reader(&printer);
//   reader.readFile("family.ged");    // or appendBytes(...) ... finish()
//
// Character sets: see KXGCharacterSet.h for how the set is chosen. Lines
// are split on the raw bytes (CR, LF or CR LF) for every ASCII-compatible
// set, and only lines holding a byte above 0x7F are decoded, so plain ASCII
// costs nothing. The first such line also settles what the bytes really
// are: a file declaring ANSEL, ANSI or ASCII whose line is valid UTF-8 is
// read as UTF-8 from there on, and a file declaring UTF-8 (without a byte
// order mark) whose line is not UTF-8 as Windows-1252; either is reported
// once as "charset-mismatch" (silently when the header names no set).
// UTF-16 is decoded as a stream and split after decoding. ANSEL lines are
// composed to NFC, so the same name reads the same from any character set.
//
// Lines: "LEVEL [@ID@] TAG [VALUE]". The value is the text after the one
// space that follows the tag, kept as written (leading and trailing spaces
// included: CONC joins pieces at any character). CONC and CONT lines are
// joined into the value of the line above them (CONT with a line feed) and
// do not appear in the record. Problems are reported to the delegate with
// their line number and the line is read past: a line with no level or no
// tag is dropped, the others are kept. Lines longer than kMaxLineBytes keep
// only their first kMaxLineBytes bytes.
//
// Ownership and threads: the delegate is not owned and must outlive the
// reader. The record and finding handed to the delegate are valid only
// during the call. A reader serves one thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Gedcom/KXGCharacterSet.h"
#include "kxacore/Gedcom/KXGFinding.h"

class KXCTextDecoder;

// One line of a record, continuations joined into its value.
struct KXGLine {
  std::uint64_t number = 0;  // 1-based line number in the file
  int level = 0;
  int parent = -1;   // index in the record of the line it belongs to; -1 for the root
  std::string xref;  // "@I1@" as written, "" when none
  std::string tag;
  std::string value;
};

// One record: its level-0 line first, then the lines below it in file order.
class KXGRecord {
 public:
  [[nodiscard]] std::span<const KXGLine> lines() const noexcept { return {lines_.data(), count_}; }
  [[nodiscard]] const KXGLine& root() const noexcept { return lines_.front(); }
  [[nodiscard]] std::size_t size() const noexcept { return count_; }
  [[nodiscard]] bool empty() const noexcept { return count_ == 0; }

 private:
  friend class KXGReader;
  // Lines are reused from record to record so their strings keep their capacity.
  KXGLine& appendLine();
  void clear() noexcept { count_ = 0; }
  std::vector<KXGLine> lines_;
  std::size_t count_ = 0;
};

class KXGReader;

// What the reader tells. The default bodies ignore the call.
class KXGReaderDelegate {
 public:
  virtual ~KXGReaderDelegate() = default;
  virtual void readerDidReadRecord(KXGReader& reader, const KXGRecord& record);
  virtual void readerDidFindProblem(KXGReader& reader, const KXGFinding& finding);
};

class KXGReader {
 public:
  // Bytes of a line kept at most; the rest of a longer line is dropped.
  static constexpr std::size_t kMaxLineBytes = std::size_t{1} << 20;
  // The longest line the format allows, in characters.
  static constexpr std::size_t kMaxLineLength = 255;
  // Bytes looked at before the character set is chosen.
  static constexpr std::size_t kHeadBytes = 64 * 1024;

  explicit KXGReader(KXGReaderDelegate* delegate);
  ~KXGReader();
  KXGReader(const KXGReader&) = delete;
  KXGReader& operator=(const KXGReader&) = delete;

  // Feeds the next bytes of the file.
  void appendBytes(std::span<const std::uint8_t> bytes);
  // Ends the file: the last line and record are delivered. Call once.
  void finish();
  // Reads the whole file at `path` in large chunks, then finish(). False
  // (and nothing delivered) when the file cannot be opened; a read error
  // later returns false after delivering what was read. `progress`, when
  // set, is called now and then with the bytes read and the file's size.
  bool readFile(const std::filesystem::path& path,
                const std::function<void(std::uint64_t, std::uint64_t)>& progress = {});

  // The set chosen from the first bytes (valid once bytes were seen).
  [[nodiscard]] const KXGCharacterSet& characterSet() const noexcept { return characterSet_; }
  // The set the bytes are read in now (differs after a mismatch).
  [[nodiscard]] KXCStringEncoding encoding() const noexcept { return encoding_; }
  [[nodiscard]] std::uint64_t lineCount() const noexcept { return lineNumber_; }
  [[nodiscard]] std::uint64_t byteCount() const noexcept { return byteCount_; }
  [[nodiscard]] std::uint64_t recordCount() const noexcept { return recordCount_; }

 private:
  void chooseCharacterSet();
  void splitLines(std::span<const std::uint8_t> bytes);
  void splitText(std::string_view text);
  void takeRawLine(std::string_view bytes);
  std::string_view decodeLine(std::string_view bytes);
  void settleEncoding(std::string_view bytes);
  void parseLine(std::string_view text);
  void addLine(int level, std::string_view xref, std::string_view tag, std::string_view value);
  void deliverRecord();
  void report(KXGSeverity severity, std::string_view code, std::string message,
              std::string_view tag = {}, std::string_view value = {});
  void report(std::string_view code, std::string message, std::string_view tag = {},
              std::string_view value = {});

  KXGReaderDelegate* delegate_;
  KXGCharacterSet characterSet_;
  KXCStringEncoding encoding_ = kKXCUTF8StringEncoding;
  bool decided_ = false;
  bool settled_ = false;       // the first non-ASCII line has been seen
  bool streamDecoding_ = false;  // UTF-16: decode first, split after
  bool finished_ = false;
  std::vector<std::uint8_t> head_;
  std::unique_ptr<KXCTextDecoder> streamDecoder_;
  std::unique_ptr<KXCTextDecoder> lineDecoder_;
  KXCStringEncoding lineDecoderEncoding_ = 0;
  std::string decoded_;   // UTF-16 decoded to UTF-8, awaiting the split
  std::string carry_;     // the start of a line cut by the chunk's end
  bool carryTruncated_ = false;
  bool pendingCR_ = false;
  std::string lineText_;  // the decoded form of a non-ASCII line
  KXGRecord record_;
  int previousLevel_ = -1;
  std::uint64_t lineNumber_ = 0;
  std::uint64_t byteCount_ = 0;
  std::uint64_t recordCount_ = 0;
};
