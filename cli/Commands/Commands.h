#pragma once

#include <array>

namespace CLI {
class App;
}

namespace Varnholt::Cli {

class Session;

/// Each adds one command, or a group of them, to the command line; the file of that name holds it.
void AddList(CLI::App& app, Session& session);
void AddReadout(CLI::App& app, Session& session);
void AddScan(CLI::App& app, Session& session);
void AddIdentify(CLI::App& app, Session& session);
void AddReset(CLI::App& app, Session& session);
void AddMonitor(CLI::App& app, Session& session);
void AddWriteImage(CLI::App& app, Session& session);
void AddEeprom(CLI::App& app, Session& session);
void AddCalibration(CLI::App& app, Session& session);
void AddLog(CLI::App& app, Session& session);
void AddRam(CLI::App& app, Session& session);
void AddBinary(CLI::App& app, Session& session);
void AddWord(CLI::App& app, Session& session);

/// On Linux only; see SystemCommands.h.
void AddRegister(CLI::App& app, Session& session);
void AddDoctor(CLI::App& app, Session& session);

using AddCommand = void (*)(CLI::App& app, Session& session);

/// The commands in the order in which the help lists them.
inline constexpr std::array Commands{
    AddCommand{AddList},        AddCommand{AddReadout}, AddCommand{AddScan},       AddCommand{AddIdentify},
    AddCommand{AddReset},       AddCommand{AddMonitor}, AddCommand{AddWriteImage}, AddCommand{AddEeprom},
    AddCommand{AddCalibration}, AddCommand{AddLog},     AddCommand{AddRam},        AddCommand{AddBinary},
    AddCommand{AddWord},
};

}  // namespace Varnholt::Cli
