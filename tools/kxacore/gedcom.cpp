// kxacore gedcom: verbs over whole GEDCOM files.

#include "tools/kxacore/Commands.h"

void registerGedcomCommands(CLI::App& app) { static_cast<void>(app); }
