#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "DeviceDriver/Generic/EventListener.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Service/Instruments.h"

namespace Varnholt::Service {

/// What an instrument says of itself.
struct Identity {
    std::string chipId;
    std::uint8_t misc1 = 0, misc3 = 0;
    std::uint16_t misc2 = 0, misc4 = 0, misc5 = 0;
    std::array<std::uint8_t, 6> mode{};
    std::uint16_t cpld = 0;
    std::uint16_t p1 = 0, p2 = 0, p3 = 0;
    std::uint8_t p4 = 0, p5 = 0;
};

/// One opened (and thereby reset) instrument, open for the object's life. A second one of the same instrument
/// in this process is refused as one of another process is: it would reset the first one's, on whatever
/// transport. A command whose data come short fails, on either transport. Failures are `Failure` and name the
/// instrument.
class OpenedInstrument final {
  public:
    using CommandSet = DeviceDriver::Ostra::LowLevel::PellandoFunctionality;
    using Commands = Utilities::Tools::SmartPointer<CommandSet>;

    /// `listener` may be null; it is not owned, and it and the context outlive the object. A failure says,
    /// where it can be seen, who has the instrument.
    OpenedInstrument(Context& usedContext, const FoundInstrument& found,
                     DeviceDriver::Generic::EventListener* listener = nullptr);
    ~OpenedInstrument();
    OpenedInstrument(const OpenedInstrument&) = delete;
    OpenedInstrument& operator=(const OpenedInstrument&) = delete;

    const std::string& Identifier() const { return identifier_; }
    Context& UsedContext() const { return context_; }

    /// Asks for what the chip calls itself: 16 hexadecimal digits, the same at whatever port.
    std::string ChipId();
    Identity Identify();
    void Reset(std::uint16_t code);

    /// What `work` answers when it is given the command set.
    template <class Work>
    auto Do(Work work) {
        try {
            return work(commands_);
        } catch (...) {
            throw context_.Explain(std::current_exception(), identifier_);
        }
    }

  private:
    /// That the instrument is open in this process.
    class Claim final {
      public:
        explicit Claim(const std::string& identifier);
        ~Claim();
        Claim(const Claim&) = delete;
        Claim& operator=(const Claim&) = delete;

      private:
        const std::string name_;
    };

    using Transport = DeviceDriver::Ostra::LowLevel::PellandoFunctionalityByte;

    Context& context_;
    const std::string identifier_;
    const Claim claim_{identifier_};  ///< until what follows is closed
    DeviceDriver::Generic::EventListener* const messageListener_;
    Utilities::Tools::SmartPointer<Transport> transport_;
    Commands commands_;
};

}  // namespace Varnholt::Service
