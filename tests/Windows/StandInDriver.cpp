#include "StandInDriver.h"

#include <shlwapi.h>

#include <algorithm>
#include <cstdio>
#include <functional>
#include <stdexcept>

#include "Platform/DeviceFiles.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Tests {
namespace {

constexpr const char* ServiceName = "OstraStandIn";
constexpr const char* DeviceKeys = "System\\CurrentControlSet\\Enum\\ROOT\\OSTRA";
/// Asks Wine to look again at the devices below ROOT.
constexpr DWORD EnumerateRootDevices = 128;

void Check(bool succeeded, const char* what) {
    if (!succeeded) {
        throw std::runtime_error(std::string(what) + ": error " + std::to_string(GetLastError()));
    }
}

void WaitUntil(const std::function<bool()>& condition, const char* what) {
    const DWORD start = GetTickCount();
    while (!condition()) {
        SetLastError(ERROR_TIMEOUT);
        Check(GetTickCount() - start < 10'000, what);
        Sleep(1);
    }
}

void WriteDeviceKey(const std::string& name) {
    HKEY key = nullptr;
    Check(RegCreateKeyExA(HKEY_LOCAL_MACHINE, (std::string(DeviceKeys) + "\\" + name).c_str(), 0, nullptr, 0,
                          KEY_ALL_ACCESS, nullptr, &key, nullptr) == ERROR_SUCCESS,
          "device key");
    const auto text = [key](const char* value, const std::string& content, DWORD type = REG_SZ) {
        RegSetValueExA(key, value, 0, type, reinterpret_cast<const BYTE*>(content.c_str()),
                       static_cast<DWORD>(content.size() + 1));
    };
    text("ClassGUID", "{4D36E97D-E325-11CE-BFC1-08002BE10318}");
    text("Class", "System");
    text("Service", ServiceName);
    text("HardwareID", std::string("root\\ostra") + '\0', REG_MULTI_SZ);
    const DWORD none = 0;
    RegSetValueExA(key, "ConfigFlags", 0, REG_DWORD, reinterpret_cast<const BYTE*>(&none), sizeof none);
    RegCloseKey(key);
}

}  // namespace

StandInDriver::StandInDriver(const std::string& image) {
    manager_ = OpenSCManagerA(nullptr, nullptr, SC_MANAGER_ALL_ACCESS);
    Check(manager_ != nullptr, "service manager");
    service_ = CreateServiceA(manager_, ServiceName, ServiceName, SERVICE_ALL_ACCESS, SERVICE_KERNEL_DRIVER,
                              SERVICE_DEMAND_START, SERVICE_ERROR_NORMAL, image.c_str(), nullptr, nullptr,
                              nullptr, nullptr, nullptr);
    Check(service_ != nullptr, "service");
    Check(StartServiceA(service_, 0, nullptr) != 0, "start of the driver");
}

StandInDriver::~StandInDriver() {
    UnplugAll();
    SERVICE_STATUS status{};
    ControlService(service_, SERVICE_CONTROL_STOP, &status);
    DeleteService(service_);
    CloseServiceHandle(service_);
    CloseServiceHandle(manager_);
}

bool StandInDriver::HostIs64Bit() {
    SYSTEM_INFO system{};
    GetNativeSystemInfo(&system);
    return system.wProcessorArchitecture == PROCESSOR_ARCHITECTURE_AMD64;
}

void StandInDriver::Enumerate() {
    SERVICE_STATUS status{};
    Check(ControlService(service_, EnumerateRootDevices, &status) != 0, "enumeration");
}

std::string StandInDriver::PlugIn() {
    char name[8];
    std::snprintf(name, sizeof name, "%04u", nextDevice_++ % 10'000);
    WriteDeviceKey(name);
    Enumerate();
    const std::string part = std::string("#ostra#") + name + "#";
    std::string path;
    const auto isListed = [&] {
        for (const std::string& listed : List()) {
            path = listed.find(part) != std::string::npos ? listed : path;
        }
        return !path.empty();
    };
    WaitUntil(isListed, "instrument to be listed");
    // The driver counts its instruments in the order of their arrival.
    plugged_.push_back({path, name, nextDevice_});
    return path;
}

void StandInDriver::Unplug(const std::string& path) {
    const auto found = std::ranges::find(plugged_, path, &Device::path);
    if (found == plugged_.end()) {
        return;
    }
    SHDeleteKeyA(HKEY_LOCAL_MACHINE, (std::string(DeviceKeys) + "\\" + found->key).c_str());
    plugged_.erase(found);
    Enumerate();
    WaitUntil([&] { return std::ranges::count(List(), path) == 0; }, "instrument to be gone");
}

void StandInDriver::UnplugAll() {
    while (!plugged_.empty()) {
        Unplug(std::string(plugged_.back().path));
    }
}

std::uint64_t StandInDriver::SeedOf(const std::string& path) const {
    const auto found = std::ranges::find(plugged_, path, &Device::path);
    return found == plugged_.end() ? 0 : found->seed;
}

std::vector<std::string> StandInDriver::List() {
    return Platform::SystemDeviceFiles().ListInterfaces(
        HostIs64Bit() ? Protocol::UsbIoDriver::InterfaceClass : Protocol::NativeDriver::InterfaceClass);
}

Instrument::Instrument(const std::string& path)
    : file_(CreateFileA(path.c_str(), GENERIC_READ | GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                        nullptr, OPEN_EXISTING, 0, nullptr)) {
    Check(file_ != INVALID_HANDLE_VALUE, "instrument");  // NOLINT: the system's macro
}

DWORD Instrument::Control(DWORD code, const void* input, std::size_t inputSize, void* output,
                          std::size_t outputSize) {
    DWORD moved = 0;
    Check(DeviceIoControl(file_, code, const_cast<void*>(input), static_cast<DWORD>(inputSize), output,
                          static_cast<DWORD>(outputSize), &moved, nullptr) != 0,
          "test control");
    return moved;
}

void Instrument::SetFaults(const std::string& plan) {
    Control(Simulator::TestControls::SetFaults, plan.data(), plan.size());
}

std::vector<BYTE> Instrument::Eeprom() {
    std::vector<BYTE> content(8192);
    content.resize(Control(Simulator::TestControls::ReadEeprom, nullptr, 0, content.data(), content.size()));
    return content;
}

std::string Instrument::TakeTranscript() {
    std::string transcript(1 << 16, '\0');
    transcript.resize(
        Control(Simulator::TestControls::TakeTranscript, nullptr, 0, transcript.data(), transcript.size()));
    return transcript;
}

Simulator::TestControls::Counts Instrument::Counts() {
    Simulator::TestControls::Counts counts{};
    Control(Simulator::TestControls::ReadCounts, nullptr, 0, &counts, sizeof counts);
    return counts;
}

}  // namespace Varnholt::Tests
