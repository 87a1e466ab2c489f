#include "tools/kxacore/Commands.h"

#include <cstdio>
#include <iostream>

void printJsonLine(const nlohmann::ordered_json& object) {
  std::cout << object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace)
            << '\n';
}

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
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    // --help and --version end here with 0; every usage error exits with 2.
    return app.exit(error) == 0 ? 0 : 2;
  } catch (const KXACommandError& error) {
    std::cerr << "kxacore: " << error.what() << '\n';
    return 1;
  } catch (const std::exception& error) {
    std::cerr << "kxacore: unexpected failure: " << error.what() << '\n';
    return 1;
  }
  return 0;
}
