#pragma once

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
void AddEepromViews(CommandSpec eepromGroup,
                    Session& session);  ///< of that group, those that look into images
void AddCalibration(CommandSpec app, Session& session);
void AddLog(CommandSpec app, Session& session);
void AddRam(CommandSpec app, Session& session);
void AddBinary(CommandSpec app, Session& session);
void AddWord(CommandSpec app, Session& session);
void AddDoctor(CommandSpec app, Session& session);

/// On Linux only; see SystemCommands.h.
void AddRegister(CommandSpec app, Session& session);

}  // namespace Varnholt::Cli
