#include <benchmark/benchmark.h>

#include <array>
#include <chrono>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "BareLoop.h"
#include "BenchHost.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "ostra.h"

namespace Varnholt::Bench {
namespace {

using DeviceDriver::Ostra::LowLevel::PellandoFunctionality;

/// Bytes of physical memory that the process has used at most since `ForgetPeak`.
double PeakMemory() {
    std::ifstream status("/proc/self/status");
    for (std::string word; status >> word;) {
        if (word == "VmHWM:") {
            double kilobytes = 0;
            status >> kilobytes;
            return kilobytes * 1024;
        }
    }
    return 0;
}

void ForgetPeak() {
    std::ofstream("/proc/self/clear_refs") << "5";
}

/// The pause that each command makes first. A system makes it somewhat longer, so it is measured.
void Pause() {
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
}

/// A whole scan over USBIO, the pause of its vendor request left out, against the bare loop on the same
/// device, in turns. Arguments: bytes in all, device speed in bytes per second (0:
/// as fast as it can), 1 for an open-ended scan.
void UsbIoScan(benchmark::State& state) {
    const auto total = static_cast<std::uint32_t>(state.range(0));
    const bool isOpenEnded = state.range(2) != 0;
    Simulator::InstrumentSettings settings;
    settings.scanBytes = total;
    settings.bytesPerSecond = static_cast<std::uint64_t>(state.range(1));
    BenchHost host(true, settings);

    double bare = 0;
    double scanned = 0;
    double peak = 0;
    for (auto _ : state) {
        {
            const auto device = host.Open();
            BareLoop loop(*device);
            std::vector<std::uint8_t> result;
            bare += Seconds([&] {
                result.resize(isOpenEnded ? 0 : total);
                loop.Read(isOpenEnded ? 0 : total, result);
            });
        }
        PellandoFunctionality instrument(nullptr, 0);
        ForgetPeak();
        const double before = PeakMemory();
        const double whole = Seconds([&] { instrument.StartScan(256, 5, isOpenEnded ? 0 : total); });
        peak = std::max(peak, PeakMemory() - before);
        const double scan = whole - Seconds(Pause);
        scanned += scan;
        state.SetIterationTime(scan);
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(total));
    state.counters["of_bare"] = bare / scanned;
    state.counters["peak_of_data"] = peak / total;
}

constexpr std::int64_t MegaByte = 1'000'000;
constexpr std::int64_t HighSpeed = 53'000'000;  ///< what USB high speed leaves for bulk data
BENCHMARK(UsbIoScan)
    ->ArgNames({"bytes", "speed", "open_ended"})
    ->ArgsProduct({{1 * MegaByte, 16 * MegaByte, 64 * MegaByte, 256 * MegaByte}, {0}, {0, 1}})
    ->ArgsProduct({{16 * MegaByte}, {HighSpeed}, {0, 1}})
    ->UseManualTime()
    ->Unit(benchmark::kMillisecond);

/// Processor time of one command, all threads together, beyond what its pause takes: going to sleep and
/// waking up, most of all in a virtual machine.
void Command(benchmark::State& state) {
    BenchHost host(state.range(0) != 0, {});
    PellandoFunctionality instrument(nullptr, 0);
    double used = 0;
    double paused = 0;
    for (auto _ : state) {
        const double before = CpuSeconds();
        instrument.SetMeasureParameters(294, 0, 1, 6);
        const double whole = CpuSeconds() - before;
        used += whole;
        state.SetIterationTime(whole);
        const double beforePause = CpuSeconds();
        Pause();
        paused += CpuSeconds() - beforePause;
    }
    state.counters["cpu_us"] = (used - paused) / static_cast<double>(state.iterations()) * 1e6;
    state.counters["pause_cpu_us"] = paused / static_cast<double>(state.iterations()) * 1e6;
}
BENCHMARK(Command)->ArgName("usbio")->Arg(0)->Arg(1)->UseManualTime()->Iterations(300)->Unit(
    benchmark::kMicrosecond);

/// An exported readout beyond its fixed wait of 1000 ms and the pauses of 1 ms of its commands.
void ExportedReadout(benchmark::State& state) {
    const bool overUsbIo = state.range(0) != 0;
    BenchHost host(overUsbIo, {});
    // Reset, parameters and measurement; on the instrument's own driver two more controls when it is closed.
    const double fixedTime = 1.000 + 0.001 * (overUsbIo ? 3 : 5);
    double beyond = 0;
    for (auto _ : state) {
        std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};
        const double took = Seconds([&] {
            if (d4fb86cecc88582a(values.data(), "") != OSTRA_OK) {
                state.SkipWithError(b5ae189db26b2a1b("LastError"));
            }
        });
        beyond += took - fixedTime;
        state.SetIterationTime(took - fixedTime);
    }
    state.counters["beyond_ms"] = beyond / static_cast<double>(state.iterations()) * 1e3;
}
BENCHMARK(ExportedReadout)
    ->ArgName("usbio")
    ->Arg(0)
    ->Arg(1)
    ->UseManualTime()
    ->Iterations(5)
    ->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace Varnholt::Bench
