// kxacore ini: verbs over INI files.

#include "tools/kxacore/Commands.h"

void registerIniCommands(CLI::App& app) { static_cast<void>(app); }
