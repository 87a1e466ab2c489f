#include "tools/kxacore/Commands.h"

// Placeholder until the verb lands.
void registerDateParseCommand(CLI::App& /*dateCommand*/) {}
