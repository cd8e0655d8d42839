#pragma once

#include "CommandSpec.h"

namespace Varnholt::Cli {

class Session;

/// The commands of the group `eeprom`, in two files: those that move images, and those that look into them.
void AddEepromTransfers(CommandSpec group, Session& session);
void AddEepromViews(CommandSpec group, Session& session);

}  // namespace Varnholt::Cli
