#include "kxacore/Core/KXCLogger.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <pthread.h>
#include <regex>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

namespace {

namespace fs = std::filesystem;

// A fresh folder per test, removed afterwards.
class ScratchFolder {
 public:
  explicit ScratchFolder(const std::string& name)
      : path_(fs::temp_directory_path() /
              ("kxacore-logger-" + std::to_string(::getpid()) + "-" + name)) {
    fs::remove_all(path_);
    fs::create_directories(path_);
  }
  ~ScratchFolder() {
    std::error_code ignored;
    fs::remove_all(path_, ignored);
  }
  const fs::path& path() const { return path_; }

 private:
  fs::path path_;
};

std::string readFile(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  std::ostringstream out;
  out << in.rdbuf();
  return out.str();
}

std::vector<std::string> readLines(const fs::path& path) {
  std::vector<std::string> lines;
  std::istringstream in(readFile(path));
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  return lines;
}

// Sets one environment variable for a scope and puts the old value back.
class ScopedEnv {
 public:
  ScopedEnv(const char* name, const char* value) : name_(name) {
    if (const char* old = std::getenv(name)) old_ = old;
    if (value) {
      ::setenv(name, value, 1);
    } else {
      ::unsetenv(name);
    }
    ::tzset();
  }
  ~ScopedEnv() {
    if (old_) {
      ::setenv(name_, old_->c_str(), 1);
    } else {
      ::unsetenv(name_);
    }
    ::tzset();
  }
  ScopedEnv(const ScopedEnv&) = delete;
  ScopedEnv& operator=(const ScopedEnv&) = delete;

