#include <fmt/format.h>
#include <fmt/ostream.h>

#include <limits>
#include <optional>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Measurement.h"
#include "Output/AtomicFile.h"
#include "Output/Json.h"
#include "Platform/Time.h"
#include "Protocol/Instrument.h"
#include "Utilities/Tools/Win32/SystemHelperWin.h"

namespace Varnholt::Cli {
namespace {

constexpr std::uint32_t LongestRecord = 6553;
/// The library gives a transfer of a scan at least this long beyond its time-out.
constexpr std::uint32_t Grace = 3000;  // milliseconds

struct Options {
    InstrumentOptions instrument;
    MeasurementOptions measurement;
    std::uint32_t recordSize = Protocol::ReadoutBytes;
    std::uint32_t total = 0;
    std::uint32_t records = 0;
    std::uint32_t timeout = 5;
    bool raw = false, json = false;
    std::string output;
};

/// A scan under way: how much has come, and when something came last.
class Watcher final {
  public:
    Watcher(Session& usedSession, Progress& drawn) : session(usedSession) {
        session.Files().ObserveReads([this, &drawn](std::uint32_t bytes) {
            received += bytes;
            lastArrival = Platform::TickCount();
            drawn.Update(received);
        });
    }
    ~Watcher() { session.Files().ObserveReads({}); }
    Watcher(const Watcher&) = delete;
    Watcher& operator=(const Watcher&) = delete;

    std::uint64_t Received() const { return received; }
    std::uint32_t SilentFor() const { return Platform::TickCount() - lastArrival; }

  private:
    Session& session;
    std::uint64_t received = 0;
    std::uint32_t lastArrival = Platform::TickCount();
};

/// Runs the scan to its end. One that the user interrupts leaves an instrument that has been reset.
void RunScan(Session& session, Instrument& instrument, const Options& options, std::uint32_t total) {
    Progress progress = session.MakeProgress("scanning", total, "B");
    Watcher watcher(session, progress);
    try {
        instrument.Commands().StartScan(options.recordSize, options.timeout, total);
    } catch (const DeviceDriver::Generic::Utilities::IOException& exception) {
        if (session.UserInterruption().IsRequested()) {
            session.Files().Resume();
            instrument.Commands().Reset(Protocol::OpeningResetCode);
            throw ToolFailure(
                ExitCode::Interrupted,
                fmt::format("{}: scan interrupted after {}; nothing was written", instrument.Identifier(),
                            SizeText(static_cast<double>(watcher.Received()))));
        }
        const FailureReport report = Describe(std::current_exception());
        if (report.code == ExitCode::InputOutput && watcher.SilentFor() >= options.timeout * 1000 + Grace &&
            IsConnected(instrument.Identifier())) {
            throw ToolFailure(
                ExitCode::Timeout,
                fmt::format("{}: nothing came for {:.1f} s, {} before that ({})", instrument.Identifier(),
                            watcher.SilentFor() / 1000.0, SizeText(static_cast<double>(watcher.Received())),
                            exception.what()),
                "a shorter --total, or a longer --timeout");
        }
        throw;
    }
}

/// Takes the scan's data out of the library and writes them, record by record.
class RecordWriter final {
  public:
    RecordWriter(std::ostream& stream, const Options& chosen) : out(stream), options(chosen) {}

    void WriteAll(Instrument& instrument) {
        std::vector<std::uint8_t> record(options.recordSize);
        for (;;) {
            auto size = options.recordSize;
            instrument.Commands().GetScanData(record.data(), size);
            if (size == 0) {
                return;
            }
            Write(std::span(record).first(size));
        }
    }
    std::uint64_t Records() const { return records; }
    std::uint64_t Bytes() const { return bytes; }
    std::uint64_t LeftOver() const { return leftOver; }

  private:
    void Write(std::span<const std::uint8_t> record) {
        bytes += record.size();
        const bool isWhole = record.size() == options.recordSize;
        records += isWhole ? 1 : 0;
        leftOver += isWhole ? 0 : record.size();
        if (options.raw) {
            out.write(reinterpret_cast<const char*>(record.data()),
                      static_cast<std::streamsize>(record.size()));
        } else if (isWhole) {
            fmt::print(out, "{}\n", fmt::join(ValuesOf(record), ","));
        }
    }

