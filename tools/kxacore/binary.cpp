// kxacore binary: encode values into the compact binary stream and decode
// them back, as space-separated hex.

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCDataReader.h"
#include "kxacore/Files/Text/KXCDataWriter.h"
#include "tools/kxacore/Commands.h"

namespace {

struct BinaryOptions {
  std::vector<std::string> values;  // encode: TYPE:VALUE
  std::string hex;                  // decode
  std::vector<std::string> types;   // decode
  bool json = false;
};

int hexDigit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// "80 01" or "8001"; white space anywhere between digit pairs is ignored.
std::vector<std::uint8_t> parseHex(const std::string& text, const std::string& what) {
  std::vector<std::uint8_t> bytes;
  int pending = -1;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (c == ' ' || c == '\t' || c == '\n') continue;
    const int digit = hexDigit(c);
    if (digit < 0) {
      throw CLI::ValidationError(what, "not a hex digit: '" + std::string(1, c) + "' at character " +
                                           std::to_string(i + 1));
    }
    if (pending < 0) {
      pending = digit;
    } else {
      bytes.push_back(static_cast<std::uint8_t>(pending << 4 | digit));
      pending = -1;
    }
  }
  if (pending >= 0) throw CLI::ValidationError(what, "odd number of hex digits");
  return bytes;
}

std::string toHex(const std::vector<std::uint8_t>& bytes) {
  static constexpr char kDigits[] = "0123456789ABCDEF";
  std::string text;
  for (const std::uint8_t byte : bytes) {
    if (!text.empty()) text.push_back(' ');
    text.push_back(kDigits[byte >> 4]);
    text.push_back(kDigits[byte & 0xF]);
  }
  return text;
}

std::int64_t parseInteger(const std::string& text, std::int64_t low, std::int64_t high,
                          const std::string& argument) {
  std::int64_t value = 0;
  const char* end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, value);
  if (text.empty() || result.ec != std::errc() || result.ptr != end || value < low ||
      value > high) {
    throw CLI::ValidationError(argument, "not an integer from " + std::to_string(low) + " to " +
                                             std::to_string(high));
  }
  return value;
}

float parseSingle(const std::string& text, const std::string& argument) {
  char* end = nullptr;
  errno = 0;
  const float value = std::strtof(text.c_str(), &end);
  if (text.empty() || end != text.c_str() + text.size()) {
    throw CLI::ValidationError(argument, "not a number");
  }
  return value;
}

void encodeOne(KXCDataWriter& writer, const std::string& argument) {
  const std::size_t colon = argument.find(':');
  if (colon == std::string::npos) throw CLI::ValidationError(argument, "expected TYPE:VALUE");
  const std::string type = argument.substr(0, colon);
  const std::string value = argument.substr(colon + 1);
  if (type == "byte") {
    writer.writeByte(parseInteger(value, -128, 255, argument));
  } else if (type == "uint32") {
    writer.writeUInt32(static_cast<std::uint32_t>(parseInteger(value, INT32_MIN, UINT32_MAX, argument)));
  } else if (type == "int7") {
    writer.write7BitEncodedInt(
        static_cast<std::uint32_t>(parseInteger(value, INT32_MIN, UINT32_MAX, argument)));
  } else if (type == "single") {
    writer.writeSingle(parseSingle(value, argument));
  } else if (type == "string") {
    writer.writeString(value);
  } else if (type == "hex") {
    const std::vector<std::uint8_t> bytes = parseHex(value, argument);
    writer.appendBytes(bytes.data(), bytes.size());
  } else {
    throw CLI::ValidationError(argument,
                               "unknown type \"" + type + "\" (byte, uint32, single, int7, string, hex)");
  }
}

void runEncode(const BinaryOptions& options) {
  KXCDataWriter writer;
  for (const std::string& argument : options.values) encodeOne(writer, argument);
  if (options.json) {
    printJsonLine({{"hex", toHex(writer.data())}, {"length", writer.data().size()}});
  } else {
    std::cout << toHex(writer.data()) << '\n';
  }
}

std::string singleText(float value) {
  char buffer[32];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
  return std::string(buffer, result.ptr);
}

// One decoded value: its JSON form and its line of text.
struct Decoded {
  nlohmann::ordered_json json;
  std::string text;
};

template <class Integer>
Decoded integer(Integer value) {
  return {nlohmann::ordered_json(static_cast<std::int64_t>(value)), std::to_string(value)};
}

Decoded decodeOne(KXCDataReader& reader, const std::string& type) {
  if (type == "byte") return integer(reader.getByte());
  if (type == "uint16") return integer(reader.getUInt16());
  if (type == "int16") return integer(reader.getInt16());
  if (type == "uint32") return integer(reader.getUInt32());
  if (type == "int32") return integer(reader.getInt32());
  if (type == "int7") return integer(reader.get7BitEncodedInt());
  if (type == "single") {
    const float value = reader.getSingle();
    return {std::isfinite(value) ? nlohmann::ordered_json(value) : nlohmann::ordered_json(singleText(value)),
            singleText(value)};
  }
  const std::optional<std::string> text = reader.getString();
  if (!text) return {nullptr, "(none)"};
  return {*text, *text};
}

void runDecode(const BinaryOptions& options) {
  static const std::vector<std::string> kTypes = {"byte",  "uint16", "int16",  "uint32",
                                                  "int32", "single", "int7", "string"};
  for (const std::string& type : options.types) {
    if (std::find(kTypes.begin(), kTypes.end(), type) == kTypes.end()) {
      throw CLI::ValidationError(
          type, "unknown type (byte, uint16, int16, uint32, int32, single, int7, string)");
    }
  }
  KXCDataReader reader(parseHex(options.hex, "HEX"));
  std::vector<Decoded> values;
  for (const std::string& type : options.types) {
    const std::uint64_t offset = reader.location();
    try {
      values.push_back(decodeOne(reader, type));
    } catch (const std::out_of_range&) {
      throw KXACommandError("reading " + type + " at byte offset " + std::to_string(offset) +
                            " runs past the end of " + std::to_string(reader.size()) + " bytes");
    }
  }
  if (options.json) {
    nlohmann::ordered_json array = nlohmann::ordered_json::array();
    for (Decoded& value : values) array.push_back(std::move(value.json));
    printJsonLine(array);
    return;
  }
  for (const Decoded& value : values) std::cout << value.text << '\n';
}

}  // namespace

void registerBinaryCommands(CLI::App& app) {
  CLI::App* binary = app.add_subcommand("binary", "The compact binary stream");
  binary->require_subcommand(1);
  auto options = std::make_shared<BinaryOptions>();

  CLI::App* encode = binary->add_subcommand(
      "encode", "Encode TYPE:VALUE arguments in order and print the bytes as hex");
  encode->add_option("VALUES", options->values,
                     "byte:N, uint32:N, single:X, int7:N (7-bit encoded integer), "
                     "string:TEXT (the rest of the argument, may be empty), hex:BYTES (raw)")
      ->required();
  encode->add_flag("--json", options->json, "One object: hex, length");
  encode->callback([options] { runEncode(*options); });

  CLI::App* decode = binary->add_subcommand("decode", "Decode values of the given types from HEX");
  decode->add_option("HEX", options->hex, "The bytes: \"80 01\" or \"8001\"")->required();
  decode->add_option("TYPES", options->types,
                     "byte, uint16, int16, uint32, int32, single, int7, string")
      ->required();
  decode->add_flag("--json", options->json, "A JSON array of the values; a string that is none is null");
  decode->callback([options] { runDecode(*options); });
}
