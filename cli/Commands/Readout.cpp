#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <numeric>
#include <sstream>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Commands/MeasurementOptions.h"
#include "Commands/MeasurementOutput.h"
#include "Output/Json.h"
#include "Output/LiveBlock.h"
#include "Output/ProgressLine.h"
#include "Output/WallTimeText.h"
#include "Service/ElapsedTime.h"

namespace Varnholt::Cli {
namespace {

constexpr std::size_t ValuesInARow = 8;

struct ReadoutOptions : InstrumentOptions {
    MeasurementOptions measurement;
    std::uint32_t repeat = 1;
    double interval = 0;
    bool csv = false, plot = false, raw = false, ascii = false;
    std::string output;
};

using Values = std::array<std::int32_t, Protocol::ReadoutValues>;

struct Readout {
    std::uint32_t number;  ///< from 1
    double seconds;        ///< since the first
    Service::RawReadout raw;
};

std::string Summary(const Values& values) {
    const auto [low, high] = std::minmax_element(values.begin(), values.end());
    const double mean = std::accumulate(values.begin(), values.end(), 0.0) / Protocol::ReadoutValues;
    return fmt::format("lowest {} at {}, highest {} at {}, mean {:.1f}", *low, low - values.begin(), *high,
                       high - values.begin(), mean);
}

std::string TableOf(const Values& values) {
    std::string text;
    for (std::size_t row = 0; row < values.size(); row += ValuesInARow) {
        text += fmt::format("{:>3}:", row);
        for (std::size_t i = row; i < row + ValuesInARow; ++i) {
            text += fmt::format(" {:>6}", values[i]);
        }
        text += '\n';
    }
    return text;
}

constexpr const char* ReadoutNoun = "readout";

/// Puts readouts into the form that the user asked for.
class Formatter final {
  public:
    Formatter(Session& usedSession, const ReadoutOptions& chosen, std::string identifier,
              const Service::MeasurementFacts& measurement)
        : session_(usedSession),
          options_(chosen),
          instrument_(std::move(identifier)),
          facts_(measurement),
          isDrawnOver_(!GoesToFile(options_.output) && session_.OutFacts().isTerminal),
          block_(session_.OutFacts()) {}

    /// What stands before the first readout.
    std::string Head() const {
        if (!options_.csv) {
            return {};
        }
        std::array<int, Protocol::ReadoutValues> indices{};
        std::iota(indices.begin(), indices.end(), 0);
        return fmt::format("readout,seconds,{},time,p1,p2,p3,p4,integrationTime\n", fmt::join(indices, ","));
    }

    std::string TextOf(const Readout& readout) {
        const Values values = readout.raw.Values();
        const Service::MeasurementParameters& p = facts_.parameters;
        if (options_.raw) {
            return {readout.raw.bytes.begin(), readout.raw.bytes.end()};
        }
        if (options_.json) {
            return Json({{"identifier", instrument_},
                         {"readout", readout.number},
                         {"seconds", readout.seconds},
                         {"values", values},
                         {"time", WallTimeText(readout.raw.time)},
                         {"parameters", std::array<unsigned, 4>{p.p1, p.p2, p.p3, p.p4}},
                         {"integrationTime", facts_.integrationTime}})
                .Text();
        }
        if (options_.csv) {
            return fmt::format("{},{:.3f},{},{},{},{},{},{},{}\n", readout.number, readout.seconds,
                               fmt::join(values, ","), WallTimeText(readout.raw.time), p.p1, p.p2, p.p3, p.p4,
                               facts_.integrationTime);
        }
        const std::string summary =
            (options_.repeat != 1 ? fmt::format("readout {}: ", readout.number) : "") + Summary(values);
        if (!options_.plot) {
            return (readout.number > 1 ? "\n" : "") + TableOf(values) + summary + '\n';
        }
        return PlotOf(values, summary);
    }

  private:
    std::string PlotOf(const Values& values, const std::string& summary) {
        PlotStyle style = session_.StyleOfPlots();
        style.braille = style.braille && !options_.ascii;
        std::string below = summary + '\n';
        if (isDrawnOver_) {
            // All of it is on the screen, or it could not be drawn over.
            const TerminalSize size = session_.OutFacts().size();
            below = Wrapped(summary, static_cast<std::size_t>(std::max(size.columns - 1, 1)));
            const int linesOfAxis = PlotLines(style) - style.height;
            const auto linesBelow = static_cast<int>(std::count(below.begin(), below.end(), '\n'));
            style.height = std::min(style.height, size.rows - linesBelow - linesOfAxis - 1);
        }
        std::ostringstream drawn;
        const std::vector<double> points(values.begin(), values.end());
        PrintPlot(drawn, points, style);
        return isDrawnOver_ ? block_.Over(drawn.str() + below) : drawn.str() + below;
    }

