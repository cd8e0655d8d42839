#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "Protocol/Instrument.h"

namespace CLI {
class App;
}

namespace Varnholt::Simulator {

/// What the command line of ostra-simulator says.
struct ProgramOptions {
    std::vector<std::string> names;
    unsigned count = 1;
    std::vector<std::string> eepromFiles;
    std::string imageFile;
    std::string firmware = "new";
    std::uint64_t seed = 1;
    double light = 1.0;
    double gain = 1.0;
    std::uint64_t bytesPerSecond = 0;
    bool takesIntegrationTime = false;
    std::uint64_t scanBytes = Protocol::ReadoutBytes;
    std::uint64_t scanRecords = 0;
    std::optional<std::uint32_t> buttonAfter;
    std::string faults;
    double seconds = 0;
    std::optional<std::uint16_t> tcpPort;
    bool attach = false;
    std::string captureFile;
    bool verbose = false;
};

/// `options` must outlive `program`.
void DefineOptions(CLI::App& program, ProgramOptions& options);

/// Reads the command line; what is wrong with it is said on standard error. When the program has nothing more
/// to do, for that reason or because it was asked for help, gives its exit code.
std::optional<int> ReadOptions(int argc, char** argv, ProgramOptions& options);

/// Of a command line that cannot be used, and of a start that failed.
inline constexpr int UsageError = 2;

/// The names of the instruments that are asked for. Throws `std::runtime_error` with a text for people.
std::vector<std::string> InstrumentNames(const ProgramOptions& options);

}  // namespace Varnholt::Simulator