    std::ostream& out;
    const Options& options;
    std::uint64_t records = 0, bytes = 0, leftOver = 0;
};

std::uint32_t TotalOf(const Options& options) {
    const std::uint64_t total =
        options.records > 0 ? std::uint64_t{options.records} * options.recordSize : options.total;
    if (total > 0xFFFFFFFF) {
        throw ToolFailure(ExitCode::Usage, "a scan holds less than 4 GiB", "fewer --records");
    }
    if (!options.raw && options.recordSize % 2 != 0) {
        throw ToolFailure(ExitCode::Usage, "records of an odd number of bytes hold no 16-bit values",
                          "an even --record-size, or --raw");
    }
    // Its driver drops a last record that is not whole.
    if (!Utilities::Tools::Is64BitOS() && total % options.recordSize != 0) {
        throw ToolFailure(
            ExitCode::Usage,
            fmt::format("over the transport native --total is a multiple of --record-size: {} is none of {}",
                        total, options.recordSize),
            "another --total or --record-size, or --transport usbio");
    }
    return static_cast<std::uint32_t>(total);
}

void Scan(Session& session, const Options& options) {
    session.UseTransport(options.instrument.transport);
    const std::uint32_t total = TotalOf(options);
    if (options.raw && options.output.empty()) {
        if (session.OutFacts().isTerminal) {
            throw ToolFailure(ExitCode::Usage, "raw bytes are no use on a terminal",
                              "write them to a file: --output FILE");
        }
        SetStandardOutputBinary();
    }
    Instrument instrument(session, options.instrument);
    std::optional<AtomicFile> file;
    if (!options.output.empty()) {
        file.emplace(options.output);
    }
    PrepareMeasurement(session, instrument, options.measurement);
    const std::uint32_t start = Platform::TickCount();
    RunScan(session, instrument, options, total);
    const double seconds = (Platform::TickCount() - start) / 1000.0;

    RecordWriter writer(file ? file->Stream() : session.Out(), options);
    writer.WriteAll(instrument);
    if (writer.Bytes() < total) {
        throw ToolFailure(ExitCode::InputOutput,
                          fmt::format("{}: the instrument stopped after {} of {} bytes",
                                      instrument.Identifier(), writer.Bytes(), total),
                          "a smaller --total, or none: then the scan is as long as the instrument makes it");
    }
    if (file) {
        file->Commit();
    }
    if (writer.LeftOver() > 0 && !options.raw) {
        session.Warn(
            fmt::format("the last {} bytes are no whole record and were left out", writer.LeftOver()));
    }
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()},
                       {"records", writer.Records()},
                       {"recordSize", options.recordSize},
                       {"bytes", writer.Bytes()},
                       {"seconds", seconds},
                       {"file", options.output}});
    } else {
        const double rate = seconds > 0 ? static_cast<double>(writer.Bytes()) / seconds : 0;
        session.Note(fmt::format("{} record{} of {} bytes in {:.3f} s{}{}", writer.Records(),
                                 writer.Records() == 1 ? "" : "s", options.recordSize, seconds,
                                 rate > 0 ? ", " + SizeText(rate) + "/s" : "",
                                 file ? ", written to " + options.output : ""));
    }
}

}  // namespace

void AddScan(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = app.AddCommand(
        "scan", "stream records: a fixed number of them, or until the instrument stops; Ctrl-C ends it");
    command
        .Add("--total", options->total,
             "bytes to read; over the transport native a multiple of --record-size")
        .Type("BYTES")
        .Between(1, std::numeric_limits<std::uint32_t>::max());
    command.Add("--records", options->records, "records to read")
        .Type("N")
        .Between(1, std::numeric_limits<std::uint32_t>::max())
        .Excludes("--total");
    command.Add("--record-size", options->recordSize, "bytes of a record, 1 to 6553 (default: 256)")
        .Type("BYTES")
        .Between(1, LongestRecord);
    command.Add("--timeout", options->timeout, "seconds that a transfer may take (default: 5)")
        .Type("S")
        .Between(0, 86400);
    const char* const group = "Output (default: CSV on standard output, one record a line)";
    command.Add("-o,--output", options->output, "write to a file, which is replaced when complete")
        .Type("FILE")
        .Group(group);
    command.AddFlag("--raw", options->raw, "the bytes as the instrument sent them").Group(group);
    command.AddFlag("--json", options->json, "print a summary as JSON; needs --output")
        .Needs("--output")
        .Group(group);
    AddMeasurementOptions(command, options->measurement);
    AddInstrumentOptions(command, options->instrument);
    SetAction(command, session, options, Scan);
}

}  // namespace Varnholt::Cli
