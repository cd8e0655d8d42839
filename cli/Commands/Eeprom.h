#pragma once

namespace CLI {
class App;
}

namespace Varnholt::Cli {

class Session;

/// The commands of the group `eeprom`, in two files: those that move images, and those that look into them.
void AddEepromTransfers(CLI::App& group, Session& session);
void AddEepromViews(CLI::App& group, Session& session);

}  // namespace Varnholt::Cli
