// The binary stream reader driven by fuzz-chosen types over fuzz-chosen
// bytes.
//
// Properties checked (abort on failure):
//   - a read either succeeds and advances by the width of its type, or throws
//     std::out_of_range and leaves the position where it was;
//   - a 7-bit integer takes 1 to 5 bytes, and one that is not -1 re-encodes
//     in no more bytes than it took;
//   - a string that is not none is UTF-8 and re-encodes to the bytes read
//     when it holds no NUL (the writer's shortest prefix may be shorter than
//     a padded one read);
//   - a read never returns after running past the end.
#include <fuzzer/FuzzedDataProvider.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <stdexcept>
#include <string>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Files/Text/KXCDataReader.h"
#include "kxacore/Files/Text/KXCDataWriter.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

// Reads one value of type `type`; returns the bytes it consumed.
std::uint64_t readOne(KXCDataReader& reader, int type) {
  const std::uint64_t start = reader.location();
  switch (type) {
    case 0: reader.getByte(); break;
    case 1: reader.getUInt16(); break;
    case 2: reader.getInt16(); break;
    case 3: reader.getUInt32(); break;
    case 4: reader.getInt32(); break;
    case 5: reader.getSingle(); break;
    case 6: {
      const std::int32_t value = reader.get7BitEncodedInt();
      const std::uint64_t used = reader.location() - start;
      check(used >= 1 && used <= 5);
      if (value != -1) {
        KXCDataWriter writer;
        writer.write7BitEncodedInt(static_cast<std::uint32_t>(value));
        check(writer.data().size() <= used);
      }
      break;
    }
    case 7: {
      const std::optional<std::string> text = reader.getString();
      if (text) {
        check(kxa_isValidUTF8(*text));
        KXCDataWriter writer;
        writer.writeString(*text);
        KXCDataReader again(writer.data());
        if (text->find('\0') == std::string::npos) check(again.getString() == *text);
      }
      break;
    }
    default: {
      reader.passBytesLength(static_cast<std::uint64_t>(type - 8));
      break;
    }
  }
  return reader.location() - start;
}

constexpr std::uint64_t kWidths[] = {1, 2, 2, 4, 4, 4};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  FuzzedDataProvider provider(data, size);
  const std::size_t count = provider.ConsumeIntegralInRange<std::size_t>(0, 32);
  std::vector<int> types;
  for (std::size_t i = 0; i < count; ++i) types.push_back(provider.ConsumeIntegralInRange(0, 10));
  const std::vector<std::uint8_t> bytes = provider.ConsumeRemainingBytes<std::uint8_t>();
  KXCDataReader reader(bytes.data(), bytes.size());
  for (const int type : types) {
    const std::uint64_t before = reader.location();
    try {
      const std::uint64_t used = readOne(reader, type);
      if (type < 6) check(used == kWidths[type]);
      if (type <= 7) check(reader.location() <= reader.size());
    } catch (const std::out_of_range&) {
      check(type <= 7 && reader.location() == before);
    }
  }
  return 0;
}
