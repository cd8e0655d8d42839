#pragma once

#include <memory>
#include <optional>
#include <string>

#include "DeviceDriver/Ostra/Transport.h"
#include "Service/Failure.h"
#include "Service/InterruptibleDeviceFiles.h"
#include "Service/Interruption.h"
#include "Service/Observer.h"

namespace Varnholt::Service {

/// Within what instruments are used: who is told, how the user ends it, and which transport is taken. For its
/// life the device files that were in force can be interrupted, and an interruption does that. One thread
/// uses it; the interruption may come from any.
class Context final {
  public:
    using Transport = DeviceDriver::Ostra::Transport;

    /// Both must outlive the object.
    Context(Observer& toldObserver, Interruption& userInterruption);
    ~Context();
    Context(const Context&) = delete;
    Context& operator=(const Context&) = delete;

    Observer& Told() const { return observer_; }
    Interruption& UserInterruption() const { return interruption_; }
    InterruptibleDeviceFiles& Files() { return files_; }
    /// As `Observer::StartProgress`, and never null.
    std::unique_ptr<Progress> StartProgress(const std::string& title, std::uint64_t total,
                                            const std::string& unit) const;
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
    InterruptibleDeviceFiles files_;
    const Platform::ScopedDeviceFiles filesInForce_;
    std::optional<Transport> chosenTransport_;
};

}  // namespace Varnholt::Service
