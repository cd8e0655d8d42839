#include <fmt/format.h>
#include <fmt/ostream.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Memory/MemoryTarget.h"
#include "Output/Json.h"
#include "Output/ValueList.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct ShowLogOptions {
    MemoryOptions memory;
    bool numbers = false;
};

void ShowLog(Session& session, const ShowLogOptions& options) {
    const MemoryTarget target(session, options.memory, MemoryTarget::Use::Read);
    ImageModel model = target.Interpret([](const EepromImage& image) { return ImageModel(image); });
    const LogCopies copies = ReadLogCopies(target.Image());
    if (options.memory.json) {
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

struct ResetLogOptions {
    MemoryOptions memory;
    ChangeOptions change;
};

void ResetLog(Session& session, const ResetLogOptions& options) {
    MemoryTarget target(session, options.memory, MemoryTarget::Use::Change);
    const EepromImage empty = target.Interpret(WithEmptyLog);
    target.Change(empty, options.change, Granularity::Elements, Json::Object(),
                  [&session] { session.Out() << "empty log: "; });
}

}  // namespace

void AddLog(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("log", "show and reset the usage log");

    auto [show, showOptions] = NewCommand(group, session, "show", "show the usage log", ShowLog);
    show.AddFlag("--numbers", showOptions.numbers, "show vectors as numbers, not as plots").Group("Output");
    AddMemoryOptions(show, showOptions.memory);

    auto [reset, resetOptions] =
        NewCommand(group, session, "reset", "empty both copies of the usage log", ResetLog);
    AddChangeOptions(reset, resetOptions.change);
    AddMemoryOptions(reset, resetOptions.memory);
}

}  // namespace Varnholt::Cli
