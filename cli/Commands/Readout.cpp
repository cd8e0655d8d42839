#include "Interface/Readout.h"

#include <fmt/format.h>
#include <fmt/ostream.h>

#include <algorithm>
#include <array>
#include <numeric>
#include <optional>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "ElapsedTime.h"
#include "Measurement.h"
#include "Output/AtomicFile.h"
#include "Output/Json.h"

namespace Varnholt::Cli {
namespace {

constexpr std::size_t ValuesInARow = 8;

struct Options {
    InstrumentOptions instrument;
    MeasurementOptions measurement;
    std::uint32_t repeat = 1;
    double interval = 0;
    bool json = false, csv = false, plot = false, raw = false, ascii = false;
    std::string output;
};

using Values = std::array<std::int32_t, Protocol::ReadoutValues>;
using RawReadout = std::array<std::uint8_t, Protocol::ReadoutBytes>;

struct Readout {
    std::uint32_t number;  ///< from 1
    double seconds;        ///< since the first
    RawReadout bytes;

    Values GetValues() const { return Interface::ReadoutFromBytes(bytes); }
};

std::string Summary(const Values& values) {
    const auto [low, high] = std::minmax_element(values.begin(), values.end());
    const double mean = std::accumulate(values.begin(), values.end(), 0.0) / Protocol::ReadoutValues;
    return fmt::format("lowest {} at {}, highest {} at {}, mean {:.1f}", *low, low - values.begin(), *high,
                       high - values.begin(), mean);
}

void PrintTable(std::ostream& out, const Values& values) {
    for (std::size_t row = 0; row < values.size(); row += ValuesInARow) {
        fmt::print(out, "{:>3}:", row);
        for (std::size_t i = row; i < row + ValuesInARow; ++i) {
            fmt::print(out, " {:>6}", values[i]);
        }
        out << '\n';
    }
}

/// Writes readouts in the form that the user asked for.
class Writer final {
  public:
    Writer(Session& usedSession, const Options& chosen, std::string identifier)
        : session(usedSession), options(chosen), instrument(std::move(identifier)) {
        if (!options.output.empty()) {
            file.emplace(options.output);
        } else if (options.raw) {
            if (session.OutFacts().isTerminal) {
                throw ToolFailure(ExitCode::Usage, "raw bytes are no use on a terminal",
                                  "write them to a file: --output FILE");
            }
            SetStandardOutputBinary();
        }
    }

    void Write(const Readout& readout) {
        std::ostream& out = file ? file->Stream() : session.Out();
        const Values values = readout.GetValues();
        if (options.raw) {
            out.write(reinterpret_cast<const char*>(readout.bytes.data()), Protocol::ReadoutBytes);
        } else if (options.json) {
            PrintJson(out, {{"identifier", instrument},
                            {"readout", readout.number},
                            {"seconds", readout.seconds},
                            {"values", values}});
        } else if (options.csv) {
            if (readout.number == 1) {
                std::array<int, Protocol::ReadoutValues> indices{};
                std::iota(indices.begin(), indices.end(), 0);
                fmt::print(out, "readout,seconds,{}\n", fmt::join(indices, ","));
            }
            fmt::print(out, "{},{:.3f},{}\n", readout.number, readout.seconds, fmt::join(values, ","));
        } else {
            WriteForReaders(out, readout.number, values);
        }
        file ? file->Flush() : session.FlushOut();
    }

    void Finish() {
        if (file) {
            file->Commit();
        }
    }

    /// While a failure is being handled that ends the readouts after so many: those go into the file, and the
    /// failure goes on as one that says so.
    void FinishEarly(std::uint32_t taken) {
        if (!file || taken == 0) {
            return;
        }
        const FailureReport failure = session.Explain(std::current_exception());
        file->Commit();
        throw ToolFailure(failure.code,
                          fmt::format("{}; {} written to {}", failure.message,
                                      taken == 1 ? "1 readout was" : fmt::format("{} readouts were", taken),
                                      options.output),
                          failure.advice);
    }

