#include <benchmark/benchmark.h>

#include <vector>

#include "BareLoop.h"
#include "BenchHost.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"

namespace Varnholt::Bench {
namespace {

using DeviceDriver::Ostra::LowLevel::PellandoUSBDevice;
using DeviceDriver::Ostra::LowLevel::ScanRecordList;

constexpr std::uint32_t RecordSize = 256;

Protocol::NativeDriver::ControlBlock MeasureBlock() {
    Protocol::NativeDriver::ControlBlock block{};
    block[Protocol::NativeDriver::Block::Type] = Protocol::NativeDriver::TypeVendor;
    block[Protocol::NativeDriver::Block::Request] = static_cast<std::uint8_t>(Protocol::Request::Measure);
    return block;
}

/// Strip reads of the native transport, without the fixed pause of the command before them, against the bare
/// loop on the same device, alternately. Arguments: bytes in all, device speed in bytes per second (0: as
/// fast as it can), 1 for an open-ended scan.
void NativeStripRead(benchmark::State& state) {
    const auto total = static_cast<std::uint32_t>(state.range(0));
    const bool isOpenEnded = state.range(2) != 0;
    Simulator::InstrumentSettings settings;
    settings.scanBytes = total;
    settings.bytesPerSecond = static_cast<std::uint64_t>(state.range(1));
    BenchHost host(false, settings);

    double bare = 0;
    double native = 0;
    for (auto _ : state) {
        {
            const auto device = host.Open();
            BareLoop loop(*device);
            std::vector<std::uint8_t> result;
            bare += Seconds([&] { loop.Read(isOpenEnded ? 0 : total, result); });
        }
        PellandoUSBDevice device(nullptr, PellandoUSBDevice::ScanDevice(0));
        device.PerformDeviceIOControl(MeasureBlock(), nullptr, 0);
        ScanRecordList records;
        const double scan = Seconds([&] {
            if (isOpenEnded) {
                device.ReadDataStrip(records, RecordSize, 5000);
            } else {
                device.ReadDataCountedStrip(records, RecordSize, 5000, total);
            }
        });
        native += scan;
        state.SetIterationTime(scan);
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(total));
    const double records = static_cast<double>(state.iterations()) * total / RecordSize;
    state.counters["of_bare"] = bare / native;
    state.counters["ns_per_record"] = native / records * 1e9;
}

constexpr std::int64_t MegaByte = 1 << 20;
constexpr std::int64_t HighSpeed = 53'000'000;  ///< what USB high speed leaves for bulk data

BENCHMARK(NativeStripRead)
    ->ArgNames({"bytes", "speed", "open_ended"})
    ->ArgsProduct({{1 * MegaByte, 16 * MegaByte, 64 * MegaByte}, {0}, {0, 1}})
    ->ArgsProduct({{16 * MegaByte}, {HighSpeed}, {0, 1}})
    ->UseManualTime()
    ->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace Varnholt::Bench
