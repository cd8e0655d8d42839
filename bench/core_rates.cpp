// What the C++ core does in the same time as the Python package: readouts and a scan on a simulated
// instrument in this process. usage: core_rates native|usbio READOUTS RECORDS BYTES_PER_SECOND; prints
// seconds a readout, bytes a second. Run in turns with the package by python_rates.py.
#include <cstdlib>
#include <functional>
#include <iostream>
#include <numeric>
#include <string>
#include <vector>

#include "BenchHost.h"
#include "Protocol/ByteOrder.h"
#include "Service/Instruments.h"
#include "Service/Measurement.h"
#include "Service/ScanRun.h"

namespace {

using namespace Varnholt;

/// Makes values of the records and adds them up, as the package and the other side of the comparison do.
struct Summing {
    void operator()(std::span<const std::uint8_t> records, std::uint64_t) {
        values.resize(records.size() / 2);
        for (std::size_t i = 0; i < values.size(); ++i) {
            values[i] = Interface::ReadingOf(Protocol::LoadBig16(&records[2 * i]));
        }
        sum = std::accumulate(values.begin(), values.end(), sum);
    }
    std::vector<std::int32_t> values;
    std::int64_t sum = 0;
};

}  // namespace

int main(int count, char** arguments) {
    if (count != 5) {
        return 2;
    }
    const bool isUsbIo = std::string(arguments[1]) == "usbio";
    const auto number = [&](int i) { return std::strtoull(arguments[i], nullptr, 10); };
    Simulator::InstrumentSettings settings;
    settings.scanBytes = number(3) * Protocol::ReadoutBytes;
    settings.bytesPerSecond = number(4);
    Bench::BenchHost host(isUsbIo, settings);

    Service::Observer observer;
    Service::Interruption interruption;
    Service::InterruptibleDeviceFiles files(Platform::DeviceFiles());
    const Platform::ScopedDeviceFiles inForce(files);
    Service::Context context(observer, interruption, files);
    context.ChooseTransport(isUsbIo ? Service::Context::Transport::UsbIo
                                    : Service::Context::Transport::Native);
    Service::OpenedInstrument instrument(context, FindInstrument(context, {}));
    PrepareMeasurement(instrument, {});

    const double cpuBefore = Bench::CpuSeconds();
    std::int32_t last = 0;
    const double took = Bench::Seconds([&] {
        for (std::uint64_t i = 0; i < number(2); ++i) {
            last += TakeReadout(instrument).Values()[64];
        }
    });
    const auto readouts = static_cast<double>(number(2));
    std::cout << took / readouts << ' ' << (Bench::CpuSeconds() - cpuBefore) / readouts;

    Summing sink;
    Service::ScanReport report;
    const auto total = static_cast<std::uint32_t>(settings.scanBytes);
    const double scanned = Bench::Seconds([&] {
        RunScan(instrument, {Protocol::ReadoutBytes, total, 5}, std::ref(sink), report);
    });
    std::cout << ' ' << static_cast<double>(total) / scanned << '\n';
    return last == 0 && sink.sum == 0 ? 1 : 0;
}
