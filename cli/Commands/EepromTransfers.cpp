#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Commands/Eeprom.h"
#include "Memory/InputFile.h"
#include "Memory/MemoryTarget.h"
#include "Memory/NewFile.h"
#include "Output/Json.h"
#include "Service/Memory/ImageCheck.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct BackupOptions {
    MemoryOptions memory;
    NewFileOptions file;
};

void Backup(Session& session, const BackupOptions& options) {
    const NewFile file(session, options.file);
    Service::OpenedInstrument instrument(session.Context(),
                                         ChooseInstrument(session, options.memory.instrument));
    const EepromImage image = ReadEepromTwice(instrument);
    file.Write(image);
    const bool isSane = IsSane(CheckImage(image));
    if (!isSane) {
        session.Warn("the EEPROM holds what the driver cannot use; `ostra eeprom check " +
                     QuotedSource(options.file.name) + "` says what");
    }
    if (options.memory.json) {
        session.Print({{"identifier", instrument.Identifier()},
                       {"file", options.file.name},
                       {"bytes", image.size()},
                       {"sane", isSane}});
    } else {
        session.Out() << instrument.Identifier() << ": " << image.size() << " bytes written to "
                      << file.ShownName() << '\n';
    }
}

struct WriteOptions {
    MemoryOptions memory;
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
    MemoryTarget target(session, options.memory, MemoryTarget::Use::Change);
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
    if (options.memory.json) {
        session.Print({{"file", options.file.name}, {"bytes", image.size()}});
    } else {
        session.Out() << "the image of a fresh instrument written to " << file.ShownName() << '\n';
    }
}

void AddWriteOptions(CommandSpec command, WriteOptions& options, BackupHabit habit) {
    command.Add("--image,FILE", options.file, "image of 8192 bytes; `-` is standard input")
        .Type("FILE")
        .Required();
    command.AddFlag("--force", options.force, "write an image that the driver cannot use").Group("Change");
    AddChangeOptions(command, options.change, habit);
    AddInstrumentOptions(command, options.memory.instrument);
    AddJsonFlag(command, options.memory.json);
}

}  // namespace

void AddEepromTransfers(CommandSpec group, Session& session) {
    auto [backup, backupOptions] =
        NewCommand(group, session, "backup", "save the EEPROM of an instrument in a file", Backup);
    AddNewFileOptions(backup, "--image,FILE", backupOptions.file);
    AddInstrumentOptions(backup, backupOptions.memory.instrument);
    AddJsonFlag(backup, backupOptions.memory.json);

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
    AddJsonFlag(fresh, freshOptions.memory.json);
}

void AddEeprom(CommandSpec app, Session& session) {
    CommandSpec group =
        app.AddGroup("eeprom", "back up, write, restore, show, check and compare EEPROM images");
    AddEepromTransfers(group, session);
    AddEepromViews(group, session);
}

}  // namespace Varnholt::Cli
