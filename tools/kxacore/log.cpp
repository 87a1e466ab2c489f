// kxacore log: verbs over the shared logger.

#include "tools/kxacore/Commands.h"

void registerLogCommands(CLI::App& app) { static_cast<void>(app); }
