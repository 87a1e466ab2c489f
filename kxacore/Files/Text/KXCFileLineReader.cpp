#include "kxacore/Files/Text/KXCFileLineReader.h"

#include <cstring>
#include <new>

namespace {

constexpr std::size_t kMinimumRoom = 100;

}  // namespace

std::unique_ptr<KXCFileLineReader> KXCFileLineReader::withFilePath(const std::filesystem::path& path,
                                                                   KXCStringEncoding encoding) {
  std::unique_ptr<KXCTextDecoder> decoder = KXCTextDecoder::decoderForEncoding(encoding);
  if (!decoder) return nullptr;
  std::error_code error;
  if (std::filesystem::is_directory(path, error)) return nullptr;
  FilePtr file(std::fopen(path.c_str(), "r"));
  if (!file) return nullptr;
  return std::make_unique<KXCFileLineReader>(ConstructionToken{}, std::move(file), std::move(decoder));
}

KXCFileLineReader::KXCFileLineReader(ConstructionToken, FilePtr file, std::unique_ptr<KXCTextDecoder> decoder)
    : file_(std::move(file)), decoder_(std::move(decoder)) {}

KXCFileLineReader::~KXCFileLineReader() = default;

bool KXCFileLineReader::readRawLine(std::size_t& length) {
  std::FILE* const file = file_.get();
  bool readAny = false;
  // Like fgets into the free part of the buffer, round after round, but the
  // byte count is kept, so a NUL in the line cannot hide the rest of it.
  flockfile(file);
  for (;;) {
    if (buffer_.size() - length < kMinimumRoom) buffer_.resize(buffer_.size() * 2 + kMinimumRoom);
    char* const room = buffer_.data() + length;
    const std::size_t roomSize = buffer_.size() - length - 1;  // fgets keeps one byte for its NUL
    std::size_t count = 0;
    int c = 0;
    while (count < roomSize && (c = getc_unlocked(file)) != EOF) {
      room[count++] = static_cast<char>(c);
      if (c == '\n') break;
    }
    length += count;
    readAny = readAny || count > 0;
    if (c == '\n' || c == EOF) break;
  }
  funlockfile(file);
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
