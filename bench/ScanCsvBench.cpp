#include <benchmark/benchmark.h>
#include <fmt/format.h>
#include <fmt/ostream.h>

#include <fstream>
#include <vector>

#include "Interface/Readout.h"
#include "Output/RecordCsv.h"
#include "Output/RecordingFile.h"
#include "Protocol/ByteOrder.h"
#include "SensorModel.h"
#include "Service/Interruption.h"
#include "Service/ScanRecorder.h"
#include "Timing.h"

namespace Varnholt::Bench {
namespace {

constexpr std::size_t RecordSize = 256;
constexpr std::size_t TransferSize = 65536;

std::vector<std::uint8_t> Transfer() {
    const Simulator::SensorModel sensor(1, 1, 1);
    std::vector<std::uint8_t> bytes(TransferSize);
    for (std::size_t i = 0; i < TransferSize / RecordSize; ++i) {
        sensor.Read({19'992, 1}, 1, static_cast<std::uint32_t>(i),
                    Simulator::SensorModel::Record(bytes.data() + i * RecordSize, RecordSize));
    }
    return bytes;
}

/// The way that `ostra scan` does not go: formatted lists of values into a stream.
void WriteStreamed(std::ostream& out, std::span<const std::uint8_t> transfer) {
    for (std::size_t i = 0; i < transfer.size(); i += RecordSize) {
        std::vector<std::int32_t> values;
        for (std::size_t j = i; j < i + RecordSize; j += 2) {
            values.push_back(Interface::ReadingOf(Protocol::LoadBig16(transfer.data() + j)));
        }
        fmt::print(out, "{}\n", fmt::join(values, ","));
    }
}

/// Records as CSV to where nothing is kept, against the streamed way, in turns. Processor time.
void ScanCsv(benchmark::State& state) {
    const std::vector<std::uint8_t> transfer = Transfer();
    std::ofstream stream("/dev/null", std::ios::binary);
    Service::Interruption none;
    Cli::RecordingFile file("/dev/null", none);
    Cli::RecordCsv csv(RecordSize, {});
    const Service::RecordSink write = [&](std::span<const std::uint8_t> records, std::uint64_t milliseconds) {
        file.Append(csv.Lines(records, file.Records() + 1, milliseconds), records.size() / RecordSize,
                    Cli::RecordOutput::Form::Lines);
    };
    Service::ScanReport report;
    Service::Progress unwatched;
    Service::ScanRecorder recorder(RecordSize, write, report, unwatched);
    double streamed = 0;
    double recorded = 0;
    for (auto _ : state) {
        const double begin = CpuSeconds();
        WriteStreamed(stream, transfer);
        const double middle = CpuSeconds();
        recorder.Receive(transfer);
        const double end = CpuSeconds();
        streamed += middle - begin;
        recorded += end - middle;
        state.SetIterationTime(end - middle);
    }
    const double megabytes = static_cast<double>(state.iterations()) * TransferSize / 1e6;
    state.counters["streamed_s_per_256MB"] = streamed / megabytes * 256;
    state.counters["recorded_s_per_256MB"] = recorded / megabytes * 256;
    state.counters["times_faster"] = streamed / recorded;
}
BENCHMARK(ScanCsv)->UseManualTime()->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace Varnholt::Bench
