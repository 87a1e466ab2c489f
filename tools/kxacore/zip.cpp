// kxacore zip: writing, reading and testing zip archives.

#include "tools/kxacore/Commands.h"

void registerZipCommands(CLI::App& app) {
  app.add_subcommand("zip", "zip archives")->require_subcommand(1);
}
