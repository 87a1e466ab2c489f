#include "kxacore/Gedcom/KXGReader.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

#include <unicode/bytestream.h>
#include <unicode/normalizer2.h>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Files/Text/KXCStringEncoding.h"

namespace {

constexpr std::size_t kChunkBytes = std::size_t{1} << 20;

struct FileCloser {
  void operator()(std::FILE* file) const noexcept { std::fclose(file); }
};

std::span<const std::uint8_t> asBytes(std::string_view text) {
  return {reinterpret_cast<const std::uint8_t*>(text.data()), text.size()};
}

bool hasHighByte(std::string_view text) noexcept {
  // Word-wise: most lines of most files are plain ASCII.
  std::size_t i = 0;
  for (; i + 8 <= text.size(); i += 8) {
    std::uint64_t word = 0;
    std::memcpy(&word, text.data() + i, 8);
    if ((word & 0x8080808080808080ULL) != 0) return true;
  }
  for (; i < text.size(); ++i) {
    if ((static_cast<unsigned char>(text[i]) & 0x80) != 0) return true;
  }
  return false;
}

// Characters, not bytes: the length limit counts characters.
std::size_t utf8Length(std::string_view text) noexcept {
  std::size_t count = 0;
  for (const char c : text) count += (static_cast<unsigned char>(c) & 0xC0) != 0x80;
  return count;
}

bool isTagCharacter(char c) noexcept {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '_';
}

std::string shortened(std::string_view text) {
  constexpr std::size_t kShown = 80;
  if (text.size() <= kShown) return std::string(text);
  std::size_t cut = kShown;
  while (cut > 0 && (static_cast<unsigned char>(text[cut]) & 0xC0) == 0x80) --cut;
  return std::string(text.substr(0, cut)) + "...";
}

// ANSEL writes a letter's marks as separate characters: compose them (NFC),
// so "Jürgen" from an ANSEL file equals "Jürgen" from a UTF-8 one.
void composeInPlace(std::string& text) {
  UErrorCode status = U_ZERO_ERROR;
  const icu::Normalizer2* nfc = icu::Normalizer2::getNFCInstance(status);
  if (U_FAILURE(status) || nfc->isNormalizedUTF8(text, status) || U_FAILURE(status)) return;
  std::string composed;
  icu::StringByteSink<std::string> sink(&composed, static_cast<int32_t>(text.size()));
  status = U_ZERO_ERROR;
  nfc->normalizeUTF8(0, text, sink, nullptr, status);
  if (U_SUCCESS(status)) text.swap(composed);
}

}  // namespace

KXGLine& KXGRecord::appendLine() {
  if (count_ == lines_.size()) lines_.emplace_back();
  KXGLine& line = lines_[count_++];
  line.xref.clear();
  line.tag.clear();
  line.value.clear();
  line.parent = -1;
  return line;
}

void KXGReaderDelegate::readerDidReadRecord(KXGReader&, const KXGRecord&) {}
void KXGReaderDelegate::readerDidFindProblem(KXGReader&, const KXGFinding&) {}

KXGReader::KXGReader(KXGReaderDelegate* delegate) : delegate_(delegate) {}

KXGReader::~KXGReader() = default;

void KXGReader::report(KXGSeverity severity, std::string_view code, std::string message,
                       std::string_view tag, std::string_view value) {
  if (delegate_ == nullptr) return;
  const KXGFinding finding{std::max<std::uint64_t>(lineNumber_, 1), severity, std::string(code), std::move(message),
                           std::string(tag), shortened(value)};
  delegate_->readerDidFindProblem(*this, finding);
}

void KXGReader::report(std::string_view code, std::string message, std::string_view tag,
                       std::string_view value) {
  const KXGCheckCodeInfo* info = KXGCheckCodeInfoForCode(code);
  report(info ? info->severity : KXGSeverity::kError, code, std::move(message), tag, value);
}

void KXGReader::appendBytes(std::span<const std::uint8_t> bytes) {
  if (finished_ || bytes.empty()) return;
  byteCount_ += bytes.size();
  if (!decided_) {
    head_.insert(head_.end(), bytes.begin(), bytes.end());
    if (head_.size() < kHeadBytes) return;
    chooseCharacterSet();
    return;
  }
  splitLines(bytes);
}

