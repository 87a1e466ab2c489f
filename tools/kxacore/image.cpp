// kxacore image: the pixel library applied to PNG and JPEG photos.

#include "tools/kxacore/Commands.h"

void registerImageCommands(CLI::App& app) { static_cast<void>(app); }
