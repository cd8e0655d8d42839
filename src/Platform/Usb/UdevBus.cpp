#include "Platform/Usb/UdevBus.h"

#include <libudev.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <mutex>
#include <optional>

#include "Platform/Usb/LibUsbDevice.h"
#include "Platform/Usb/ReleasedBy.h"
#include "Platform/Usb/UsbDescriptors.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Platform::Usb {
namespace {

/// A file for each device that udev knows something about.
constexpr const char* UdevDatabase = "/run/udev/data";
constexpr std::chrono::milliseconds CoarsestTick(50);

/// What is plugged into a port ("1-1.2") and its interfaces ("1-1.2:1.0"), not root hubs ("usb1", "1-0:1.0"):
/// a machine can have dozens of them, and udev walks through /sys for each that it looks at.
constexpr const char* PortPattern = "*-[!0]*";

using Udev = std::unique_ptr<udev, ReleasedBy<udev_unref>>;
using Enumeration = std::unique_ptr<udev_enumerate, ReleasedBy<udev_enumerate_unref>>;
using Device = std::unique_ptr<udev_device, ReleasedBy<udev_device_unref>>;

std::string Text(const char* text) {
    return text ? text : "";
}

/// The kernel's "1-1.2" as "usb-1p1p2". Between the numbers stand letters, because the name of an
/// instrument's lock keeps only letters and digits: port 2 behind port 1 is not port 12.
std::string NameOfPort(std::string port) {
    std::ranges::replace_if(
        port, [](char c) { return c == '-' || c == '.'; }, 'p');
    return "usb-" + port;
}

UsbDeviceInfo Describe(udev_device* device) {
    UsbDeviceInfo info;
    info.name = NameOfPort(Text(udev_device_get_sysname(device)));
    info.deviceNode = Text(udev_device_get_devnode(device));
    info.systemPath = Text(udev_device_get_syspath(device));
    info.vendorId = Text(udev_device_get_sysattr_value(device, "idVendor"));
    info.productId = Text(udev_device_get_sysattr_value(device, "idProduct"));
    info.manufacturer = Text(udev_device_get_sysattr_value(device, "manufacturer"));
    info.product = Text(udev_device_get_sysattr_value(device, "product"));
    info.serial = Text(udev_device_get_sysattr_value(device, "serial"));
    info.registered = udev_device_get_property_value(device, InterfaceClassProperty) != nullptr;

    const std::string interfacePath =
        info.systemPath + "/" + Text(udev_device_get_sysname(device)) + ":1.0/driver";
    std::error_code error;
    const auto driver = std::filesystem::read_symlink(interfacePath, error);
    if (!error) {
        info.kernelDriver = driver.filename();
    }
    return info;
}

std::vector<UsbDeviceInfo> ListDevices(bool registeredOnly) {
    std::vector<UsbDeviceInfo> devices;
    const Udev library(udev_new());
    const Enumeration enumeration(library ? udev_enumerate_new(library.get()) : nullptr);
    if (!enumeration) {
        return devices;
    }
    udev_enumerate_add_match_subsystem(enumeration.get(), "usb");
    udev_enumerate_add_match_sysname(enumeration.get(), PortPattern);
    if (registeredOnly) {
        udev_enumerate_add_match_property(enumeration.get(), InterfaceClassProperty, "*");
    }
    udev_enumerate_scan_devices(enumeration.get());
    udev_list_entry* entry = nullptr;
    udev_list_entry_foreach(entry, udev_enumerate_get_list_entry(enumeration.get())) {
        const Device device(udev_device_new_from_syspath(library.get(), udev_list_entry_get_name(entry)));
        if (device && Text(udev_device_get_devtype(device.get())) == "usb_device") {
            devices.push_back(Describe(device.get()));
        }
    }
    std::ranges::sort(devices, [](const UsbDeviceInfo& one, const UsbDeviceInfo& other) {
        return strverscmp(one.name.c_str(), other.name.c_str()) < 0;  // port 10 behind port 2
    });
    return devices;
}

/// Whether it has the instrument's endpoints, by the descriptors that the kernel keeps.
bool HasEndpointsOfInstrument(const UsbDeviceInfo& device) {
    std::ifstream file(device.systemPath + "/descriptors", std::ios::binary);
    const std::vector<std::uint8_t> bytes{std::istreambuf_iterator<char>(file), {}};
    const std::vector<EndpointInfo> endpoints = EndpointsOfFirstInterface(bytes);
    constexpr std::array wanted{Protocol::BulkOutEndpoint, Protocol::BulkInEndpoint,
                                Protocol::InterruptInEndpoint};
    return std::ranges::all_of(wanted, [&endpoints](std::uint8_t address) {
        return std::ranges::find(endpoints, address, &EndpointInfo::address) != endpoints.end();
    });
}

using FileTime = std::filesystem::file_time_type;

/// When udev last wrote about any device; nothing where that cannot be told.
std::optional<FileTime> LastChangeOfUdev() {
    std::error_code error;
    const FileTime changed = std::filesystem::last_write_time(UdevDatabase, error);
    return error ? std::nullopt : std::optional(changed);
}

/// Whether a later change is sure to get another time: file systems take theirs from a clock with coarse
/// ticks.
bool IsSettled(FileTime changed) {
    return FileTime::clock::now() - changed > CoarsestTick;
}

/// Opening an instrument by its name asks some six times what is there: what udev says is kept until it says
/// something new.
class UdevBus final : public UsbBus {
  public:
    std::vector<std::string> List() override {
        std::vector<std::string> names;
        for (const UsbDeviceInfo& device : Present()) {
            names.push_back(device.name);
        }
        return names;
    }

    std::shared_ptr<UsbDevice> Open(const std::string& name, ErrorCode& error) override {
        for (const UsbDeviceInfo& device : Present()) {
            if (device.name == name) {
                return OpenLibUsbDevice(device.deviceNode, error);
            }
        }
        error = Errors::FileNotFound;
        return nullptr;
    }

  private:
    std::vector<UsbDeviceInfo> Present() {
        const std::lock_guard lock(mutex_);
        const std::optional<FileTime> changed = LastChangeOfUdev();
        if (!keptSince_ || keptSince_ != changed) {
            kept_ = ListRegisteredDevices();
            keptSince_ = changed && IsSettled(*changed) ? changed : std::nullopt;
        }
        std::vector<UsbDeviceInfo> present;
        std::ranges::copy_if(kept_, std::back_inserter(present), [](const UsbDeviceInfo& device) {
            return access(device.deviceNode.c_str(), F_OK) == 0;  // unplugged, and udev did not get to it yet
        });
        return present;
    }

    std::mutex mutex_;  // guards what follows
    std::vector<UsbDeviceInfo> kept_;
    std::optional<FileTime> keptSince_;
};

}  // namespace

std::vector<UsbDeviceInfo> ListRegisteredDevices() {
    return ListDevices(true);
}

std::vector<UsbDeviceInfo> ListCandidateDevices() {
    std::vector<UsbDeviceInfo> devices = ListDevices(false);
    std::erase_if(devices, [](const UsbDeviceInfo& device) { return !HasEndpointsOfInstrument(device); });
    return devices;
}

UsbBus& RealUsbBus() {
    static UdevBus bus;
    return bus;
}

}  // namespace Varnholt::Platform::Usb