  private:
    void WriteForReaders(std::ostream& out, std::uint32_t number, const Values& values) {
        std::string head;
        if (options.repeat != 1) {
            head = fmt::format("readout {}: ", number);
        }
        if (!options.plot) {
            out << (number > 1 ? "\n" : "");
            PrintTable(out, values);
        } else {
            PlotStyle style = session.StyleOfPlots();
            style.braille = style.braille && !options.ascii;
            if (number > 1 && !file && session.OutFacts().isTerminal) {
                fmt::print(out, "\x1b[{}A\x1b[J", PlotLines(style) + 1);  // over the one before
            }
            const std::vector<double> points(values.begin(), values.end());
            PrintPlot(out, points, style);
        }
        out << head << Summary(values) << '\n';
    }

    Session& session;
    const Options& options;
    const std::string instrument;
    std::optional<AtomicFile> file;
};

/// Waits until it is due, so many milliseconds after the first, and takes it.
Readout Take(Session& session, Instrument& instrument, std::uint32_t number, std::uint64_t due,
             ElapsedTime& time) {
    const std::uint64_t elapsed = time.Milliseconds();
    if (!session.UserInterruption().Sleep(static_cast<std::uint32_t>(due > elapsed ? due - elapsed : 0))) {
        session.UserInterruption().ThrowIfRequested();
    }
    Readout readout{number, static_cast<double>(time.Milliseconds()) / 1000, {}};
    instrument.Commands().MeasureRequest(readout.bytes.data(), Protocol::ReadoutBytes,
                                         Interface::FixedReadout::Timeout);
    return readout;
}

void TakeAll(Session& session, const Options& options) {
    Instrument instrument(session, options.instrument);
    Writer writer(session, options, instrument.Identifier());
    PrepareMeasurement(session, instrument, options.measurement);
    const auto interval = static_cast<std::uint64_t>(options.interval * 1000);
    ElapsedTime time;
    for (std::uint32_t taken = 0; options.repeat == 0 || taken < options.repeat; ++taken) {
        Readout readout{};
        try {
            // The interval is from start to start, so that it does not drift.
            readout = Take(session, instrument, taken + 1, taken * interval, time);
        } catch (...) {
            writer.FinishEarly(taken);
            throw;
        }
        writer.Write(readout);
    }
    writer.Finish();
}

void TakeReadouts(Session& session, const Options& options) {
    if (int{options.json} + int{options.csv} + int{options.plot} + int{options.raw} > 1) {
        throw ToolFailure(ExitCode::Usage, "--json, --csv, --plot and --raw exclude each other");
    }
    try {
        TakeAll(session, options);
    } catch (...) {
        const FailureReport end = session.Explain(std::current_exception());
        if (options.repeat != 0 || end.code != ExitCode::Interrupted) {
            throw;
        }
        // The only end that it has. Whoever wants a file is told what is in it.
        if (!options.output.empty()) {
            session.Note(end.message);
        }
    }
}

}  // namespace

void AddReadout(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = app.AddCommand("readout", "take readouts of 128 values");
    command.Add("-n,--repeat", options->repeat, "readouts to take, 0: until Ctrl-C (default: 1)").Type("N");
    command.Add("-i,--interval", options->interval, "seconds from one readout to the next")
        .Type("S")
        .Between(0.0, 86400.0);
    const char* const heading = "Output (default: a table)";
    command.AddFlag("--json", options->json, "print JSON, one line for each readout").Group(heading);
    command.AddFlag("--csv", options->csv, "print CSV, one line for each readout").Group(heading);
    command.AddFlag("--plot", options->plot, "draw the values").Group(heading);
    command.AddFlag("--raw", options->raw, "the 256 bytes of each readout as the instrument sent them")
        .Group(heading);
    command.AddFlag("--ascii", options->ascii, "draw without Braille characters").Group(heading);
    command.Add("-o,--output", options->output, "write to a file, which is replaced when complete")
        .Type("FILE")
        .Group(heading);
    AddMeasurementOptions(command, options->measurement);
    AddInstrumentOptions(command, options->instrument);
    SetAction(command, session, options, TakeReadouts);
}

}  // namespace Varnholt::Cli