void KXGReader::chooseCharacterSet() {
  decided_ = true;
  characterSet_ = KXGDetectCharacterSet(head_);
  encoding_ = characterSet_.encoding;
  if (encoding_ == kKXCUTF16LittleEndianStringEncoding ||
      encoding_ == kKXCUTF16BigEndianStringEncoding) {
    streamDecoding_ = true;
    settled_ = true;
    streamDecoder_ = KXCTextDecoder::decoderForEncoding(encoding_);
  }
  std::vector<std::uint8_t> head = std::move(head_);
  head_ = {};
  const std::span<const std::uint8_t> body =
      std::span<const std::uint8_t>(head).subspan(std::min(characterSet_.bomLength, head.size()));
  splitLines(body);
}

void KXGReader::splitLines(std::span<const std::uint8_t> bytes) {
  if (!streamDecoding_) {
    splitText(std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size()));
    return;
  }
  decoded_.clear();
  if (!streamDecoder_) return;
  const std::uint64_t invalidBefore = streamDecoder_->invalidSequences();
  streamDecoder_->decode(bytes, decoded_);
  if (streamDecoder_->invalidSequences() != invalidBefore) {
    report("text-invalid", "Bytes that are not " + KXGEncodingDisplayName(encoding_) +
                               " were replaced by U+FFFD near here.");
  }
  splitText(decoded_);
}

void KXGReader::splitText(std::string_view text) {
  std::size_t pos = 0;
  if (pendingCR_ && !text.empty()) {
    pendingCR_ = false;
    if (text.front() == '\n') pos = 1;
  }
  while (pos < text.size()) {
    const char* begin = text.data() + pos;
    const char* end = text.data() + text.size();
    const char* stop = std::find_if(begin, end, [](char c) { return c == '\n' || c == '\r'; });
    const std::string_view piece(begin, static_cast<std::size_t>(stop - begin));
    if (stop == end) {
      // The line goes on in the next chunk.
      const std::size_t room = kMaxLineBytes > carry_.size() ? kMaxLineBytes - carry_.size() : 0;
      if (piece.size() > room) carryTruncated_ = true;
      carry_.append(piece.substr(0, std::min(room, piece.size())));
      return;
    }
    if (carry_.empty() && !carryTruncated_) {
      takeRawLine(piece);
    } else {
      const std::size_t room = kMaxLineBytes > carry_.size() ? kMaxLineBytes - carry_.size() : 0;
      if (piece.size() > room) carryTruncated_ = true;
      carry_.append(piece.substr(0, std::min(room, piece.size())));
      takeRawLine(carry_);
      carry_.clear();
    }
    carryTruncated_ = false;
    pos = static_cast<std::size_t>(stop - text.data()) + 1;
    if (*stop == '\r') {
      if (pos < text.size()) {
        if (text[pos] == '\n') ++pos;
      } else {
        pendingCR_ = true;
      }
    }
  }
}

void KXGReader::finish() {
  if (finished_) return;
  if (!decided_) chooseCharacterSet();
  if (streamDecoding_ && streamDecoder_) {
    const std::uint64_t invalidBefore = streamDecoder_->invalidSequences();
    decoded_.clear();
    streamDecoder_->finish(decoded_);
    if (streamDecoder_->invalidSequences() != invalidBefore) {
      report("text-invalid", "The file ends inside a character.");
    }
    // Whatever finish() flushed goes through the splitter as a last chunk.
    const std::string tail = std::move(decoded_);
    splitText(tail);
  }
  finished_ = true;
  if (!carry_.empty() || carryTruncated_) {
    takeRawLine(carry_);
    carry_.clear();
  }
  deliverRecord();
}

bool KXGReader::readFile(const std::filesystem::path& path,
                         const std::function<void(std::uint64_t, std::uint64_t)>& progress) {
  std::error_code error;
  if (std::filesystem::is_directory(path, error)) return false;
  const std::unique_ptr<std::FILE, FileCloser> file(std::fopen(path.c_str(), "rb"));
  if (!file) return false;
  const std::uintmax_t size = std::filesystem::file_size(path, error);
  const std::uint64_t total = error ? 0 : static_cast<std::uint64_t>(size);
  std::vector<std::uint8_t> chunk(kChunkBytes);
  std::uint64_t done = 0;
  if (progress) progress(0, total);
  while (true) {
    const std::size_t n = std::fread(chunk.data(), 1, chunk.size(), file.get());
    if (n > 0) {
      appendBytes(std::span<const std::uint8_t>(chunk.data(), n));
      done += n;
      if (progress) progress(done, total);
    }
    if (n < chunk.size()) break;
  }
  const bool readError = std::ferror(file.get()) != 0;
  finish();
  return !readError;
}

