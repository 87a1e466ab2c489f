// kxacore binary: verbs over the compact binary stream.

#include "tools/kxacore/Commands.h"

void registerBinaryCommands(CLI::App& app) { static_cast<void>(app); }
