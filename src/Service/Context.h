#pragma once

#include <optional>
#include <string>

#include "DeviceDriver/Ostra/Transport.h"
#include "Service/Failure.h"
#include "Service/InterruptibleDeviceFiles.h"
#include "Service/Interruption.h"
#include "Service/Observer.h"

namespace Varnholt::Service {

/// Within what instruments are used: who is told, how the user ends it, and which transport is taken. One
/// thread uses it; the interruption may come from any.
class Context final {
  public:
    using Transport = DeviceDriver::Ostra::Transport;

    /// All must outlive the object. The files are in force; an interruption ends what runs on the device with
    /// this identifier, and without one on all devices.
    Context(Observer& toldObserver, Interruption& userInterruption, InterruptibleDeviceFiles& usedFiles,
            std::string deviceIdentifier = {});
    ~Context();
    Context(const Context&) = delete;
    Context& operator=(const Context&) = delete;

    Observer& Told() const { return observer_; }
    Interruption& UserInterruption() const { return interruption_; }
    /// After an interruption: transfers may start again.
    void Resume() { files_.Resume(device_); }
    /// Waits; throws `Failure` as soon as the user wants to end.
    void Sleep(std::uint32_t milliseconds) const;

    /// Until then it is the host's.
    void ChooseTransport(Transport transport) { chosenTransport_ = transport; }
    bool IsTransportChosen() const { return chosenTransport_.has_value(); }
    Transport UsedTransport() const {
        return chosenTransport_ ? *chosenTransport_ : DeviceDriver::Ostra::HostTransport();
    }

    /// Sorts what was thrown while the instrument with this identifier was used; empty: none was.
    Failure Explain(const std::exception_ptr& exception, const std::string& identifier = {}) const;

  private:
    Observer& observer_;
    Interruption& interruption_;
    InterruptibleDeviceFiles& files_;
    const std::string device_;  ///< empty: all
    std::optional<Transport> chosenTransport_;
};

}  // namespace Varnholt::Service
