#include "tools/kxacore/Commands.h"

// Placeholder until the verb lands.
void registerDateFormatCommand(CLI::App& /*dateCommand*/) {}