void KXGReader::settleEncoding(std::string_view bytes) {
  settled_ = true;
  const bool validUTF8 = kxa_isValidUTF8(bytes);
  const bool declaredSomething = !characterSet_.declared.empty();
  KXCStringEncoding better = encoding_;
  if (encoding_ != kKXCUTF8StringEncoding && validUTF8) {
    better = kKXCUTF8StringEncoding;
  } else if ((encoding_ == kKXCUTF8StringEncoding && !validUTF8 && characterSet_.bomLength == 0) ||
             encoding_ == kKXCASCIIStringEncoding) {
    better = KXCDecodeString(asBytes(bytes), kKXCWindowsCP1252StringEncoding)
                 ? kKXCWindowsCP1252StringEncoding
                 : kKXCISOLatin1StringEncoding;
  }
  if (better == encoding_) return;
  if (declaredSomething) {
    report("charset-mismatch",
           "The header declares " + characterSet_.declared + ", but the text is written in " +
               KXGEncodingDisplayName(better) + "; the file is read as " +
               KXGEncodingDisplayName(better) + ".",
           {}, bytes);
  }
  encoding_ = better;
}

std::string_view KXGReader::decodeLine(std::string_view bytes) {
  if (!hasHighByte(bytes)) return bytes;
  if (streamDecoding_) return bytes;  // already UTF-8 from the stream decoder
  if (!settled_) settleEncoding(bytes);
  if (encoding_ == kKXCUTF8StringEncoding && kxa_isValidUTF8(bytes)) return bytes;
  if (!lineDecoder_ || encoding_ != lineDecoderEncoding_) {
    lineDecoder_ = KXCTextDecoder::decoderForEncoding(encoding_);
    lineDecoderEncoding_ = encoding_;
  }
  lineText_.clear();
  if (!lineDecoder_) {
    // No converter for this set: show the bytes as Latin-1 rather than lose them.
    for (const char c : bytes) {
      const auto byte = static_cast<unsigned char>(c);
      if (byte < 0x80) {
        lineText_.push_back(c);
      } else {
        lineText_.push_back(static_cast<char>(0xC0 | (byte >> 6)));
        lineText_.push_back(static_cast<char>(0x80 | (byte & 0x3F)));
      }
    }
    return lineText_;
  }
  const std::uint64_t invalidBefore = lineDecoder_->invalidSequences();
  lineDecoder_->decode(asBytes(bytes), lineText_);
  lineDecoder_->finish(lineText_);
  if (encoding_ == kKXCANSELStringEncoding) composeInPlace(lineText_);
  if (lineDecoder_->invalidSequences() != invalidBefore) {
    report("text-invalid",
           "This line holds bytes that are not " + KXGEncodingDisplayName(encoding_) +
               "; they are shown as U+FFFD.",
           {}, lineText_);
  }
  return lineText_;
}

void KXGReader::takeRawLine(std::string_view bytes) {
  ++lineNumber_;
  const bool truncated = carryTruncated_;
  const std::string_view text = decodeLine(bytes);
  if (truncated || utf8Length(text) > kMaxLineLength) {
    report("line-too-long",
           truncated ? "The line is longer than " + std::to_string(kMaxLineBytes) +
                           " bytes; the rest of it is ignored."
                     : "The line is longer than 255 characters, which many programs cut.",
           {}, text);
  }
  if (std::memchr(text.data(), 0, text.size()) != nullptr) {
    report("text-invalid", "The line holds NUL bytes: this is not text.");
  }
  parseLine(text);
}

