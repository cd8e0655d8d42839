#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Memory/InputFile.h"
#include "Memory/MemoryTarget.h"
#include "Memory/NewFile.h"
#include "Service/Memory/ImageCheck.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct BackupOptions : InstrumentOptions {
    NewFileOptions file;
};

void Backup(Session& session, const BackupOptions& options) {
    const NewFile file(session, options.file);
    auto instrument = OpenInstrument(session, options);
    const EepromImage image = ReadEepromTwice(instrument);
    file.Write(image);
    const bool isSane = IsSane(CheckImage(image));
    if (!isSane) {
        session.Warn("the EEPROM holds what the driver cannot use; `ostra eeprom check " +
                     QuotedSource(options.file.name) + "` says what");
    }
    session.Print(
        options.json,
        {{"identifier", instrument.Identifier()},
         {"file", options.file.name},
         {"bytes", image.size()},
         {"sane", isSane}},
        fmt::format("{}: {} bytes written to {}\n", instrument.Identifier(), image.size(), file.ShownName()));
}

struct WriteOptions : MemoryOptions {
    ChangeOptions change;
    std::string file;
    bool force = false;
};

/// Refuses an image that the driver cannot use, unless that is wanted.
void CheckBeforeWriting(Session& session, const WriteOptions& options, const EepromImage& image) {
    const std::string errors = ErrorsOf(CheckImage(image));
    if (errors.empty()) {
        return;
    }
    if (!options.force) {
        throw Failure(FailureKind::BadData, ShownSource(options.file) + " is not written: " + errors,
                      "`ostra eeprom check " + QuotedSource(options.file) +
                          "` tells all; --force writes it all the same");
    }
    session.Warn(ShownSource(options.file) + ": " + errors);
}

void Write(Session& session, const WriteOptions& options) {
    const EepromImage image = ReadImageFile(session, options.file);
    CheckBeforeWriting(session, options, image);
    MemoryTarget target(session, options, MemoryTarget::Use::Change);
    target.Change(image, options.change, Granularity::Pieces, {{"file", options.file}});
}

void Restore(Session& session, const WriteOptions& options) {
    // What there is now is what somebody wants to be rid of.
    WriteOptions restoring = options;
    restoring.change.noBackup = options.change.backupFile.empty();
    Write(session, restoring);
}

void New(Session& session, const BackupOptions& options) {
    const EepromImage image = FreshImage();
    const NewFile file(session, options.file);
    file.Write(image);
    session.Print(options.json, {{"file", options.file.name}, {"bytes", image.size()}},
                  fmt::format("the image of a fresh instrument written to {}\n", file.ShownName()));
}

void AddWriteOptions(CommandSpec command, WriteOptions& options, BackupHabit habit) {
    AddImageArgument(command, options.file);
    command.Under("Change").Add("--force", options.force, "write an image that the driver cannot use");
    AddChangeOptions(command, options.change, habit);
    AddCommonOptions(command, options);
}

}  // namespace

void AddEeprom(CommandSpec app, Session& session) {
    CommandSpec group =
        app.AddGroup("eeprom", "back up, write, restore, show, check and compare EEPROM images");

    auto [backup, backupOptions] =
        NewCommand(group, session, "backup", "save the EEPROM of an instrument in a file", Backup);
    AddNewFileOptions(backup, "--image,FILE", backupOptions.file);
    AddCommonOptions(backup, backupOptions);

    auto [write, writeOptions] = NewCommand(
        group, session, "write",
        "write an image the safe way: check it, make a backup, write what differs, read it back", Write);
    AddWriteOptions(write, writeOptions, BackupHabit::Always);

    auto [restore, restoreOptions] = NewCommand(
        group, session, "restore", "write a backup back (as `write`, without a new backup)", Restore);
    AddWriteOptions(restore, restoreOptions, BackupHabit::WhenNamed);

    auto [fresh, freshOptions] =
        NewCommand(group, session, "new", "make the image of a fresh instrument", New);
    AddNewFileOptions(fresh, "--image,FILE", freshOptions.file);
    AddJsonFlag(fresh, freshOptions.json);

    AddEepromViews(group, session);
}

}  // namespace Varnholt::Cli
