#include "tools/kxacore/Commands.h"

#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <memory>

#include "kxacore/Core/KXCLogger.h"

void printJsonLine(const nlohmann::ordered_json& object) {
  std::cout << object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace)
            << '\n';
}

namespace {

// With a logging variable set, a run logs as a host would: the header now,
// what went wrong, the footer when main returns.
class CliLogging {
 public:
  CliLogging() {
    if (std::getenv(kKXFLogFileKey) || std::getenv(kKXFLogLevelKey)) {
      gLogger.store(std::make_shared<KXCLogger>());
    }
  }
  CliLogging(const CliLogging&) = delete;
  CliLogging& operator=(const CliLogging&) = delete;
  ~CliLogging() {
    if (const auto logger = KXCLogger::sharedLogger()) logger->invalidate();
  }
};

}  // namespace

int main(int argc, char** argv) {
  CLI::App app{"kxacore: genealogical dates, names, places and the tools beneath them",
               "kxacore"};
  app.require_subcommand(1);
  app.set_version_flag("--version", "kxacore 0.1.0");
  registerDateCommands(app);
  CLI::App* date = app.get_subcommand("date");  // registerDateCommands made it
  registerDateParseCommand(*date);
  registerDateFormatCommand(*date);
  registerRegexCommands(app);
  registerNameCommands(app);
  registerPlaceCommands(app);
  registerIniCommands(app);
  registerBinaryCommands(app);
  registerTextCommands(app);
  registerLogCommands(app);
  registerGedcomCommands(app);
  registerZipCommands(app);
  registerZipEditCommand(*app.get_subcommand("zip"));  // registerZipCommands made it
  registerImageCommands(app);
  registerStoryCommands(app);
  const CliLogging logging;
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    // --help and --version end here with 0; every usage error exits with 2.
    if (error.get_exit_code() != 0) KXC_LOG(kKXCLogTypeError, "usage: %@", error.what());
    return app.exit(error) == 0 ? 0 : 2;
  } catch (const KXACommandError& error) {
    KXC_LOG(kKXCLogTypeError, "%@", error.what());
    std::cerr << "kxacore: " << error.what() << '\n';
    return 1;
  } catch (const std::exception& error) {
    KXC_LOG(kKXCLogTypeCritical, "unexpected failure: %@", error.what());
    std::cerr << "kxacore: unexpected failure: " << error.what() << '\n';
    return 1;
  }
  return 0;
}
