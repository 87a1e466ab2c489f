// Runs the kxacore program built beside the tests (KXA_CLI_PATH) through the
// shell, in a fixed English locale, and captures what it prints and its exit
// status. Shared by the CLI tests of every area.
#pragma once

#include <sys/wait.h>

#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

struct KXACliRun {
  std::string output;
  int status = -1;  // -1 when the program did not exit normally
};

// One argument for the shell, in single quotes.
inline std::string kxaShellQuoted(std::string_view argument) {
  std::string out = "'";
  for (const char c : argument) {
    if (c == '\'') {
      out.append("'\\''");
    } else {
      out.push_back(c);
    }
  }
  out.push_back('\'');
  return out;
}

// `arguments` is shell text, quoted by the caller. stdout is captured and
// stderr dropped, or, with `captureErrors`, stderr captured and stdout dropped.
inline KXACliRun runKxacore(const std::string& arguments, bool captureErrors = false) {
  std::string command = "env KXA_LOCALE=en_US LC_ALL=C.UTF-8 ";
  // Appended piece by piece: GCC 12 misreads `" " + string` at -O3 (a false -Wrestrict).
  command.append(KXA_CLI_PATH).append(" ").append(arguments);
  command.append(captureErrors ? " 2>&1 >/dev/null" : " 2>/dev/null");
  KXACliRun run;
  FILE* pipe = popen(command.c_str(), "r");
  if (!pipe) return run;
  char buffer[512];
  while (const std::size_t n = fread(buffer, 1, sizeof buffer, pipe)) run.output.append(buffer, n);
  const int status = pclose(pipe);
  run.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  return run;
}

// The same with one quoted shell word per argument.
inline KXACliRun runKxacore(const std::vector<std::string>& arguments, bool captureErrors = false) {
  std::string text;
  for (const std::string& argument : arguments) {
    if (!text.empty()) text.push_back(' ');
    text.append(kxaShellQuoted(argument));
  }
  return runKxacore(text, captureErrors);
}