    Session& session_;
    const ReadoutOptions& options_;
    const std::string instrument_;
    const Service::MeasurementFacts facts_;
    const bool isDrawnOver_;
    LiveBlock block_;
};

/// Waits until it is due, so many milliseconds after the first, and takes it.
Readout Take(Service::OpenedInstrument& instrument, std::uint32_t number, std::uint64_t due,
             Service::ElapsedTime& time) {
    const std::uint64_t elapsed = time.Milliseconds();
    instrument.UsedContext().Sleep(static_cast<std::uint32_t>(due > elapsed ? due - elapsed : 0));
    const double seconds = time.Seconds();
    return {number, seconds, TakeReadout(instrument)};
}

/// Takes readouts until there are enough, or until the user ends what has no other end.
void TakeSeries(Session& session, Service::OpenedInstrument& instrument, const ReadoutOptions& options,
                Formatter& formatter, RecordOutput& output, Service::ElapsedTime& time) {
    const auto progress = session.StartProgress("taking", options.repeat, std::string(ReadoutNoun) + "s");
    const auto interval = static_cast<std::uint64_t>(options.interval * 1000);
    for (std::uint32_t taken = 0; options.repeat == 0 || taken < options.repeat; ++taken) {
        Readout readout{};
        try {
            // The interval is from start to start, so that it does not drift.
            readout = Take(instrument, taken + 1, taken * interval, time);
        } catch (...) {
            if (options.repeat == 0 && taken > 0 && session.UserInterruption().IsRequested()) {
                return;
            }
            throw;
        }
        if (taken == 0) {
            output.Append(formatter.Head(), 0);
        }
        output.Append(formatter.TextOf(readout), 1);
        if (GoesToFile(options.output)) {
            progress->Update(taken + 1);
        }
    }
}

void TakeInto(RecordOutput& output, Session& session, const ReadoutOptions& options) {
    auto instrument = OpenInstrument(session, options);
    const Service::MeasurementSettings settings = options.measurement.Settings();
    PrepareMeasurement(instrument, settings);
    const bool areFactsShown = options.json || options.csv;
    Formatter formatter(session, options, instrument.Identifier(),
                        areFactsShown ? FactsOf(instrument, settings) : Service::MeasurementFacts{});
    Service::ElapsedTime time;
    TakeSeries(session, instrument, options, formatter, output, time);
    output.Complete();
    if (GoesToFile(options.output)) {
        session.Note(fmt::format("{} in {:.3f} s, written to {}", CountText(output.Records(), ReadoutNoun),
                                 time.Seconds(), options.output));
    }
}

void TakeReadouts(Session& session, const ReadoutOptions& options) {
    const auto output = MakeRecordOutput(session, options.output, options.raw);
    try {
        TakeInto(*output, session, options);
    } catch (...) {
        const Failure failure = EndEarly(session, *output, ReadoutNoun, false).failure;
        // The user's wish is the only end that it has.
        if (options.repeat != 0 || failure.Kind() != FailureKind::Interrupted || output->Records() > 0) {
            throw Failure(failure);
        }
        // Whoever wants a file is told that there is none.
        if (GoesToFile(options.output)) {
            session.Note(failure.what());
        }
    }
}

}  // namespace

void AddReadout(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "readout", "take readouts of 128 values", TakeReadouts);
    command.Add("-n,--repeat", options.repeat, "readouts to take, 0: until Ctrl-C (default: 1)",
                {.type = "N"});
    command.Add("-i,--interval", options.interval, "seconds from one readout to the next",
                {.type = "S", .between = {{0, 86400}}});
    CommandSpec output = command.Under("Output (default: a table)");
    output.Add("--json", options.json, "print JSON, one line for each readout");
    output.Add("--csv", options.csv, "print CSV, one line for each readout", {.excludes = {"--json"}});
    output.Add("--plot", options.plot, "draw the values", {.excludes = {"--json", "--csv"}});
    output.Add("--raw", options.raw, "the 256 bytes of each readout as the instrument sent them",
               {.excludes = {"--json", "--csv", "--plot"}});
    output.Add("--ascii", options.ascii, "draw without Braille characters");
    output.Add("-o,--output", options.output,
               "write to a file, which is replaced when complete; -: to standard output", {.type = "FILE"});
    AddMeasurementOptions(command, options.measurement);
    AddInstrumentOptions(command, options);
}

}  // namespace Varnholt::Cli
