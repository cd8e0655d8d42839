#include <fmt/format.h>
#include <fmt/ostream.h>

#include "Commands/CommandLine.h"
#include "Commands/Commands.h"
#include "Memory/ImageEdit.h"
#include "Memory/ImageModel.h"
#include "Memory/MemoryTarget.h"
#include "Output/ValueList.h"

namespace Varnholt::Cli {
namespace {

struct ShowOptions {
    MemoryOptions memory;
    bool numbers = false;
};

void Show(Session& session, const ShowOptions& options) {
    const MemoryTarget target(session, options.memory, MemoryTarget::Use::Read);
    ImageModel model(target.Image());
    const LogCopies copies = ReadLogCopies(target.Image());
    if (options.memory.json) {
        session.Print({{"source", target.Name()},
                       {"used", copies.Used()},
                       {"mainValid", copies.main.isValid},
                       {"secondValid", copies.second.isValid},
                       {"values", JsonOf(model.Log())}});
        return;
    }
    if (!copies.main.isValid) {
        session.Warn("the main copy of the log is damaged; this is " + std::string(copies.Used()));
    }
    PrintValues(session, model.Log(), options.numbers ? Vectors::Numbers : Vectors::Plotted);
}

struct ResetOptions {
    MemoryOptions memory;
    ChangeOptions change;
};

void Reset(Session& session, const ResetOptions& options) {
    MemoryTarget target(session, options.memory, MemoryTarget::Use::Change);
    const EepromImage empty = WithEmptyLog(target.Image());
    const MemoryTarget::Outcome outcome = target.Change(empty, options.change, Granularity::Elements);
    if (options.memory.json) {
        session.Print(target.JsonOf(outcome));
    } else {
        session.Out() << "empty log: " << MemoryTarget::TextOf(outcome, target.Name()) << '\n';
    }
}

}  // namespace

void AddLog(CLI::App& app, Session& session) {
    CLI::App* const group = app.add_subcommand("log", "show and reset the usage log");
    group->require_subcommand(1);

    const auto show = std::make_shared<ShowOptions>();
    CLI::App* command = group->add_subcommand("show", "show the usage log");
    command->add_flag("--numbers", show->numbers, "show vectors as numbers, not as plots")->group("Output");
    AddMemoryOptions(command, show->memory);
    SetAction(command, session, show, Show);

    const auto reset = std::make_shared<ResetOptions>();
    command = group->add_subcommand("reset", "empty both copies of the usage log");
    AddChangeOptions(command, reset->change);
    AddMemoryOptions(command, reset->memory);
    SetAction(command, session, reset, Reset);
}

}  // namespace Varnholt::Cli
