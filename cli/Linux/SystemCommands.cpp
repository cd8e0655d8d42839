#include "SystemCommands.h"

#include <optional>

#include "Capture/PcapngWriter.h"
#include "Capture/UsbCapture.h"
#include "Commands/AllCommands.h"
#include "ExitCode.h"
#include "Output/Json.h"
#include "Output/Rows.h"
#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/Usb/SystemUsbBus.h"
#include "Platform/Usb/UdevBus.h"
#include "Session.h"

namespace Varnholt::Cli {
namespace {

/// The system's bus, whose devices are recorded once the recording has begun.
class BusRecording final : public TrafficRecording {
  public:
    explicit BusRecording(const std::string& file) : name_(file) {}

    void Begin() override {
        if (writer_) {
            return;
        }
        writer_.emplace(name_, "ostra " OSTRA_VERSION);
        Check();
        bus_.RecordInto(*writer_);
    }
    void Check() const override {
        if (writer_ && writer_->Failed()) {
            throw Failure(FailureKind::File, name_ + " cannot be written");
        }
    }

  private:
    const std::string name_;
    std::optional<Capture::PcapngWriter> writer_;
    Capture::CapturingBus bus_{Platform::Usb::SystemUsbBus()};
    const std::unique_ptr<Platform::DeviceFileSystem> files_ = Platform::Drivers::MakeDriverFileSystem(bus_);
    const Platform::ScopedDeviceFiles filesInForce_{*files_};
};

}  // namespace

std::unique_ptr<TrafficRecording> RecordTraffic(const std::string& file) {
    return std::make_unique<BusRecording>(file);
}

void AddSystemCommands(CommandSpec app, Session& session) {
    AddRegister(app, session);
    AddDoctor(app, session);
}

void PrintCandidates(Session& session, bool json) {
    Rows rows({{"NAME", "name"},
               {"VID:PID", "id"},
               {"REGISTERED", "registered"},
               {"DEVICE", "device"},
               {"", "serial", Rows::Hidden},
               {"", "node", Rows::Hidden}});
    for (const auto& device : Platform::Usb::ListCandidateDevices()) {
        rows.Add({device.name,
                  device.vendorId + ":" + device.productId,
                  {device.registered ? "yes" : "no", device.registered},
                  device.manufacturer + (device.manufacturer.empty() ? "" : " ") + device.product,
                  device.serial,
                  device.deviceNode});
    }
    if (!json && rows.IsEmpty()) {
        session.Note("no USB device with the instrument's endpoints is plugged in");
    } else {
        session.Print(json, {{"candidates", rows.AsJson()}}, rows.Text());
    }
}

}  // namespace Varnholt::Cli
