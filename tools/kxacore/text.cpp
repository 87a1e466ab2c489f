// kxacore text: verbs over text files in legacy encodings and ANSEL.

#include "tools/kxacore/Commands.h"

void registerTextCommands(CLI::App& app) { static_cast<void>(app); }
