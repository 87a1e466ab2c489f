#include "kxacore/Files/Archives/KXFZipSafeFiles.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <system_error>
#include <utility>

namespace {

constexpr std::size_t kWriteBufferSize = 1 << 16;

std::vector<std::string_view> componentsOf(std::string_view name) {
  std::vector<std::string_view> components;
  std::size_t start = 0;
  while (start <= name.size()) {
    const std::size_t end = std::min(name.find('/', start), name.size());
    const std::string_view component = name.substr(start, end - start);
    if (!component.empty() && component != ".") components.push_back(component);
    start = end + 1;
  }
  return components;
}

// Holds a descriptor and closes it.
class UniqueFd {
 public:
  explicit UniqueFd(int fd = -1) noexcept : fd_(fd) {}
  UniqueFd(const UniqueFd&) = delete;
  UniqueFd& operator=(const UniqueFd&) = delete;
  ~UniqueFd() { reset(); }
  void reset(int fd = -1) noexcept {
    if (fd_ >= 0) ::close(fd_);
    fd_ = fd;
  }
  int get() const noexcept { return fd_; }
  int release() noexcept { return std::exchange(fd_, -1); }

 private:
  int fd_;
};

// The destination itself may be a link the caller chose; below it, none is followed.
int openDestination(const std::filesystem::path& destination, bool create, UniqueFd& out) {
  if (create) {
    std::error_code ignored;
    std::filesystem::create_directories(destination, ignored);
  }
  const int fd = ::open(destination.empty() ? "." : destination.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return errno;
  out.reset(fd);
  return 0;
}

// Walks `components` down from `folder`, creating missing ones when asked.
int walkFolders(UniqueFd& folder, std::span<const std::string_view> components, bool create) {
  for (const std::string_view component : components) {
    const std::string name(component);
    int fd = ::openat(folder.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    if (fd < 0 && errno == ENOENT && create) {
      if (::mkdirat(folder.get(), name.c_str(), 0777) != 0 && errno != EEXIST) return errno;
      fd = ::openat(folder.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    }
    if (fd < 0) return errno;
    folder.reset(fd);
  }
  return 0;
}

std::string temporaryNameFor() {
  static std::atomic<std::uint64_t> counter{0};
  return ".kxazip-" + std::to_string(::getpid()) + "-" + std::to_string(counter.fetch_add(1)) + ".part";
}

}  // namespace

bool KXFIsSafeEntryName(std::string_view name) noexcept {
  if (name.empty() || name.front() == '/') return false;
  if (name.size() >= 2 && name[1] == ':' &&
      ((name[0] >= 'A' && name[0] <= 'Z') || (name[0] >= 'a' && name[0] <= 'z'))) {
    return false;
  }
  std::size_t start = 0;
  while (start <= name.size()) {
    const std::size_t end = std::min(name.find('/', start), name.size());
    if (name.substr(start, end - start) == "..") return false;
    start = end + 1;
  }
  return true;
}

int KXFCreateFoldersBelow(const std::filesystem::path& destination, std::string_view relativeName) {
  UniqueFd folder;
  if (const int error = openDestination(destination, true, folder)) return error;
  const auto components = componentsOf(relativeName);
  return walkFolders(folder, components, true);
}

KXFSafeTargetFile::~KXFSafeTargetFile() {
  discard();
  if (folderFd_ >= 0) ::close(folderFd_);
}

int KXFSafeTargetFile::open(const std::filesystem::path& folder, std::string_view relativeName, bool createParents) {
  discard();
  UniqueFd folderFd;
  if (const int error = openDestination(folder, createParents, folderFd)) return error;
  auto components = componentsOf(relativeName);
  if (components.empty()) return EINVAL;
  finalName_ = std::string(components.back());
  components.pop_back();
  if (const int error = walkFolders(folderFd, components, createParents)) return error;
  temporaryName_ = temporaryNameFor();
  const int fd = ::openat(folderFd.get(), temporaryName_.c_str(),
                          O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0666);
  if (fd < 0) {
    temporaryName_.clear();
    return errno;
  }
  if (folderFd_ >= 0) ::close(folderFd_);
  folderFd_ = folderFd.release();
  fileFd_ = fd;
  buffer_.clear();
  buffer_.reserve(kWriteBufferSize);
  return 0;
}

int KXFSafeTargetFile::flush() {
  std::size_t done = 0;
  while (done < buffer_.size()) {
    const ssize_t written = ::write(fileFd_, buffer_.data() + done, buffer_.size() - done);
    if (written < 0) {
      if (errno == EINTR) continue;
      return errno;
    }
    done += static_cast<std::size_t>(written);
  }
  buffer_.clear();
  return 0;
}

int KXFSafeTargetFile::write(std::span<const std::uint8_t> bytes) {
  if (fileFd_ < 0) return EBADF;
  if (buffer_.size() + bytes.size() > kWriteBufferSize) {
    if (const int error = flush()) return error;
  }
  if (bytes.size() >= kWriteBufferSize) {
    buffer_.assign(bytes.begin(), bytes.end());
    return flush();
  }
  buffer_.insert(buffer_.end(), bytes.begin(), bytes.end());
  return 0;
}

int KXFSafeTargetFile::commit(std::optional<std::time_t> modified) {
  if (fileFd_ < 0) return EBADF;
  if (const int error = flush()) return error;
  if (modified) {
    const timespec times[2] = {{0, UTIME_OMIT}, {*modified, 0}};
    ::futimens(fileFd_, times);
  }
  const int closed = ::close(std::exchange(fileFd_, -1));
  if (closed != 0 || ::renameat(folderFd_, temporaryName_.c_str(), folderFd_, finalName_.c_str()) != 0) {
    const int error = errno;
    discard();
    return error;
  }
  temporaryName_.clear();
  return 0;
}

void KXFSafeTargetFile::discard() noexcept {
  if (fileFd_ >= 0) ::close(std::exchange(fileFd_, -1));
  if (!temporaryName_.empty() && folderFd_ >= 0) ::unlinkat(folderFd_, temporaryName_.c_str(), 0);
  temporaryName_.clear();
  buffer_.clear();
}
