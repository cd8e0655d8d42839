#include <benchmark/benchmark.h>

#include <cstdint>
#include <optional>

#include "BenchHost.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "DeviceDriver/Ostra/LowLevel/SectionReader.h"
#include "FakeCommands.h"
#include "FreshEeprom.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"

/// What the memory model costs beyond its transfers.
namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

namespace EepromMap = Protocol::EepromMap;
using Generic::Configuration::Properties;

constexpr std::uint16_t FreshEntries = 55;

struct Model {
    explicit Model(const Bytes& image)
        : table(image.begin() + EepromMap::Table),
          log(table, image.begin()),
          calibration(
              SectionReader(table, &ConfigurationDataConverter::IsCalibrationParameter)(image.data(), 0)) {}

    PellandoEAT table;
    PellandoLog log;
    Properties calibration;
};

/// The image of a fresh instrument; its table is filled up with entries that mean nothing to anybody.
Bytes FreshImageWith(std::uint16_t entries) {
    Bytes image = Simulator::FreshEeprom();
    std::uint8_t* const header = &image[EepromMap::Table];
    for (std::uint16_t i = FreshEntries; i < entries; ++i) {
        std::uint8_t* const entry =
            header + EepromMap::TableLayout::FirstEntry + i * EepromMap::TableLayout::EntrySize;
        Protocol::StoreBig16(entry, static_cast<std::uint16_t>(30000 + i));
        Protocol::StoreBig32(entry + EepromMap::TableLayout::EntryAddress, 5000U + i);
    }
    Protocol::StoreBig16(header + EepromMap::TableLayout::Length,
                         static_cast<std::uint16_t>(EepromMap::TableLayout::FirstEntry +
                                                    entries * EepromMap::TableLayout::EntrySize));
    return image;
}

void ParseImage(benchmark::State& state) {
    const Bytes image = FreshImageWith(static_cast<std::uint16_t>(state.range(0)));
    for (auto _ : state) {
        Model model(image);
        benchmark::DoNotOptimize(&model);
    }
}
BENCHMARK(ParseImage)->ArgName("entries")->Arg(FreshEntries)->Arg(70)->Arg(84)->Unit(benchmark::kMicrosecond);

void DumpModel(benchmark::State& state) {
    FakeInstrument instrument;
    instrument.eeprom = FreshImageWith(static_cast<std::uint16_t>(state.range(0)));
    PellandoEEPROM eeprom(Open(instrument));
    for (auto _ : state) {
        benchmark::DoNotOptimize(eeprom.Dump());
    }
}
BENCHMARK(DumpModel)->ArgName("entries")->Arg(FreshEntries)->Arg(84)->Unit(benchmark::kMicrosecond);

/// Loading the model from the simulated instrument against two reads of 4096 bytes by the same commands,
/// alternately. What the model writes when it is destroyed is left out.
void LoadModel(benchmark::State& state) {
    Bench::BenchHost host(state.range(0) != 0, {});
    const Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionality> instrument(
        new PellandoFunctionality(nullptr, 0));
    double bare = 0;
    double loaded = 0;
    for (auto _ : state) {
        bare += Bench::Seconds([&] {
            for (const std::uint32_t address : {0U, Protocol::EepromSize / 2}) {
                Bytes half(Protocol::EepromSize / 2);
                instrument->ReadEEPROM(address, half);
                benchmark::DoNotOptimize(half.data());
            }
        });
        std::optional<PellandoEEPROM> eeprom;
        const double took = Bench::Seconds([&] { eeprom.emplace(instrument); });
        loaded += took;
        state.SetIterationTime(took);
    }
    state.counters["of_bare"] = bare / loaded;
}
BENCHMARK(LoadModel)->ArgName("usbio")->Arg(0)->Arg(1)->UseManualTime()->Iterations(200)->Unit(
    benchmark::kMicrosecond);

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
