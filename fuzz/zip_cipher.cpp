// The traditional zip cipher with fuzz-chosen password and bytes.
//
// Properties checked (abort on failure):
//   - decrypting what was encrypted under the same password gives the bytes
//     back, whatever the split of the stream into pieces;
//   - the encryption header decrypts to its check byte.
#include <fuzzer/FuzzedDataProvider.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "kxacore/Files/Archives/KXFZipCipher.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  FuzzedDataProvider provider(data, size);
  const std::string password = provider.ConsumeRandomLengthString(64);
  const auto checkByte = provider.ConsumeIntegral<std::uint8_t>();
  const std::size_t split = provider.ConsumeIntegral<std::uint16_t>();
  const std::vector<std::uint8_t> plain = provider.ConsumeRemainingBytes<std::uint8_t>();

  KXFZipCipher writer(password);
  auto header = writer.makeHeader(checkByte);
  std::vector<std::uint8_t> bytes = plain;
  writer.encrypt(bytes);

  KXFZipCipher reader(password);
  reader.decrypt(header);
  check(header.back() == checkByte);
  const std::size_t first = bytes.empty() ? 0 : split % (bytes.size() + 1);
  reader.decrypt(std::span(bytes).first(first));
  reader.decrypt(std::span(bytes).subspan(first));
  check(bytes == plain);
  return 0;
}
