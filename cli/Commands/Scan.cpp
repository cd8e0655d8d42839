#include <fmt/format.h>

#include <limits>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Commands/MeasurementOutput.h"
#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Measurement.h"
#include "Output/Json.h"
#include "Protocol/Instrument.h"
#include "ScanRecorder.h"

namespace Varnholt::Cli {
namespace {

constexpr std::uint32_t LongestRecord = 6553;
constexpr const char* Noun = "record";

struct Options {
    InstrumentOptions instrument;
    MeasurementOptions measurement;
    std::uint32_t recordSize = Protocol::ReadoutBytes;
    std::uint32_t total = 0;
    std::uint32_t records = 0;
    std::uint32_t timeout = 5;
    bool raw = false, json = false, discard = false;
    bool header = false, number = false, time = false;
    std::string output;
};

/// How a scan ended, as its summary says it.
struct Ending {
    const char* how = "complete";
    std::uint64_t received = 0;
    double seconds = 0;
};

/// An instrument whose scan was cut off would go on streaming.
void EndStream(Session& session, Instrument& instrument) {
    session.Files().Resume();
    try {
        instrument.Commands().Reset(Protocol::OpeningResetCode);
    } catch (...) {  // what ended the scan is what counts, and the next opening resets the instrument
    }
}

/// Whether a transfer brought less than it should.
bool IsShortfall(const std::exception_ptr& failure) {
    try {
        std::rethrow_exception(failure);
    } catch (const DeviceDriver::Generic::Utilities::DeviceDriverException& exception) {
        return exception.MissingData().has_value();
    } catch (...) {
        return false;
    }
}

/// Runs the scan to its end, or until less comes than should. One that ends on this side leaves an instrument
/// that has been reset.
void RunScan(Session& session, Instrument& instrument, const Options& options, std::uint32_t total,
             ScanRecorder& recorder) {
    std::exception_ptr failure;
    instrument.Commands().SetScanReceiver(&recorder);
    try {
        instrument.Commands().StartScan(options.recordSize, options.timeout, total);
    } catch (...) {
        failure = recorder.Failure() != nullptr ? recorder.Failure() : std::current_exception();
    }
    instrument.Commands().SetScanReceiver(nullptr);
    // A transfer that was aborted can look like one with which the instrument has stopped.
    const bool isComplete = failure == nullptr && total > 0 && recorder.Received() == total;
    if (session.UserInterruption().IsRequested() && !isComplete) {
        EndStream(session, instrument);
        throw ToolFailure(ExitCode::Interrupted, instrument.Identifier() + ": scan interrupted");
    }
    if (recorder.Failure() != nullptr) {
        EndStream(session, instrument);
    }
    // A transfer that brought less than it should is told as what is missing of the whole scan.
    const bool isShort = total > 0 && failure != nullptr && IsShortfall(failure);
    if (failure != nullptr && !isShort) {
        std::rethrow_exception(failure);
    }
}

std::uint32_t TotalOf(const Options& options, DeviceDriver::Ostra::Transport transport) {
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
    if (transport == DeviceDriver::Ostra::Transport::Native && total % options.recordSize != 0) {
        throw ToolFailure(
            ExitCode::Usage,
            fmt::format("over the transport native --total is a multiple of --record-size: {} is none of {}",
                        total, options.recordSize),
            "another --total or --record-size, or --transport usbio");
    }
    return static_cast<std::uint32_t>(total);
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

void PrintSummary(Session& session, const Options& options, const std::string& identifier,
                  const RecordOutput& output, const Ending& ending, const std::string& file) {
    session.Print({{"identifier", identifier},
                   {"records", output.Records()},
                   {"recordSize", options.recordSize},
                   {"bytes", ending.received},
                   {"seconds", ending.seconds},
                   {"file", file.empty() ? Json() : Json(file)},
                   {"ended", ending.how}});
}

/// Scans into the output and completes it. `ending` is kept up to date, for whoever catches a failure.
void ScanInto(RecordOutput& output, Session& session, Instrument& instrument, const Options& options,
              std::uint32_t total, Ending& ending) {
    PrepareMeasurement(session, instrument, options.measurement);
    ElapsedTime time;
    {
        Progress progress = session.MakeProgress("scanning", total, "B");
        ScanRecorder recorder(
            {options.recordSize, options.raw, options.header, {options.number, options.time}}, output,
            [&](std::uint64_t bytes) { progress.Update(bytes); });
        const auto note = [&] {
            ending.received = recorder.Received();
            ending.seconds = static_cast<double>(time.Milliseconds()) / 1000;
        };
        try {
            RunScan(session, instrument, options, total, recorder);
        } catch (...) {
            note();
            throw;
        }
        note();
        if (ending.received < total) {
            ending.how = "short";
            throw ToolFailure(
                ExitCode::InputOutput,
                fmt::format("{}: the instrument stopped: {} of {} bytes came", instrument.Identifier(),
                            ending.received, total),
                "a smaller --total, or none: then the scan is as long as the instrument makes it");
        }
        if (const auto rest = recorder.LeftOver(); !rest.empty()) {
            if (options.raw) {
                output.Append({reinterpret_cast<const char*>(rest.data()), rest.size()}, 0);
            } else {
                session.Warn(
                    fmt::format("the last {} bytes are no whole record and were left out", rest.size()));
            }
        }
    }
    output.Complete();
    ending.seconds = static_cast<double>(time.Milliseconds()) / 1000;
}

void CheckForm(const Options& options) {
    if (options.json && !GoesToFile(options.output)) {
        throw ToolFailure(ExitCode::Usage, "--json prints on standard output, and the records go there",
                          "write them to a file: --output FILE");
    }
    if (options.discard && !GoesToFile(options.output)) {
        throw ToolFailure(ExitCode::Usage, "what is printed cannot be thrown away",
                          "write to a file: --output FILE");
    }
}

void Scan(Session& session, const Options& options) {
    session.ChooseTransport(options.instrument.transport);
    const std::uint32_t total = TotalOf(options, session.UsedTransport());
    CheckForm(options);
    const auto output = MakeRecordOutput(session, options.output, options.raw);
    std::string identifier;
    Ending ending;
    try {
        Instrument instrument(session, options.instrument);
        identifier = instrument.Identifier();
        ScanInto(*output, session, instrument, options, total, ending);
    } catch (...) {
        const EarlyEnd end = EndEarly(session, *output, Noun, options.discard);
        if (options.json && !identifier.empty()) {
            ending.how = std::string_view(ending.how) == "short" ? ending.how : NameOf(end.failure.code);
            PrintSummary(session, options, identifier, *output, ending, end.file);
        }
        throw ToolFailure(end.failure.code, end.failure.message, end.failure.advice);
    }
    if (options.json) {
        PrintSummary(session, options, identifier, *output, ending, options.output);
    } else {
        const double rate = ending.seconds > 0 ? static_cast<double>(ending.received) / ending.seconds : 0;
        session.Note(fmt::format("{} of {} bytes in {:.3f} s{}{}", CountText(output->Records(), Noun),
                                 options.recordSize, ending.seconds,
                                 rate > 0 ? ", " + SizeText(rate) + "/s" : "",
                                 GoesToFile(options.output) ? ", written to " + options.output : ""));
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
    command
        .Add("-o,--output", options->output,
             "write to a file, which is replaced when complete; -: to standard output")
        .Type("FILE")
        .Group(group);
    command.AddFlag("--discard", options->discard, "keep nothing of a scan that ends early").Group(group);
    command.AddFlag("--raw", options->raw, "the bytes as the instrument sent them").Group(group);
    command.AddFlag("--header", options->header, "CSV: begin with the names of the columns")
        .Excludes("--raw")
        .Group(group);
    command.AddFlag("--number", options->number, "CSV: a column with each record's number, from 1")
        .Excludes("--raw")
        .Group(group);
    command
        .AddFlag("--time", options->time,
                 "CSV: a column with the seconds from the start until the record's transfer came")
        .Excludes("--raw")
        .Group(group);
    command.AddFlag("--json", options->json, "print a summary as JSON; needs --output").Group(group);
    AddMeasurementOptions(command, options->measurement);
    AddInstrumentOptions(command, options->instrument);
    SetAction(command, session, options, Scan);
}

}  // namespace Varnholt::Cli
