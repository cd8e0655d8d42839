#include "Platform/Usb/SystemUsbBus.h"

#include <iterator>

#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UdevBus.h"

namespace Varnholt::Platform::Usb {
namespace {

class AllInstruments final : public UsbBus {
  public:
    std::vector<std::string> List() override {
        std::vector<std::string> names = RealUsbBus().List();
        std::vector<std::string> simulated = SimulatorBus().List();
        names.insert(names.end(), std::make_move_iterator(simulated.begin()),
                     std::make_move_iterator(simulated.end()));
        return names;
    }

    bool Has(const std::string& name) override { return BusOf(name).Has(name); }

    std::shared_ptr<UsbDevice> Open(const std::string& name, ErrorCode& error) override {
        return BusOf(name).Open(name, error);
    }

  private:
    static UsbBus& BusOf(const std::string& name) {
        return name.starts_with(SimulatedPrefix) ? SimulatorBus() : RealUsbBus();
    }
};

}  // namespace

UsbBus& SystemUsbBus() {
    static AllInstruments bus;
    return bus;
}

}  // namespace Varnholt::Platform::Usb
