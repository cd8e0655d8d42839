#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "Platform/Win32/Windows.h"
#include "windows/TestControls.h"

namespace Varnholt::Tests {

/// The stand-in for the kernel driver of this host: the instrument's own driver on 32-bit Windows, the USBIO
/// driver on 64-bit Windows. Installed with the object; plugs instruments in and out as the system's plug and
/// play does.
class StandInDriver final {
  public:
    /// `image` is the driver's file. Throws `std::runtime_error` where something cannot be had.
    explicit StandInDriver(const std::string& image);
    ~StandInDriver();
    StandInDriver(const StandInDriver&) = delete;
    StandInDriver& operator=(const StandInDriver&) = delete;

    static bool HostIs64Bit();

    /// Plugs in an instrument and returns its path, once the system lists it.
    std::string PlugIn();
    /// Pulls it out, and returns when the system does not list it any more.
    void Unplug(const std::string& path);
    void UnplugAll();

    /// The seed of the instrument's noise.
    std::uint64_t SeedOf(const std::string& path) const;

    /// The paths that the system lists, in its order.
    static std::vector<std::string> List();

  private:
    void Enumerate();

    SC_HANDLE manager_ = nullptr;
    SC_HANDLE service_ = nullptr;
    unsigned nextDevice_ = 0;
    struct Device {
        std::string path;
        std::string key;  // name of its registry key
        std::uint64_t seed;
    };
    std::vector<Device> plugged_;
};

/// A handle of an instrument for what a test wants to do to it, past the library.
class Instrument final {
  public:
    explicit Instrument(const std::string& path);
    ~Instrument() { CloseHandle(file_); }
    Instrument(const Instrument&) = delete;
    Instrument& operator=(const Instrument&) = delete;

    void PressButton() { Control(Simulator::TestControls::PressButton); }
    void SetFaults(const std::string& plan);
    void UseElsewhere() { Control(Simulator::TestControls::UseElsewhere); }
    std::vector<BYTE> Eeprom();
    std::string TakeTranscript();
    Simulator::TestControls::Counts Counts();

  private:
    DWORD Control(DWORD code, const void* input = nullptr, std::size_t inputSize = 0, void* output = nullptr,
                  std::size_t outputSize = 0);

    HANDLE file_;
};

}  // namespace Varnholt::Tests
