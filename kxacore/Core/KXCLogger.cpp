#include "kxacore/Core/KXCLogger.h"

#include <fcntl.h>
#include <pthread.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <type_traits>
#include <utility>

#include "kxacore/Extensions/KXAStringExtensions.h"

constinit KXCSharedLoggerSlot gLogger;

namespace {

constexpr char kHeaderText[] = "Logging started...";
constexpr char kFooterText[] = "Logging finished.";

// pthread_t is an integer on glibc and a pointer elsewhere; a template so the
// branch that does not fit is never compiled.
template <typename Handle>
unsigned long handleValue(Handle handle) noexcept {
  if constexpr (std::is_pointer_v<Handle>) {
    return reinterpret_cast<unsigned long>(handle);
  } else {
    return static_cast<unsigned long>(handle);
  }
}

unsigned long currentThreadID() noexcept { return handleValue(pthread_self()); }

std::string lastPathComponent(const char* file) {
  if (file == nullptr) return {};
  const std::string_view path(file);
  const std::size_t slash = path.find_last_of('/');
  return std::string(slash == std::string_view::npos ? path : path.substr(slash + 1));
}

// Writes all of `bytes`, resuming after signals and short writes. Lines stay
// whole because the caller holds the logger's lock for the whole loop.
bool writeFully(int fd, std::string_view bytes) noexcept {
  while (!bytes.empty()) {
    const ssize_t written = ::write(fd, bytes.data(), bytes.size());
    if (written < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    bytes.remove_prefix(static_cast<std::size_t>(written));
  }
  return true;
}

std::optional<std::filesystem::path> logFileFromEnvironment() {
  const char* value = std::getenv(kKXFLogFileKey);
  if (value == nullptr || *value == '\0') return std::nullopt;
  return std::filesystem::path(value);
}

std::int64_t levelFromEnvironment() {
  const char* value = std::getenv(kKXFLogLevelKey);
  return value == nullptr ? 0 : kxa_integerValue(value);
}

}  // namespace

// ---- KXCLogEntry ----

KXCLogEntry::KXCLogEntry(const char* file, std::int64_t line, std::int64_t type,
                         std::string_view text)
    : fileName_(lastPathComponent(file)),
      line_(line),
      text_(text),
      type_(type),
      processID_(static_cast<long>(::getpid())),
      threadID_(currentThreadID()),
      dateTime_(dateTimeString(std::chrono::system_clock::now())) {}

KXCLogEntry::KXCLogEntry(std::string_view text)
    : text_(text),
      processID_(static_cast<long>(::getpid())),
      threadID_(currentThreadID()),
      dateTime_(dateTimeString(std::chrono::system_clock::now())) {}

char KXCLogEntry::mapEntryTypeToChar(std::int64_t type) noexcept {
  switch (type) {
    case kKXCLogTypeCritical: return 'C';
    case kKXCLogTypeError: return 'E';
    case kKXCLogTypeWarning: return 'W';
    case kKXCLogTypeTrace: return 'T';
    case kKXCLogTypeInfo: return 'I';
    default: return 'D';
  }
}

std::string KXCLogEntry::dateTimeString(std::chrono::system_clock::time_point time) {
  // A fixed month table, not strftime's %b: the user's locale must not
  // change the log's form.
  static constexpr const char* kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                            "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const std::time_t seconds = std::chrono::system_clock::to_time_t(time);
  std::tm local{};
  if (::localtime_r(&seconds, &local) == nullptr) return {};
  char buffer[40];
  std::snprintf(buffer, sizeof buffer, "%02d %s %04d %02d:%02d:%02d", local.tm_mday,
                kMonths[(local.tm_mon % 12 + 12) % 12], local.tm_year + 1900, local.tm_hour,
                local.tm_min, local.tm_sec);
  return buffer;
}

std::string KXCLogEntry::logString() const {
  if (!fileName_) {
    return KXAStringWithFormat("* [%ld][%lu][%@] : %@\n", processID_, threadID_, dateTime_,
                               text_);
  }
  // %hhd over the letter prints its character code ("69" for E): the form
  // existing logs have.
  return KXAStringWithFormat("%hhd [%ld][%lu][%@] %@:%ld : %@\n", mapEntryTypeToChar(type_),
                             processID_, threadID_, dateTime_, *fileName_, line_, text_);
}

// ---- KXCLogger ----

KXCLogger::Descriptor& KXCLogger::Descriptor::operator=(Descriptor&& other) noexcept {
  if (this != &other) {
    reset();
    fd_ = std::exchange(other.fd_, -1);
    owned_ = std::exchange(other.owned_, false);
  }
  return *this;
}

void KXCLogger::Descriptor::reset() noexcept {
  if (owned_ && fd_ >= 0) ::close(fd_);
  fd_ = -1;
  owned_ = false;
}

KXCLogger::KXCLogger() : KXCLogger(levelFromEnvironment(), logFileFromEnvironment()) {}

KXCLogger::KXCLogger(std::int64_t level, std::optional<std::filesystem::path> file)
    : level_(level), file_(std::move(file)) {
  writeHeader();
}

KXCLogger::~KXCLogger() = default;

std::shared_ptr<KXCLogger> KXCLogger::sharedLogger() { return gLogger.load(); }

bool KXCLogger::shouldLogType(std::int64_t type) const noexcept {
  switch (level()) {
    case 1: return type >= 0 && type <= 2;
    case 2: return type >= 0 && type <= 3;
    default: return true;
  }
}

void KXCLogger::logEntry(const KXCLogEntry& entry) {
  if (shouldLogType(entry.type())) writeLogEntry(entry);
}

void KXCLogger::writeLogEntry(const KXCLogEntry& entry) {
  const std::scoped_lock lock(mutex_);
  const int fd = fileHandleLocked();
  if (fd < 0) {
    const std::string path = file_ ? file_->string() : std::string();
    const std::string message =
        KXAStringWithFormat("KXA: Cannot create stream for log file %s\n", path);
    static_cast<void>(writeFully(STDERR_FILENO, message));
    return;
  }
  // Built before anything is written: an allocation failure leaves the file alone.
  const std::string line = entry.logString();
  if (!writeFully(fd, line)) handle_.reset();  // the next entry reopens the file
}

int KXCLogger::fileHandle() {
  const std::scoped_lock lock(mutex_);
  return fileHandleLocked();
}

int KXCLogger::fileHandleLocked() {
  if (handle_.get() >= 0) return handle_.get();
  if (!file_) {
    handle_ = Descriptor(STDERR_FILENO, false);
  } else {
    // O_CREAT without O_TRUNC or O_APPEND: a missing file is created, an
    // existing one is written over from its start and keeps its longer tail.
    const int fd = ::open(file_->c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    if (fd < 0) return -1;
    handle_ = Descriptor(fd, true);
  }
  return handle_.get();
}

void KXCLogger::writeHeader() { logEntry(KXCLogEntry(kHeaderText)); }

void KXCLogger::writeFooter() { logEntry(KXCLogEntry(kFooterText)); }

void KXCLogger::invalidate() {
  writeFooter();
  std::shared_ptr<KXCLogger> released;
  {
    const std::scoped_lock lock(mutex_);
    released = gLogger.take();
  }
  // `released` may be the last reference: it goes after the lock is let go.
}

std::optional<std::filesystem::path> KXCLogger::file() const {
  const std::scoped_lock lock(mutex_);
  return file_;
}

void KXCLogger::setFile(std::optional<std::filesystem::path> file) {
  const std::scoped_lock lock(mutex_);
  file_ = std::move(file);
}

// ---- KXCSharedLoggerSlot ----

std::shared_ptr<KXCLogger> KXCSharedLoggerSlot::load() const {
  const std::scoped_lock lock(mutex_);
  return logger_;
}

void KXCSharedLoggerSlot::store(std::shared_ptr<KXCLogger> logger) {
  {
    const std::scoped_lock lock(mutex_);
    logger_.swap(logger);
  }
  // The previous logger, if this was its last reference, dies outside the lock.
}

std::shared_ptr<KXCLogger> KXCSharedLoggerSlot::take() {
  const std::scoped_lock lock(mutex_);
  return std::move(logger_);
}
