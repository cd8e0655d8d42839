#pragma once

#include <string>
#include <vector>

#include "DeviceDriver/Generic/EventListener.h"
#include "DeviceDriver/Ostra/LowLevel/DataStageObserver.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Session.h"

namespace Varnholt::Cli {

/// Which instrument a command works on, and how it reaches it.
struct InstrumentOptions {
    std::string device;     ///< identifier or the end of one, or "chip:" and a chip id; empty: the first
    std::string transport;  ///< "native", "usbio" or empty
};

/// The identifiers of the instruments that are connected, as this transport names them.
std::vector<std::string> ConnectedInstruments(DeviceDriver::Ostra::Transport transport);
bool IsConnected(const std::string& identifier, DeviceDriver::Ostra::Transport transport);

/// What people call an instrument: its place or serial number, without the driver's part of the identifier.
std::string ShortNameOf(const std::string& identifier);

/// The position of the instrument that `name` means: the one with that identifier, else the one with that
/// short name, else the only one whose identifier ends so. Empty: the first. Throws `ToolFailure`.
std::size_t FindInstrument(const std::vector<std::string>& identifiers, const std::string& name);

/// One opened (and thereby reset) instrument. A command whose data come short fails, on either transport.
class Instrument final {
  public:
    using Transport = DeviceDriver::Ostra::LowLevel::PellandoFunctionalityByte;
    using CommandSet = DeviceDriver::Ostra::LowLevel::PellandoFunctionality;

    /// What happens when several instruments are connected and none is named.
    enum class Choice {
        FirstWillDo,  ///< the first is taken, with a note
        MustBeNamed,  ///< refused: what follows changes the instrument
    };

    /// `listener` may be null; it is not owned and outlives the object. Failures name the instrument and,
    /// where it can be seen, who has it.
    Instrument(Session& usedSession, const InstrumentOptions& options, Choice choice = Choice::FirstWillDo,
               DeviceDriver::Generic::EventListener* listener = nullptr);
    ~Instrument();
    Instrument(const Instrument&) = delete;
    Instrument& operator=(const Instrument&) = delete;

    const std::string& Identifier() const { return identifier_; }
    /// Asks for what the chip calls itself: 16 hexadecimal digits, the same at whatever port.
    std::string ChipId();
    CommandSet& Commands() { return *commands_; }
    const Utilities::Tools::SmartPointer<CommandSet>& SharedCommands() const { return commands_; }
    /// The commands at byte level, for what the command set does not offer.
    Transport& Bytes() { return *transport_; }

  private:
    Session& session_;
    std::string identifier_;
    DeviceDriver::Generic::EventListener* const messageListener_;
    DeviceDriver::Ostra::LowLevel::WholeDataStages wholeData_;  ///< told by the transport
    Utilities::Tools::SmartPointer<Transport> transport_;
    Utilities::Tools::SmartPointer<CommandSet> commands_;
};

}  // namespace Varnholt::Cli
