#include "Commands/AllCommands.h"
#include "Memory/MemoryTarget.h"
#include "Output/ValueList.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

void ShowCalibration(Session& session, const MemoryOptions& options) {
    const MemoryTarget target(session, options, MemoryTarget::Use::Read);
    ImageModel model = target.Interpret([](const EepromImage& image) { return ImageModel(image); });
    if (options.json) {
        session.Print({{"source", target.Name()}, {"calibration", model.Calibration()}});
    } else {
        PrintValues(session, model.Calibration(), Vectors::Numbers);
    }
}

struct SetCalibrationOptions : MemoryOptions {
    ChangeOptions change;
    std::vector<std::string> assignments;
};

void SetCalibration(Session& session, const SetCalibrationOptions& options) {
    const std::vector<Assignment> assignments = ParseAssignments(options.assignments);
    MemoryTarget target(session, options, MemoryTarget::Use::Change);
    const EditedImage edited = target.Interpret(
        [&assignments](const EepromImage& image) { return WithCalibration(image, assignments); });
    Rows changes({{"ID", "id", Rows::Right}, {"BEFORE", "before"}, {}, {"AFTER", "after"}});
    for (const ValueChange& change : edited.changes) {
        changes.Add({change.id, CellOf(change.before), "->", CellOf(change.after)});
    }
    target.Change(edited.image, options.change, changes);
}

}  // namespace

void AddCalibration(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("calibration", "show and set calibration values");

    auto [show, showOptions] =
        NewCommand(group, session, "show", "show the calibration values", ShowCalibration);
    AddMemoryOptions(show, showOptions);

    auto [set, setOptions] = NewCommand(
        group, session, "set",
        "set calibration values: the EEPROM is read, changed as a whole and proven, backed up, written "
        "where it differs, and read back",
        SetCalibration);
    set.Add("ID=VALUE", setOptions.assignments, "new values; elements with commas: 1000=0.5,1.5",
            {.isRequired = true});
    AddChangeOptions(set, setOptions.change);
    AddMemoryOptions(set, setOptions);
}

}  // namespace Varnholt::Cli
