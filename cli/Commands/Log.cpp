#include "Commands/AllCommands.h"
#include "Memory/MemoryTarget.h"
#include "Output/ValueList.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct ShowLogOptions : MemoryOptions {
    bool numbers = false;
};

void ShowLog(Session& session, const ShowLogOptions& options) {
    const MemoryTarget target(session, options, MemoryTarget::Use::Read);
    ImageModel model = target.Interpret([](const EepromImage& image) { return ImageModel(image); });
    const LogCopies copies = ReadLogCopies(target.Image());
    if (options.json) {
        session.Print({{"source", target.Name()},
                       {"used", copies.Used()},
                       {"mainValid", copies.main.isValid},
                       {"secondValid", copies.second.isValid},
                       {"values", model.Log()}});
        return;
    }
    if (!copies.main.isValid) {
        session.Warn(std::string("the main copy of the log is damaged; the driver uses ") +
                     (copies.second.isValid ? "the " : "") + copies.Used());
    }
    PrintValues(session, model.Log(), options.numbers ? Vectors::Numbers : Vectors::Plotted);
}

struct ResetLogOptions : MemoryOptions {
    ChangeOptions change;
};

void ResetLog(Session& session, const ResetLogOptions& options) {
    MemoryTarget target(session, options, MemoryTarget::Use::Change);
    const EepromImage empty = target.Interpret(WithEmptyLog);
    target.Change(empty, options.change, Granularity::Elements, {}, "empty log: ");
}

}  // namespace

void AddLog(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("log", "show and reset the usage log");

    auto [show, showOptions] = NewCommand(group, session, "show", "show the usage log", ShowLog);
    show.Under("Output").Add("--numbers", showOptions.numbers, "show vectors as numbers, not as plots");
    AddMemoryOptions(show, showOptions);

    auto [reset, resetOptions] =
        NewCommand(group, session, "reset", "empty both copies of the usage log", ResetLog);
    AddChangeOptions(reset, resetOptions.change);
    AddMemoryOptions(reset, resetOptions);
}

}  // namespace Varnholt::Cli
