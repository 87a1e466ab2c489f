#include "kxacore/Files/Text/KXCFileLineReader.h"

#include <algorithm>
#include <cstring>
#include <new>

namespace {

constexpr std::size_t kMinimumRoom = 100;
// Bytes read from the file at a time; lines are cut from this block.
constexpr std::size_t kBlockSize = 1 << 16;

}  // namespace

std::unique_ptr<KXCFileLineReader> KXCFileLineReader::withFilePath(const std::filesystem::path& path,
                                                                   KXCStringEncoding encoding) {
  std::unique_ptr<KXCTextDecoder> decoder = KXCTextDecoder::decoderForEncoding(encoding);
  if (!decoder) return nullptr;
  std::error_code error;
  if (std::filesystem::is_directory(path, error)) return nullptr;
  FilePtr file(std::fopen(path.c_str(), "r"));
  if (!file) return nullptr;
  // The reader keeps its own read-ahead block; a second one in stdio would only copy.
  std::setvbuf(file.get(), nullptr, _IONBF, 0);
  return std::make_unique<KXCFileLineReader>(ConstructionToken{}, std::move(file), std::move(decoder));
}

KXCFileLineReader::KXCFileLineReader(ConstructionToken, FilePtr file, std::unique_ptr<KXCTextDecoder> decoder)
    : file_(std::move(file)), decoder_(std::move(decoder)) {}

KXCFileLineReader::~KXCFileLineReader() = default;

bool KXCFileLineReader::readRawLine(std::size_t& length) {
  bool readAny = false;
  for (;;) {
    if (blockPos_ == blockEnd_) {
      if (block_.empty()) block_.resize(kBlockSize);
      blockPos_ = 0;
      blockEnd_ = std::fread(block_.data(), 1, block_.size(), file_.get());
      if (blockEnd_ == 0) break;
    }
    const char* const start = block_.data() + blockPos_;
    const std::size_t available = blockEnd_ - blockPos_;
    const char* const lf = static_cast<const char*>(std::memchr(start, '\n', available));
    std::size_t take = lf == nullptr ? available : static_cast<std::size_t>(lf - start) + 1;
    readAny = true;
    // Into the line buffer in the rounds a line read of the free space
    // minus its terminator would take, so the buffer grows the same way.
    while (take > 0) {
      if (buffer_.size() - length < kMinimumRoom) buffer_.resize(buffer_.size() * 2 + kMinimumRoom);
      const std::size_t count = std::min(take, buffer_.size() - length - 1);
      std::memcpy(buffer_.data() + length, block_.data() + blockPos_, count);
      length += count;
      blockPos_ += count;
      take -= count;
    }
    if (lf != nullptr) break;
  }
  return readAny;
}

std::optional<std::string> KXCFileLineReader::readLine() {
  std::size_t length = 0;
  bool readAny = false;
  try {
    readAny = readRawLine(length);
  } catch (const std::bad_alloc&) {
    buffer_ = {};
    return std::nullopt;
  }
  if (!readAny) {
    buffer_ = {};
    atEnd_ = true;
    return std::nullopt;
  }
  if (length > 0 && buffer_[length - 1] == '\n') {
    --length;
    if (length > 0 && buffer_[length - 1] == '\r') --length;
  }
  // The line is decoded as a zero-terminated string: a NUL ends it.
  if (const void* nul = std::memchr(buffer_.data(), '\0', length)) {
    length = static_cast<std::size_t>(static_cast<const char*>(nul) - buffer_.data());
  }
  const auto bytes = std::span(reinterpret_cast<const std::uint8_t*>(buffer_.data()), length);
  std::string line;
  line.reserve(length);
  const std::uint64_t invalidBefore = decoder_->invalidSequences();
  decoder_->decode(bytes, line);
  decoder_->finish(line);
  if (decoder_->invalidSequences() != invalidBefore) return std::nullopt;
  return line;
}
