// kxacore text: text files in legacy encodings and ANSEL, decoded to UTF-8
// whole or line by line, and the list of encodings the fallback tries.

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCFileLineReader.h"
#include "kxacore/Files/Text/KXCStringEncoding.h"
#include "kxacore/Files/Text/KXCTextFileReader.h"
#include "tools/kxacore/Commands.h"

namespace {

struct TextOptions {
  std::string file;
  std::string encoding;
  bool stream = false;
  bool json = false;
};

KXCStringEncoding encodingNamed(const std::string& name) {
  const auto encoding = KXCStringEncodingFromName(name);
  if (!encoding) throw KXACommandError("unknown encoding: " + name + " (see: kxacore text encodings)");
  return *encoding;
}

std::string encodingName(KXCStringEncoding encoding) {
  const auto info = KXCStringEncodingInfoFor(encoding);
  return info ? std::string(info->name) : std::to_string(encoding);
}

std::vector<std::uint8_t> readFileBytes(const std::string& path) {
  std::error_code error;
  std::ifstream in(path, std::ios::binary);
  if (!in || std::filesystem::is_directory(path, error)) throw KXACommandError("cannot read " + path);
  std::vector<std::uint8_t> bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  if (in.bad()) throw KXACommandError("cannot read " + path);
  return bytes;
}

// Byte offset at which the decoder first met an invalid sequence: found by
// decoding again in large chunks, then byte by byte inside the chunk where the
// count rose. Runs only on the error path.
std::uint64_t firstInvalidOffset(std::span<const std::uint8_t> bytes, KXCStringEncoding encoding) {
  constexpr std::size_t kChunk = 1 << 16;
  std::string scratch;
  auto decoder = KXCTextDecoder::decoderForEncoding(encoding);
  std::size_t chunkStart = 0;
  for (; chunkStart < bytes.size(); chunkStart += kChunk) {
    decoder->decode(bytes.subspan(chunkStart, std::min(kChunk, bytes.size() - chunkStart)), scratch);
    scratch.clear();
    if (decoder->invalidSequences() > 0) break;
  }
  if (chunkStart >= bytes.size()) return bytes.size();  // only the cut end was invalid
  decoder = KXCTextDecoder::decoderForEncoding(encoding);
  decoder->decode(bytes.first(chunkStart), scratch);
  for (std::size_t pos = chunkStart; pos < bytes.size(); ++pos) {
    decoder->decode(bytes.subspan(pos, 1), scratch);
    scratch.clear();
    if (decoder->invalidSequences() > 0) return pos;
  }
  return bytes.size();
}

void runDecode(const TextOptions& options) {
  const KXCStringEncoding encoding = encodingNamed(options.encoding);
  const std::vector<std::uint8_t> bytes = readFileBytes(options.file);
  const auto text = KXCDecodeString(bytes, encoding);
  if (!text) {
    throw KXACommandError(options.file + ": bytes do not decode as " + encodingName(encoding) +
                          " (first invalid sequence at byte offset " +
                          std::to_string(firstInvalidOffset(bytes, encoding)) + ")");
  }
  if (options.json) {
    printJsonLine({{"file", options.file},
                   {"encoding", encodingName(encoding)},
                   {"number", encoding},
                   {"bytes", bytes.size()},
                   {"text", *text}});
    return;
  }
  std::cout.write(text->data(), static_cast<std::streamsize>(text->size()));
}

void printLine(const TextOptions& options, std::uint64_t number, const std::string& line) {
  if (options.json) {
    printJsonLine({{"line", number}, {"text", line}});
  } else {
    std::cout << line << '\n';
  }
}

void runLines(const TextOptions& options) {
  const KXCStringEncoding encoding =
      options.encoding.empty() ? kKXCUTF8StringEncoding : encodingNamed(options.encoding);
  if (options.stream) {
    const auto reader = KXCFileLineReader::withFilePath(options.file, encoding);
    if (!reader) throw KXACommandError("cannot read " + options.file);
    std::uint64_t number = 0;
    while (const auto line = reader->readLine()) printLine(options, ++number, *line);
    if (!reader->atEndOfFile()) {
      throw KXACommandError(options.file + ": line " + std::to_string(number + 1) + " does not decode as " +
                            encodingName(encoding));
    }
    return;
  }
  const auto reader = KXCTextFileReader::withFilePath(options.file, encoding);
  if (!reader) throw KXACommandError("cannot read " + options.file + " as text");
  if (reader->encoding() != encoding) {
    std::cerr << "kxacore: " << options.file << " does not decode as " << encodingName(encoding) << "; read as "
              << encodingName(reader->encoding()) << '\n';
  }
  std::uint64_t number = 0;
  for (const std::string& line : reader->lines()) printLine(options, ++number, line);
}

void runEncodings(bool json) {
  const auto print = [json](const KXCStringEncodingInfo& info, bool tried) {
    if (json) {
      printJsonLine({{"number", info.number}, {"name", info.name}, {"tried", tried}});
    } else {
      std::cout << info.number << '\t' << info.name << (tried ? "" : "\t(by name only, never guessed)") << '\n';
    }
  };
  if (!json) {
    std::cout << "# Trial order when a file does not decode in the encoding asked for: strict encodings\n"
                 "# first; UTF-16 only after a byte order mark; Mac Roman and those after it accept\n"
                 "# every byte; ISO Latin-1 last.\n";
  }
  for (const KXCStringEncodingInfo& info : KXCAvailableStringEncodings()) print(info, true);
  print(*KXCStringEncodingInfoFor(kKXCANSELStringEncoding), false);
}

}  // namespace

void registerTextCommands(CLI::App& app) {
  CLI::App* text = app.add_subcommand("text", "Text files in legacy encodings and ANSEL, decoded to UTF-8");
  text->require_subcommand(1);

  auto decodeOptions = std::make_shared<TextOptions>();
  CLI::App* decode = text->add_subcommand("decode", "Write the whole file decoded to UTF-8 on stdout, byte-exact");
  decode->add_option("FILE", decodeOptions->file, "File to decode")->required();
  decode->add_option("--encoding", decodeOptions->encoding, "Encoding name or number (ansel or 1537 for ANSEL)")
      ->required();
  decode->add_flag("--json", decodeOptions->json, "One JSON object: file, encoding, number, bytes, text");
  decode->callback([decodeOptions] { runDecode(*decodeOptions); });

  auto linesOptions = std::make_shared<TextOptions>();
  CLI::App* lines = text->add_subcommand("lines", "Print the file's lines decoded to UTF-8, one per line");
  lines->add_option("FILE", linesOptions->file, "File to read")->required();
  lines->add_option("--encoding", linesOptions->encoding, "Encoding name or number (default utf-8)");
  lines->add_flag("--stream", linesOptions->stream, "Read line by line instead of loading the file whole");
  lines->add_flag("--json", linesOptions->json, "One JSON object per line: line (from 1), text");
  lines->callback([linesOptions] { runLines(*linesOptions); });

  auto encodingsJson = std::make_shared<bool>(false);
  CLI::App* encodings = text->add_subcommand("encodings", "List the encodings with their numbers in trial order");
  encodings->add_flag("--json", *encodingsJson, "One JSON object per encoding: number, name, tried");
  encodings->callback([encodingsJson] { runEncodings(*encodingsJson); });
}
