#include "kxacore/Files/Text/KXCTextFileReader.h"

#include <cstdio>

#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

struct FileCloser {
  void operator()(std::FILE* file) const { std::fclose(file); }
};

std::optional<std::vector<std::uint8_t>> readWholeFile(const std::filesystem::path& path) {
  std::error_code error;
  if (std::filesystem::is_directory(path, error)) return std::nullopt;
  const std::unique_ptr<std::FILE, FileCloser> file(std::fopen(path.c_str(), "rb"));
  if (!file) return std::nullopt;
  std::vector<std::uint8_t> bytes;
  const auto size = std::filesystem::file_size(path, error);
  if (!error) bytes.reserve(static_cast<std::size_t>(size));
  std::uint8_t chunk[65536];
  while (const std::size_t count = std::fread(chunk, 1, sizeof chunk, file.get())) {
    bytes.insert(bytes.end(), chunk, chunk + count);
  }
  if (std::ferror(file.get())) return std::nullopt;
  return bytes;
}

// The text and the encoding that decoded it: `requested` when it fits, else
// the first available encoding that does.
std::optional<std::pair<std::string, KXCStringEncoding>> decodeWithFallback(
    std::span<const std::uint8_t> bytes, KXCStringEncoding requested) {
  if (requested == kKXCANSELStringEncoding) {
    return std::pair{KXCTextFileReader::stringFromANSELData(bytes), requested};
  }
  if (!KXCStringEncodingInfoFor(requested)) return std::nullopt;
  if (auto text = KXCDecodeString(bytes, requested)) return std::pair{std::move(*text), requested};
  for (const KXCStringEncodingInfo& info : KXCAvailableStringEncodings()) {
    if (info.number == requested || !KXCStringEncodingIsTriable(info.number, bytes)) continue;
    if (auto text = KXCDecodeString(bytes, info.number)) return std::pair{std::move(*text), info.number};
  }
  return std::nullopt;
}

}  // namespace

std::unique_ptr<KXCTextFileReader> KXCTextFileReader::withFilePath(const std::filesystem::path& path,
                                                                   KXCStringEncoding encoding) {
  const auto bytes = readWholeFile(path);
  if (!bytes) return nullptr;
  auto decoded = decodeWithFallback(*bytes, encoding);
  if (!decoded) return nullptr;
  std::vector<std::string> lines;
  for (const std::string_view line : kxa_componentsSeparatedByNewline(decoded->first)) lines.emplace_back(line);
  return std::make_unique<KXCTextFileReader>(ConstructionToken{}, std::move(lines), decoded->second);
}

std::optional<std::string> KXCTextFileReader::lineAtIndex(std::uint64_t index) const {
  if (index >= lines_.size()) return std::nullopt;
  return lines_[index];
}

std::optional<std::string> KXCTextFileReader::readLine() {
  if (lineNum_ >= lines_.size()) return std::nullopt;
  return lines_[lineNum_++];
}

std::string KXCTextFileReader::stringFromANSELData(std::span<const std::uint8_t> bytes) {
  std::string text;
  KXCAppendANSELAsUTF8(bytes, text);
  return text;
}

void KXCAppendANSELAsUTF8(std::span<const std::uint8_t> bytes, std::string& out) {
  const auto decoder = KXCTextDecoder::decoderForEncoding(kKXCANSELStringEncoding);
  decoder->decode(bytes, out);
  decoder->finish(out);
}
