// kxacore zip edit: editing an archive in place.

#include "tools/kxacore/Commands.h"

void registerZipEditCommand(CLI::App& zipCommand) { static_cast<void>(zipCommand); }
