#pragma once

#include <atomic>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "Platform/Drivers/DriverFile.h"
#include "Platform/Drivers/SharedDevice.h"
#include "Platform/Drivers/UsbIoDevice.h"
#include "SimulatedInstrument.h"

namespace Varnholt::Simulator {

class StandInFileObject;

/// One plugged-in instrument behind a stand-in driver, with what the driver keeps of it. Lives as long as its
/// device or a file of it.
class StandInInstrumentObject final {
  public:
    explicit StandInInstrumentObject(unsigned long index);
    ~StandInInstrumentObject();

    void Unplug();
    bool IsUnplugged() const { return unplugged_; }

    /// What the driver makes of an opening; null with the code in `error`.
    std::unique_ptr<Platform::Drivers::DriverFile> Open(bool usbIo, std::uint32_t pipe,
                                                        Platform::ErrorCode& error);
    void Add(const std::shared_ptr<StandInFileObject>& file);
    std::size_t OpenFiles() { return Files().size(); }

    SimulatedInstrument& Simulated();
    void SetFaults(const std::string& plan);
    static std::string TakeTranscript();
    /// For good, from the next opening of a device that is not open.
    void UseElsewhere() { usedElsewhere_ = true; }
    bool IsUsedElsewhere() const { return usedElsewhere_; }

  private:
    std::vector<std::shared_ptr<StandInFileObject>> Files();

    const std::string name_;
    std::atomic<bool> unplugged_ = false;
    std::atomic<bool> usedElsewhere_ = false;
    std::mutex lock_;  // guards what follows
    std::vector<std::weak_ptr<StandInFileObject>> files_;
    std::weak_ptr<Platform::Drivers::SharedDevice> device_;
    std::weak_ptr<Platform::Drivers::UsbIoDevice> usbIoDevice_;
    std::shared_ptr<Platform::Usb::UsbDevice> otherUser_;
};

}  // namespace Varnholt::Simulator
