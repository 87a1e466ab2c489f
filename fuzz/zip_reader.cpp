// The zip reader over arbitrary bytes, with and without a password: the
// archive is written to a scratch file (minizip reads paths), then listed,
// walked into memory and asked about its password.
//
// Properties checked (abort on failure):
//   - no crash, leak or undefined behaviour, whatever the bytes;
//   - no entry handed to the block is larger than the memory limit;
//   - the block never sees more entries than the directory declares.
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "kxacore/Files/Archives/KXFUnarchiver.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

constexpr std::uint64_t kLimit = 1 << 20;

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < 1) return 0;
  static const std::string path = "/tmp/kxacore-fuzz-zip-" + std::to_string(::getpid()) + ".zip";
  // The first byte picks the password: none, right for the seeds, or wrong.
  const std::uint8_t choice = data[0] % 3;
  std::FILE* file = std::fopen(path.c_str(), "wb");
  if (file == nullptr) return 0;
  std::fwrite(data + 1, 1, size - 1, file);
  std::fclose(file);

  std::optional<std::string> password;
  if (choice == 1) password = "pw";
  if (choice == 2) password = "wrong";
  if (auto unarchiver = KXFUnarchiver::withPath(path, password)) {
    unarchiver->setMaximumEntryBytesInMemory(kLimit);
    static_cast<void>(unarchiver->entries());
    std::uint64_t seen = 0;
    static_cast<void>(unarchiver->enumerateFilesWithBlock(
        [&](const std::string&, std::vector<std::uint8_t>& bytes, bool&) {
          check(bytes.size() <= kLimit);
          ++seen;
        }));
    check(seen <= unarchiver->totalNumberOfFiles());
    static_cast<void>(unarchiver->totalNumberOfBytes());
  }
  static_cast<void>(KXFUnarchiver::isProtectedArchiveAtPath(path));
  static_cast<void>(KXFUnarchiver::isCorrectPassword(password.value_or("pw"), path));
  std::remove(path.c_str());
  return 0;
}