void KXGReader::parseLine(std::string_view text) {
  if (kxa_trim(text).empty()) {
    report("line-blank", "An empty line.");
    return;
  }
  std::size_t pos = 0;
  while (pos < text.size() && (text[pos] == ' ' || text[pos] == '\t')) ++pos;
  if (pos > 0) report("line-leading-space", "White space before the level number.", {}, text);
  // A byte-order mark repeated inside the file (files pasted together).
  if (text.substr(pos, 3) == "\xEF\xBB\xBF") pos += 3;

  const std::size_t levelStart = pos;
  while (pos < text.size() && text[pos] >= '0' && text[pos] <= '9') ++pos;
  const std::size_t digits = pos - levelStart;
  if (digits == 0 || digits > 2 || (pos < text.size() && text[pos] != ' ' && text[pos] != '\t')) {
    report("line-malformed-level",
           "The line does not start with a level number; it is ignored.", {}, text);
    return;
  }
  int level = 0;
  for (std::size_t i = levelStart; i < pos; ++i) level = level * 10 + (text[i] - '0');

  bool extraSpace = false;
  const auto skipDelimiter = [&] {
    std::size_t spaces = 0;
    while (pos < text.size() && (text[pos] == ' ' || text[pos] == '\t')) {
      ++pos;
      ++spaces;
    }
    if (spaces > 1 || (spaces == 1 && text[pos - 1] == '\t')) extraSpace = true;
  };
  skipDelimiter();

  std::string_view xref;
  if (pos < text.size() && text[pos] == '@') {
    const std::size_t end = text.find_first_of(" \t", pos);
    xref = text.substr(pos, end == std::string_view::npos ? std::string_view::npos : end - pos);
    pos += xref.size();
    if (xref.size() < 3 || xref.back() != '@' ||
        xref.substr(1, xref.size() - 2).find('@') != std::string_view::npos) {
      report("line-malformed-id", "The record id " + std::string(xref) + " is not of the form @ID@.",
             {}, text);
    }
    skipDelimiter();
  }

  const std::size_t tagStart = pos;
  while (pos < text.size() && text[pos] != ' ' && text[pos] != '\t') ++pos;
  const std::string_view tag = text.substr(tagStart, pos - tagStart);
  if (tag.empty()) {
    report("line-missing-tag", "The line has no tag; it is ignored.", {}, text);
    return;
  }
  if (!std::all_of(tag.begin(), tag.end(), isTagCharacter)) {
    report("line-malformed-tag", "The tag " + std::string(tag) +
                                     " holds characters other than letters, digits and _.",
           tag, text);
  }
  if (extraSpace) {
    report("line-extra-space", "More than one space between the parts of the line.", tag, text);
  }
  // The value is everything after the single delimiter, spaces included.
  std::string_view value;
  if (pos < text.size()) value = text.substr(pos + 1);

  if (level > previousLevel_ + 1) {
    if (previousLevel_ < 0 && level > 0) {
      report("line-level-jump",
             "Level " + std::to_string(level) + " with no record open; the line is ignored.", tag,
             text);
      return;
    }
    report("line-level-jump",
           "The level jumps from " + std::to_string(previousLevel_) + " to " +
               std::to_string(level) + ".",
           tag, text);
  }
  addLine(level, xref, tag, value);
}

void KXGReader::addLine(int level, std::string_view xref, std::string_view tag,
                        std::string_view value) {
  if (level == 0) {
    deliverRecord();
    previousLevel_ = 0;
    KXGLine& line = record_.appendLine();
    line.number = lineNumber_;
    line.level = 0;
    line.xref.assign(xref);
    line.tag.assign(tag);
    line.value.assign(value);
    return;
  }
  // The nearest line above with a lower level owns this one.
  int parent = static_cast<int>(record_.count_) - 1;
  while (parent >= 0 && record_.lines_[static_cast<std::size_t>(parent)].level >= level) {
    parent = record_.lines_[static_cast<std::size_t>(parent)].parent;
  }
  const bool continuation = tag == "CONC" || tag == "CONT";
  if (continuation) {
    // Levels of CONC/CONT do not move the structure.
    if (parent < 0) {
      report("line-misplaced-continuation", "A continuation with no line to continue.", tag, value);
      return;
    }
    KXGLine& owner = record_.lines_[static_cast<std::size_t>(parent)];
    if (owner.level != level - 1) {
      report("line-misplaced-continuation",
             "The continuation is not directly below the line it continues.", tag, value);
    }
    if (tag == "CONT") owner.value.push_back('\n');
    owner.value.append(value);
    previousLevel_ = level;
    return;
  }
  previousLevel_ = level;
  KXGLine& line = record_.appendLine();
  line.number = lineNumber_;
  line.level = level;
  line.parent = parent;
  line.xref.assign(xref);
  line.tag.assign(tag);
  line.value.assign(value);
}

void KXGReader::deliverRecord() {
  if (record_.empty()) return;
  ++recordCount_;
  if (delegate_ != nullptr) delegate_->readerDidReadRecord(*this, record_);
  record_.clear();
}