 private:
  const char* name_;
  std::optional<std::string> old_;
};

const std::string kStamp = R"(\[[0-9]+\]\[[0-9]+\]\[[0-9]{2} [A-Z][a-z]{2} [0-9]{4} [0-9]{2}:[0-9]{2}:[0-9]{2}\])";

bool isPlainLine(const std::string& line, const std::string& text) {
  return std::regex_match(line, std::regex(R"(\* )" + kStamp + " : " + text));
}

// ---- entries ----

struct TypeCase {
  std::int64_t type;
  char letter;
  const char* code;  // what the line starts with
};

class LogEntryTypeTest : public testing::TestWithParam<TypeCase> {};

TEST_P(LogEntryTypeTest, LineStartsWithTheLettersDecimalCode) {
  const TypeCase& c = GetParam();
  EXPECT_EQ(KXCLogEntry::mapEntryTypeToChar(c.type), c.letter);
  const KXCLogEntry entry("Import.cpp", 120, c.type, "bad date");
  EXPECT_EQ(entry.type(), c.type);
  EXPECT_TRUE(std::regex_match(entry.logString(),
                               std::regex(std::string(c.code) + " " + kStamp +
                                          " Import.cpp:120 : bad date\n")))
      << entry.logString();
}

INSTANTIATE_TEST_SUITE_P(Types, LogEntryTypeTest,
                         testing::Values(TypeCase{0, 'C', "67"}, TypeCase{1, 'E', "69"},
                                         TypeCase{2, 'W', "87"}, TypeCase{3, 'T', "84"},
                                         TypeCase{4, 'I', "73"}, TypeCase{5, 'D', "68"},
                                         TypeCase{7, 'D', "68"}, TypeCase{-1, 'D', "68"},
                                         TypeCase{INT64_MAX, 'D', "68"}));

TEST(KXCLogEntry, PlainTextEntryUsesTheStarFormThoughItsTypeIsZero) {
  const KXCLogEntry entry("Logging started...");
  EXPECT_EQ(entry.type(), 0);
  EXPECT_FALSE(entry.fileName().has_value());
  const std::string line = entry.logString();
  ASSERT_FALSE(line.empty());
  EXPECT_EQ(line.back(), '\n');
  EXPECT_TRUE(isPlainLine(line.substr(0, line.size() - 1), R"(Logging started\.\.\.)")) << line;
}

TEST(KXCLogEntry, RecordsProcessThreadAndLastPathComponent) {
  const KXCLogEntry entry("/home/build/src/Gedcom/Import.cpp", -3, 1, "100%% %@ stays");
  EXPECT_EQ(entry.fileName(), "Import.cpp");
  EXPECT_EQ(entry.processID(), static_cast<long>(::getpid()));
  EXPECT_EQ(entry.threadID(), static_cast<unsigned long>(pthread_self()));
  // The text is printed as it is, never read as a format.
  const std::string line = entry.logString();
  EXPECT_NE(line.find(" Import.cpp:-3 : 100%% %@ stays\n"), std::string::npos) << line;
  EXPECT_NE(line.find("[" + std::to_string(::getpid()) + "][" +
                      std::to_string(static_cast<unsigned long>(pthread_self())) + "]["),
            std::string::npos)
      << line;

  EXPECT_EQ(KXCLogEntry("Import.cpp", 1, 1, "x").fileName(), "Import.cpp");
  EXPECT_EQ(KXCLogEntry("dir/", 1, 1, "x").fileName(), "");
  EXPECT_EQ(KXCLogEntry(nullptr, 1, 1, "x").fileName(), "");
}

struct DateTimeCase {
  const char* timeZone;
  std::time_t seconds;
  const char* expected;
};

class LogEntryDateTimeTest : public testing::TestWithParam<DateTimeCase> {};

TEST_P(LogEntryDateTimeTest, UsesTheProcessTimeZoneAndEnglishMonths) {
  const DateTimeCase& c = GetParam();
  const ScopedEnv timeZone("TZ", c.timeZone);
  EXPECT_EQ(KXCLogEntry::dateTimeString(std::chrono::system_clock::from_time_t(c.seconds)),
            c.expected);
}

INSTANTIATE_TEST_SUITE_P(
    Zones, LogEntryDateTimeTest,
    testing::Values(DateTimeCase{"UTC0", 1709647629, "05 Mar 2024 14:07:09"},
                    DateTimeCase{"EST5", 1709647629, "05 Mar 2024 09:07:09"},
                    DateTimeCase{"JST-9", 1709647629, "05 Mar 2024 23:07:09"},
                    DateTimeCase{"UTC0", 0, "01 Jan 1970 00:00:00"},
                    DateTimeCase{"UTC0", 1735689599, "31 Dec 2024 23:59:59"},
                    DateTimeCase{"UTC0", 1709208000, "29 Feb 2024 12:00:00"}));

// ---- the logger ----

struct LevelCase {
  std::int64_t level;
  const char* written;  // letters of the types 0 to 5 that reach the file
};

class LoggerLevelTest : public testing::TestWithParam<LevelCase> {};

TEST_P(LoggerLevelTest, FiltersByLevel) {
  const LevelCase& c = GetParam();
  const ScratchFolder folder("level");
  const fs::path file = folder.path() / "log.txt";
  KXCLogger logger(c.level, file);
  std::string written;
  for (std::int64_t type = -1; type <= 7; ++type) {
    const char letter = KXCLogEntry::mapEntryTypeToChar(type);
    const std::string marker = "type" + std::to_string(type);
    logger.logEntry(KXCLogEntry("a.cpp", 1, type, marker));
    if (readFile(file).find(marker + "\n") != std::string::npos) written.push_back(letter);
    EXPECT_EQ(logger.shouldLogType(type), readFile(file).find(marker) != std::string::npos);
  }
  EXPECT_EQ(written, c.written) << "level " << c.level;
}

INSTANTIATE_TEST_SUITE_P(Levels, LoggerLevelTest,
                         testing::Values(LevelCase{0, "DCEWTIDDD"}, LevelCase{1, "CEW"},
                                         LevelCase{2, "CEWT"}, LevelCase{3, "DCEWTIDDD"},
                                         LevelCase{5, "DCEWTIDDD"}, LevelCase{-1, "DCEWTIDDD"}));

TEST(KXCLogger, CreatesMissingFileAndWritesHeaderAndFooter) {
  const ScratchFolder folder("create");
  const fs::path file = folder.path() / "new.log";
  {
    KXCLogger logger(0, file);
    EXPECT_TRUE(fs::exists(file));
    logger.logEntry(KXCLogEntry("/src/Core/Thing.cpp", 42, kKXCLogTypeWarning, "careful"));
    logger.invalidate();
  }
  const std::vector<std::string> lines = readLines(file);
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_TRUE(isPlainLine(lines[0], R"(Logging started\.\.\.)")) << lines[0];
  EXPECT_TRUE(std::regex_match(lines[1], std::regex("87 " + kStamp + " Thing.cpp:42 : careful")))
      << lines[1];
  EXPECT_TRUE(isPlainLine(lines[2], R"(Logging finished\.)")) << lines[2];
}

TEST(KXCLogger, WritesOverTheStartOfAnOlderLogAndKeepsItsTail) {
  const ScratchFolder folder("overwrite");
  const fs::path file = folder.path() / "old.log";
  const std::string oldTail = "OLD-TAIL-THAT-MUST-STAY\n";
  std::ofstream(file, std::ios::binary) << std::string(4000, 'x') << '\n' << oldTail;
  {
    KXCLogger logger(0, file);
    logger.logEntry(KXCLogEntry("a.cpp", 7, kKXCLogTypeError, "new"));
  }
  const std::string contents = readFile(file);
  EXPECT_EQ(contents.size(), 4001 + oldTail.size());
  EXPECT_EQ(contents.rfind("* [", 0), 0u);  // the header is at the very start
  EXPECT_NE(contents.find("a.cpp:7 : new\nxxxx"), std::string::npos);
  EXPECT_EQ(contents.substr(contents.size() - oldTail.size()), oldTail);
}

TEST(KXCLogger, FileThatCannotBeOpenedReportsOnStderrPerEntry) {
  const ScratchFolder folder("unopenable");
  const fs::path file = folder.path() / "missing-folder" / "log.txt";
  testing::internal::CaptureStderr();
  KXCLogger logger(0, file);  // header: the first report
  EXPECT_EQ(logger.fileHandle(), -1);
  logger.logEntry(KXCLogEntry("a.cpp", 1, 1, "lost"));
  const std::string errors = testing::internal::GetCapturedStderr();
  const std::string report = "KXA: Cannot create stream for log file " + file.string() + "\n";
  EXPECT_EQ(errors, report + report);

  // Every entry tries again: once the folder exists, the file opens.
  fs::create_directories(file.parent_path());
  logger.logEntry(KXCLogEntry("a.cpp", 2, 1, "found"));
  EXPECT_GE(logger.fileHandle(), 0);
  EXPECT_NE(readFile(file).find("a.cpp:2 : found\n"), std::string::npos);
}

TEST(KXCLogger, WithoutAFileWritesToStderr) {
  testing::internal::CaptureStderr();
  {
    KXCLogger logger(0, std::nullopt);
    EXPECT_EQ(logger.fileHandle(), STDERR_FILENO);
    logger.logEntry(KXCLogEntry("b.cpp", 3, kKXCLogTypeTrace, "to stderr"));
  }
  const std::string errors = testing::internal::GetCapturedStderr();
  EXPECT_NE(errors.find("Logging started...\n84 ["), std::string::npos) << errors;
  EXPECT_NE(errors.find("b.cpp:3 : to stderr\n"), std::string::npos) << errors;
  // The logger borrowed stderr: it is still open.
  EXPECT_NE(::fcntl(STDERR_FILENO, F_GETFD), -1);
}

TEST(KXCLogger, SettingTheFileAfterOpeningKeepsTheOpenHandle) {
  const ScratchFolder folder("setfile");
  KXCLogger logger(0, folder.path() / "first.log");
  logger.setFile(folder.path() / "second.log");
  EXPECT_EQ(logger.file(), folder.path() / "second.log");
  logger.logEntry(KXCLogEntry("a.cpp", 1, 1, "still first"));
  EXPECT_NE(readFile(folder.path() / "first.log").find("still first"), std::string::npos);
  EXPECT_FALSE(fs::exists(folder.path() / "second.log"));
}

struct EnvironmentCase {
  const char* level;  // nullptr: unset
  const char* file;
  std::int64_t expectedLevel;
  bool expectFile;
};

class LoggerEnvironmentTest : public testing::TestWithParam<EnvironmentCase> {};

TEST_P(LoggerEnvironmentTest, ReadsLevelAndFile) {
  const EnvironmentCase& c = GetParam();
  const ScratchFolder folder("environment");
  const std::string path = c.file && *c.file ? (folder.path() / c.file).string() : "";
  const ScopedEnv level(kKXFLogLevelKey, c.level);
  const ScopedEnv file(kKXFLogFileKey, c.file ? path.c_str() : nullptr);
  testing::internal::CaptureStderr();
  const KXCLogger logger;
  const std::string errors = testing::internal::GetCapturedStderr();
  EXPECT_EQ(logger.level(), c.expectedLevel);
  if (c.expectFile) {
    EXPECT_EQ(logger.file(), fs::path(path));
    EXPECT_TRUE(isPlainLine(readLines(path).at(0), R"(Logging started\.\.\.)"));
    EXPECT_EQ(errors, "");
  } else {
    EXPECT_FALSE(logger.file().has_value());
    EXPECT_NE(errors.find("Logging started..."), std::string::npos);
  }
}

INSTANTIATE_TEST_SUITE_P(Variables, LoggerEnvironmentTest,
                         testing::Values(EnvironmentCase{nullptr, nullptr, 0, false},
                                         EnvironmentCase{"2", "run.log", 2, true},
                                         EnvironmentCase{" 1x", nullptr, 1, false},
                                         EnvironmentCase{"abc", "run.log", 0, true},
                                         EnvironmentCase{"-4", "", -4, false}));

// ---- threads ----

TEST(KXCLoggerThreads, ConcurrentWritersLeaveOnlyWholeLines) {
  const ScratchFolder folder("threads");
  const fs::path file = folder.path() / "threads.log";
  constexpr int kThreads = 8;
  constexpr int kLinesPerThread = 500;
  {
    KXCLogger logger(0, file);
    std::vector<std::thread> writers;
    for (int t = 0; t < kThreads; ++t) {
      writers.emplace_back([&logger, t] {
        for (int i = 0; i < kLinesPerThread; ++i) {
          // Lengths vary, so a torn write would show as a malformed line.
          // Appended piece by piece: GCC 12 misreads `"t" + string` at -O3 (-Wrestrict).
          std::string text = "t";
          text.append(std::to_string(t)).append(" n").append(std::to_string(i)).append(" ");
          text.append(static_cast<std::size_t>(i % 97), static_cast<char>('a' + t));
          logger.logEntry(KXCLogEntry("w.cpp", t, kKXCLogTypeError, text));
        }
      });
    }
    for (std::thread& writer : writers) writer.join();
  }
  const std::vector<std::string> lines = readLines(file);
  ASSERT_EQ(lines.size(), 1u + kThreads * kLinesPerThread);
  EXPECT_TRUE(isPlainLine(lines[0], R"(Logging started\.\.\.)"));
  const std::regex entryLine("69 " + kStamp + " w\\.cpp:([0-9]) : t([0-9]) n([0-9]+) ([a-z]*)");
  std::vector<int> nextPerThread(kThreads, 0);
  for (std::size_t i = 1; i < lines.size(); ++i) {
    std::smatch match;
    ASSERT_TRUE(std::regex_match(lines[i], match, entryLine)) << "line " << i << ": " << lines[i];
    const int thread = std::stoi(match[2]);
    const int number = std::stoi(match[3]);
    ASSERT_EQ(match[1], match[2]);
    ASSERT_EQ(match[4].length(), number % 97);
    // Each thread's own lines keep their order.
    ASSERT_EQ(number, nextPerThread[static_cast<std::size_t>(thread)]++) << lines[i];
  }
}

TEST(KXCLoggerThreads, PublishingLoggingAndInvalidatingRaceFree) {
  const ScratchFolder folder("shared");
  const fs::path file = folder.path() / "shared.log";
  gLogger.reset();
  std::atomic<bool> stop{false};
  std::vector<std::thread> loggers;
  for (int t = 0; t < 3; ++t) {
    loggers.emplace_back([&stop, t] {
      for (int i = 0; !stop.load(); ++i) KXC_LOG(kKXCLogTypeError, "thread %d entry %d", t, i);
    });
  }
  std::thread publisher([&file] {
    for (int i = 0; i < 200; ++i) gLogger.store(std::make_shared<KXCLogger>(0, file));
  });
  std::thread invalidator([] {
    for (int i = 0; i < 200; ++i) {
      if (const auto logger = KXCLogger::sharedLogger()) logger->invalidate();
    }
  });
  publisher.join();
  invalidator.join();
  stop = true;
  for (std::thread& logger : loggers) logger.join();
  // Loggers of the same file overwrite each other from its start, so the
  // contents prove nothing here; ThreadSanitizer and the sanitizers do.
  EXPECT_TRUE(fs::exists(file));
  gLogger.reset();
  EXPECT_FALSE(KXCLogger::sharedLogger());
}

TEST(KXCLoggerShared, MacroLogsThroughTheSharedLoggerOnly) {
  const ScratchFolder folder("macro");
  const fs::path file = folder.path() / "macro.log";
  gLogger.reset();
  KXC_LOG(kKXCLogTypeError, "nobody listens %@", "here");  // no logger: nothing happens
  EXPECT_FALSE(KXCLogger::sharedLogger());

  auto logger = std::make_shared<KXCLogger>(2, file);
  gLogger.store(logger);
  EXPECT_EQ(KXCLogger::sharedLogger(), logger);
  const int line = __LINE__ + 1;
  KXC_LOG(kKXCLogTypeWarning, "tag %@ at %ld, %d%%", "BIRT", std::int64_t{12}, 50);
  KXC_LOG(kKXCLogTypeInfo, "dropped by level 2");
  KXC_LOG(kKXCLogTypeCritical, "no arguments %@");

  const std::vector<std::string> lines = readLines(file);
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_NE(lines[1].find("] KXCLoggerTests.cpp:" + std::to_string(line) +
                          " : tag BIRT at 12, 50%"),
            std::string::npos)
      << lines[1];
  EXPECT_NE(lines[2].find("KXCLoggerTests.cpp:"), std::string::npos);
  EXPECT_EQ(lines[2].substr(0, 3), "67 ");
  EXPECT_EQ(lines[2].substr(lines[2].size() - 15), ": no arguments ");

  // Invalidating any logger ends shared logging, as the host's last call.
  const ScratchFolder otherFolder("macro-other");
  KXCLogger other(0, otherFolder.path() / "other.log");
  other.invalidate();
  EXPECT_FALSE(KXCLogger::sharedLogger());

  gLogger.store(logger);
  logger->invalidate();
  EXPECT_FALSE(KXCLogger::sharedLogger());
  EXPECT_TRUE(isPlainLine(readLines(file).back(), R"(Logging finished\.)"));
}

static_assert(!std::is_copy_constructible_v<KXCLogger>);
static_assert(std::is_copy_constructible_v<KXCLogEntry>);

}  // namespace
