// KXCLogger: the process-wide diagnostic log. Callers build a KXCLogEntry
// (source file, line, type, text) and the shared logger filters it by its
// level and writes one text line to its log file, or to stderr when no file
// is configured.
//
//   // The host, once at start-up (reads "KXALogLevelKey" and "KXALogFileKey"):
//   gLogger.store(std::make_shared<KXCLogger>());       // writes "Logging started..."
//   // Anywhere, from any thread; nothing is formatted without a shared logger:
//   KXC_LOG(kKXCLogTypeError, "bad date %@ in line %ld", text, lineNumber);
//   // The host, at the end:
//   if (auto logger = KXCLogger::sharedLogger()) logger->invalidate();  // "Logging finished."
//
// Line forms (time in the process's time zone, English month names always):
//   69 [812][123145452347392][05 Mar 2024 14:07:09] Import.cpp:120 : bad date
//   * [812][140735616467328][05 Mar 2024 14:07:09] : Logging started...
// The first number is the decimal character code of the type's letter (69 is
// 'E'), not the letter: readers of existing logs expect that form. The
// bracketed numbers are the process id and the creating thread's pthread_t.
//
// The log file is opened without truncation and written from its start, so a
// new run writes over the beginning of an older log and longer old content
// stays after it. Readers of the log rely on that; do not "fix" it to append.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "kxacore/Platform/KXAStringFormat.h"

// Environment variables read by the KXCLogger constructor.
inline constexpr char kKXFLogLevelKey[] = "KXALogLevelKey";
inline constexpr char kKXFLogFileKey[] = "KXALogFileKey";

// Entry types, with their letters: C E W T I; any other number prints D.
inline constexpr std::int64_t kKXCLogTypeCritical = 0;
inline constexpr std::int64_t kKXCLogTypeError = 1;
inline constexpr std::int64_t kKXCLogTypeWarning = 2;
inline constexpr std::int64_t kKXCLogTypeTrace = 3;
inline constexpr std::int64_t kKXCLogTypeInfo = 4;
inline constexpr std::int64_t kKXCLogTypeDebug = 5;

// One log entry: an immutable value that records, at construction, the
// process id, the creating thread and the local time. Copies are independent;
// const members are safe from any thread.
class KXCLogEntry {
 public:
  // An entry from source code. Keeps only the last path component of
  // `file` ("src/Import.cpp" gives "Import.cpp"); a null `file` counts as "".
  KXCLogEntry(const char* file, std::int64_t line, std::int64_t type, std::string_view text);
  // A plain-text entry: no file name, line 0, type 0; printed in the "* [" form.
  explicit KXCLogEntry(std::string_view text);

  // 'C' 'E' 'W' 'T' 'I' for types 0 to 4, 'D' for any other number.
  [[nodiscard]] static char mapEntryTypeToChar(std::int64_t type) noexcept;
  // "dd MMM yyyy HH:mm:ss" in the process's time zone, with English month
  // abbreviations whatever the locale ("05 Mar 2024 14:07:09").
  [[nodiscard]] static std::string dateTimeString(std::chrono::system_clock::time_point time);

  // The entry's line, ending in "\n" (forms in the file comment).
  [[nodiscard]] std::string logString() const;

  std::int64_t type() const noexcept { return type_; }
  const std::optional<std::string>& fileName() const noexcept { return fileName_; }
  std::int64_t line() const noexcept { return line_; }
  const std::string& text() const noexcept { return text_; }
  long processID() const noexcept { return processID_; }
  unsigned long threadID() const noexcept { return threadID_; }
  const std::string& dateTime() const noexcept { return dateTime_; }

 private:
  std::optional<std::string> fileName_;  // absent for a plain-text entry
  std::int64_t line_ = 0;
  std::string text_;
  std::int64_t type_ = 0;
  long processID_;
  unsigned long threadID_;
  std::string dateTime_;
};

// The sink. Not copyable; held through std::shared_ptr (gLogger shares it).
//
// Thread safety: every member may be called from any thread. Writes are
// serialised by the logger's own mutex, and each entry reaches the file in
// one write call of its whole line, so lines never interleave. The level is
// read without the lock (an atomic), as filtering should cost nothing.
class KXCLogger {
 public:
  // Level 0; "KXALogLevelKey", when set, gives the level (its leading
  // integer: "2x" is 2, "abc" is 0); "KXALogFileKey", when set and not empty,
  // gives the log file (empty counts as unset: the log goes to stderr). Then
  // writes the header entry "Logging started...".
  KXCLogger();
  // The same with the level and file given instead of read from the environment.
  KXCLogger(std::int64_t level, std::optional<std::filesystem::path> file);
  ~KXCLogger();
  KXCLogger(const KXCLogger&) = delete;
  KXCLogger& operator=(const KXCLogger&) = delete;

