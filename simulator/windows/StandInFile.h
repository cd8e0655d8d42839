#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <utility>

#include "Platform/Drivers/DriverFile.h"
#include "Platform/Usb/UsbDevice.h"
#include "StandIn.h"
#include "StandInInstrument.h"

namespace Varnholt::Simulator {

/// One open file of a stand-in driver and the requests that run on it. Lives until it is closed and its last
/// request has completed.
class StandInFileObject final : public std::enable_shared_from_this<StandInFileObject> {
  public:
    StandInFileObject(std::shared_ptr<StandInInstrumentObject> opened,
                      std::unique_ptr<Platform::Drivers::DriverFile> file)
        : instrument_(std::move(opened)), driver_(std::move(file)) {}
    StandInFileObject(const StandInFileObject&) = delete;
    StandInFileObject& operator=(const StandInFileObject&) = delete;

    Status Start(const Platform::Operation& operation, const StandInRequest& request, unsigned long& bytes);

    void Cancel(unsigned long requestNumber);
    void CancelEndpoint(std::uint8_t endpoint);
    void CancelAll();

  private:
    class Running;

    void LimitTime(const std::shared_ptr<Running>& running);
    void Ended(Running& running, Status status);
    std::optional<Status> TestControl(const Platform::Operation& operation, unsigned long& bytes);
    template <class Matches>
    void CancelThose(Matches matches);

    const std::shared_ptr<StandInInstrumentObject> instrument_;
    const std::unique_ptr<Platform::Drivers::DriverFile> driver_;
    std::mutex lock_;
    std::map<unsigned long, std::shared_ptr<Running>> requests_;  // guarded by lock
};

}  // namespace Varnholt::Simulator
