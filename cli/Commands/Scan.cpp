#include <fmt/format.h>

#include <limits>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Commands/MeasurementOptions.h"
#include "Commands/MeasurementOutput.h"
#include "Output/Json.h"
#include "Output/ProgressLine.h"
#include "Output/RecordCsv.h"
#include "Service/ScanRun.h"

namespace Varnholt::Cli {
namespace {

constexpr const char* RecordNoun = "record";

struct ScanOptions : InstrumentOptions {
    MeasurementOptions measurement;
    Service::ScanSettings scan;
    std::uint32_t records = 0;  ///< 0: as many as the scan's total has
    bool raw = false, discard = false, header = false;
    CsvColumns columns;
    std::string output;
};

/// How a scan ended, as its summary says it.
struct Ending {
    const char* how = "complete";
    Service::ScanReport report;
    double seconds = 0;
};

Service::ScanSettings SettingsOf(const ScanOptions& options, Service::Context::Transport transport) {
    Service::ScanSettings scan = options.scan;
    const std::uint64_t total =
        options.records > 0 ? std::uint64_t{options.records} * scan.recordSize : scan.total;
    if (total > 0xFFFFFFFF) {
        throw Failure(FailureKind::BadArgument, "a scan holds less than 4 GiB", "fewer --records");
    }
    if (!options.raw && scan.recordSize % 2 != 0) {
        throw Failure(FailureKind::BadArgument, "records of an odd number of bytes hold no 16-bit values",
                      "an even --record-size, or --raw");
    }
    // Its driver drops a last record that is not whole.
    if (transport == Service::Context::Transport::Native && total % scan.recordSize != 0) {
        throw Failure(
            FailureKind::BadArgument,
            fmt::format("over the transport native --total is a multiple of --record-size: {} is none of {}",
                        total, scan.recordSize),
            "another --total or --record-size, or --transport usbio");
    }
    scan.total = static_cast<std::uint32_t>(total);
    return scan;
}

const char* NameOf(ExitCode code) {
    switch (code) {
        case ExitCode::Interrupted:
            return "interrupted";
        case ExitCode::NoInstrument:
            return "unplugged";
        case ExitCode::Timeout:
            return "timeout";
        case ExitCode::File:
            return "output";
        default:
            return "failed";
    }
}

void PrintSummary(Session& session, const ScanOptions& options, const std::string& identifier,
                  const RecordOutput& output, const Ending& ending, const std::string& file) {
    session.Print({{"identifier", identifier},
                   {"records", output.Records()},
                   {"recordSize", options.scan.recordSize},
                   {"bytes", ending.report.received},
                   {"seconds", ending.seconds},
                   {"file", Json::OrNull(file)},
                   {"ended", ending.how}});
}

std::span<const char> CharactersOf(std::span<const std::uint8_t> bytes) {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

/// Scans into the output and completes it. `ending` is kept up to date, for whoever catches a failure.
void ScanInto(RecordOutput& output, Session& session, Service::OpenedInstrument& instrument,
              const ScanOptions& options, const Service::ScanSettings& scan, Ending& ending) {
    PrepareMeasurement(instrument, options.measurement.Settings());
    Service::ElapsedTime time;
    RecordCsv csv(scan.recordSize, options.columns);
    if (options.header) {
        output.Append(csv.Head(), 0);
    }
    const auto write = [&](std::span<const std::uint8_t> records, std::uint64_t milliseconds) {
        const std::uint64_t count = records.size() / scan.recordSize;
        if (options.raw) {
            output.Append(CharactersOf(records), count);
        } else {
            output.Append(csv.Lines(records, output.Records() + 1, milliseconds), count,
                          RecordOutput::Form::Lines);
        }
    };
    try {
        RunScan(instrument, scan, write, ending.report);
    } catch (...) {
        ending.seconds = time.Seconds();
        throw;
    }
    if (const auto& rest = ending.report.leftOver; !rest.empty()) {
        if (options.raw) {
            output.Append(CharactersOf(rest), 0);
        } else {
            session.Warn(fmt::format("the last {} bytes are no whole record and were left out", rest.size()));
        }
    }
    output.Complete();
    ending.seconds = time.Seconds();
}

void CheckForm(const ScanOptions& options) {
    if (options.json && !GoesToFile(options.output)) {
        throw Failure(FailureKind::BadArgument, "--json prints on standard output, and the records go there",
                      "write them to a file: --output FILE");
    }
    if (options.discard && !GoesToFile(options.output)) {
        throw Failure(FailureKind::BadArgument, "what is printed cannot be thrown away",
                      "write to a file: --output FILE");
    }
}

void Scan(Session& session, const ScanOptions& options) {
    session.ChooseTransport(options.transport);
    const Service::ScanSettings scan = SettingsOf(options, session.Context().UsedTransport());
    CheckForm(options);
    const auto output = MakeRecordOutput(session, options.output, options.raw);
    std::string identifier;
    Ending ending;
    try {
        auto instrument = OpenInstrument(session, options);
        identifier = instrument.Identifier();
        ScanInto(*output, session, instrument, options, scan, ending);
    } catch (...) {
        const EarlyEnd end = EndEarly(session, *output, RecordNoun, options.discard);
        if (options.json && !identifier.empty()) {
            ending.how = ending.report.hasStoppedEarly ? "short" : NameOf(ExitCodeOf(end.failure.Kind()));
            PrintSummary(session, options, identifier, *output, ending, end.file);
        }
        throw Failure(end.failure);
    }
    if (options.json) {
        PrintSummary(session, options, identifier, *output, ending, options.output);
    } else {
        const double rate =
            ending.seconds > 0 ? static_cast<double>(ending.report.received) / ending.seconds : 0;
        session.Note(fmt::format("{} of {} bytes in {:.3f} s{}{}", CountText(output->Records(), RecordNoun),
                                 scan.recordSize, ending.seconds,
                                 rate > 0 ? ", " + SizeText(rate) + "/s" : "",
                                 GoesToFile(options.output) ? ", written to " + options.output : ""));
    }
}

}  // namespace

void AddScan(CommandSpec app, Session& session) {
    auto [command, options] = NewCommand(
        app, session, "scan",
        "stream records: a fixed number of them, or until the instrument stops; Ctrl-C ends it", Scan);
    constexpr double mostBytes = std::numeric_limits<std::uint32_t>::max();
    command.Add("--total", options.scan.total,
                "bytes to read; over the transport native a multiple of --record-size",
                {.type = "BYTES", .between = {{1, mostBytes}}});
    command.Add("--records", options.records, "records to read",
                {.type = "N", .excludes = {"--total"}, .between = {{1, mostBytes}}});
    command.Add("--record-size", options.scan.recordSize, "bytes of a record, 1 to 6553 (default: 256)",
                {.type = "BYTES", .between = {{1, Service::LongestScanRecord}}});
    command.Add("--timeout", options.scan.timeout, "seconds that a transfer may take (default: 5)",
                {.type = "S", .between = {{0, 86400}}});
    CommandSpec output = command.Under("Output (default: CSV on standard output, one record a line)");
    output.Add("-o,--output", options.output,
               "write to a file, which is replaced when complete; -: to standard output", {.type = "FILE"});
    output.Add("--discard", options.discard, "keep nothing of a scan that ends early");
    output.Add("--raw", options.raw, "the bytes as the instrument sent them");
    output.Add("--header", options.header, "CSV: begin with the names of the columns",
               {.excludes = {"--raw"}});
    output.Add("--number", options.columns.number, "CSV: a column with each record's number, from 1",
               {.excludes = {"--raw"}});
    output.Add("--time", options.columns.seconds,
               "CSV: a column with the seconds from the start until the record's transfer came",
               {.excludes = {"--raw"}});
    output.Add("--json", options.json, "print a summary as JSON; needs --output");
    AddMeasurementOptions(command, options.measurement);
    AddInstrumentOptions(command, options);
}

}  // namespace Varnholt::Cli