  // The shared logger (gLogger), or null when the host has set none.
  [[nodiscard]] static std::shared_ptr<KXCLogger> sharedLogger();

  // Builds an entry from `format` (an Objective-C style format, see
  // KXAStringFormat.h) and `args` and hands it to the shared logger's
  // logEntry. Without a shared logger, or when the level drops `type`,
  // nothing is formatted. Use it through KXC_LOG, which passes the source.
  template <typename... Args>
  static void logEntryWithFile(const char* file, std::int64_t line, std::int64_t type,
                               std::string_view format, const Args&... args) {
    const std::shared_ptr<KXCLogger> logger = sharedLogger();
    if (!logger || !logger->shouldLogType(type)) return;
    logger->logEntry(KXCLogEntry(file, line, type, KXAStringWithFormat(format, args...)));
  }

  // Whether the level lets entries of `type` through: level 1 keeps types
  // 0 to 2 (C E W), level 2 types 0 to 3 (C E W T), any other level all.
  [[nodiscard]] bool shouldLogType(std::int64_t type) const noexcept;

  // Writes `entry` when the level lets its type through.
  void logEntry(const KXCLogEntry& entry);
  // Writes `entry` whatever its type. When the log file cannot be opened,
  // prints "KXA: Cannot create stream for log file PATH" on stderr instead
  // (once per entry; the next entry tries to open the file again). A failed
  // write drops the entry and the handle, which the next entry reopens.
  // Throws only what the allocator throws.
  void writeLogEntry(const KXCLogEntry& entry);

  // The output descriptor, opening the log file on first use (created when
  // missing, never truncated, positioned at its start); 2 (stderr) without a
  // file; -1 when the file cannot be opened. Owned by the logger: do not close.
  [[nodiscard]] int fileHandle();

  void writeHeader();  // plain-text entry "Logging started..."
  void writeFooter();  // plain-text entry "Logging finished."

  // Writes the footer, then, under the logger's lock, clears gLogger,
  // whichever logger it holds: the host's "end of logging" call. The caller
  // must hold its own reference to the logger for the length of the call.
  void invalidate();

  std::int64_t level() const noexcept { return level_.load(std::memory_order_relaxed); }
  void setLevel(std::int64_t level) noexcept { level_.store(level, std::memory_order_relaxed); }
  // Setting the file after the handle was opened does not move the handle.
  [[nodiscard]] std::optional<std::filesystem::path> file() const;
  void setFile(std::optional<std::filesystem::path> file);

 private:
  // Closes the descriptor it owns; stderr is borrowed, never closed.
  class Descriptor {
   public:
    Descriptor() = default;
    Descriptor(int fd, bool owned) noexcept : fd_(fd), owned_(owned) {}
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;
    Descriptor& operator=(Descriptor&& other) noexcept;
    ~Descriptor() { reset(); }
    int get() const noexcept { return fd_; }
    void reset() noexcept;

   private:
    int fd_ = -1;
    bool owned_ = false;
  };

  int fileHandleLocked();

  std::atomic<std::int64_t> level_{0};
  mutable std::mutex mutex_;                    // guards file_ and handle_, orders writes
  std::optional<std::filesystem::path> file_;  // guarded by mutex_
  Descriptor handle_;                          // guarded by mutex_
};

// The holder of the shared logger: the host stores one, the library reads and
// clears it from any thread. A mutex-guarded shared_ptr rather than
// std::atomic<std::shared_ptr>: it is as cheap uncontended, and
// ThreadSanitizer understands it. Readers get their own reference, so a
// logger cannot be destroyed under a thread that is writing through it.
class KXCSharedLoggerSlot {
 public:
  constexpr KXCSharedLoggerSlot() noexcept = default;
  KXCSharedLoggerSlot(const KXCSharedLoggerSlot&) = delete;
  KXCSharedLoggerSlot& operator=(const KXCSharedLoggerSlot&) = delete;

  [[nodiscard]] std::shared_ptr<KXCLogger> load() const;
  void store(std::shared_ptr<KXCLogger> logger);
  void reset() { store(nullptr); }
  // Clears the slot; returns the reference it dropped, so the caller
  // decides where the logger dies.
  std::shared_ptr<KXCLogger> take();

 private:
  mutable std::mutex mutex_;
  std::shared_ptr<KXCLogger> logger_;  // guarded by mutex_
};

// The shared logger. Set by the host; the library only reads and clears it.
extern KXCSharedLoggerSlot gLogger;

// Logs through the shared logger with the caller's source file and line:
//   KXC_LOG(kKXCLogTypeWarning, "no such tag %@", tag);
#define KXC_LOG(type, format, ...) \
  KXCLogger::logEntryWithFile(__FILE__, __LINE__, (type), (format)__VA_OPT__(, ) __VA_ARGS__)
