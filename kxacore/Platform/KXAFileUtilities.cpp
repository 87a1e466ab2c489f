#include "kxacore/Platform/KXAFileUtilities.h"

#include <cstdio>
#include <memory>
#include <random>
#include <string>
#include <system_error>

#include <unistd.h>

namespace {
struct FileCloser {
  void operator()(std::FILE* file) const noexcept { std::fclose(file); }
};
using FileHandle = std::unique_ptr<std::FILE, FileCloser>;

std::filesystem::path temporarySibling(const std::filesystem::path& path) {
  std::random_device entropy;
  std::filesystem::path temporary = path;
  temporary += ".tmp-" + std::to_string(::getpid()) + "-" + std::to_string(entropy());
  return temporary;
}
}  // namespace

bool KXAWriteFileAtomically(const std::filesystem::path& path, std::string_view contents) {
  const std::filesystem::path temporary = temporarySibling(path);
  bool written = false;
  {
    FileHandle file(std::fopen(temporary.c_str(), "wb"));
    if (!file) return false;
    written = std::fwrite(contents.data(), 1, contents.size(), file.get()) == contents.size() &&
              std::fflush(file.get()) == 0 && ::fsync(::fileno(file.get())) == 0;
    // fclose can still fail (a full disk on a network file system).
    written = (std::fclose(file.release()) == 0) && written;
  }
  std::error_code error;
  if (written) {
    std::filesystem::rename(temporary, path, error);
    if (!error) return true;
  }
  std::filesystem::remove(temporary, error);
  return false;
}
