#pragma once

#include <array>

#include "CommandSpec.h"

namespace Varnholt::Cli {

class Session;

/// Each adds one command, or a group of them, to the command line; the file of that name holds it.
void AddList(CommandSpec app, Session& session);
void AddReadout(CommandSpec app, Session& session);
void AddScan(CommandSpec app, Session& session);
void AddIdentify(CommandSpec app, Session& session);
void AddReset(CommandSpec app, Session& session);
void AddMonitor(CommandSpec app, Session& session);
void AddWriteImage(CommandSpec app, Session& session);
void AddEeprom(CommandSpec app, Session& session);
void AddCalibration(CommandSpec app, Session& session);
void AddLog(CommandSpec app, Session& session);
void AddRam(CommandSpec app, Session& session);
void AddBinary(CommandSpec app, Session& session);
void AddWord(CommandSpec app, Session& session);
void AddDoctor(CommandSpec app, Session& session);

/// On Linux only; see SystemCommands.h.
void AddRegister(CommandSpec app, Session& session);

using AddCommand = void (*)(CommandSpec app, Session& session);

/// The commands in the order in which the help lists them.
inline constexpr std::array Commands{
    AddCommand{AddList},        AddCommand{AddReadout}, AddCommand{AddScan},       AddCommand{AddIdentify},
    AddCommand{AddReset},       AddCommand{AddMonitor}, AddCommand{AddWriteImage}, AddCommand{AddEeprom},
    AddCommand{AddCalibration}, AddCommand{AddLog},     AddCommand{AddRam},        AddCommand{AddBinary},
    AddCommand{AddWord},
};

}  // namespace Varnholt::Cli
