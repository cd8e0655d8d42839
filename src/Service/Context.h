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

/// Within what instruments are used: who is told, how the user ends it, and which transport is taken. One
/// thread uses it; the interruption may come from any.
class Context final {
  public:
    using Transport = DeviceDriver::Ostra::Transport;

    /// Both must outlive the object. For its life the device files that were in force can be interrupted, and
    /// an interruption does that; `log`, where there is one, is told of their transfers.
    Context(Observer& toldObserver, Interruption& userInterruption, InterruptibleDeviceFiles::Log log = {});
    /// The same for one instrument of several that are used at the same time: `sharedFiles` are in force
    /// already, outlive the object too, and an interruption ends what runs on the device with this
    /// identifier.
    Context(Observer& toldObserver, Interruption& userInterruption, InterruptibleDeviceFiles& sharedFiles,
            std::string deviceIdentifier);
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
    struct OwnFiles {
        explicit OwnFiles(InterruptibleDeviceFiles::Log log)
            : files(Platform::DeviceFiles(), std::move(log)) {}

        InterruptibleDeviceFiles files;
        const Platform::ScopedDeviceFiles inForce{files};
    };

    Observer& observer_;
    Interruption& interruption_;
    const std::unique_ptr<OwnFiles> ownFiles_;
    InterruptibleDeviceFiles& files_;
    const std::string device_;  ///< empty: all
    std::optional<Transport> chosenTransport_;
};

}  // namespace Varnholt::Service
