#include "Memory/MemoryTarget.h"

#include <fmt/format.h>

#include <filesystem>
#include <functional>
#include <numeric>
#include <ostream>

#include "Memory/InputFile.h"
#include "Output/ProgressLine.h"
#include "Service/Memory/ImageCheck.h"
#include "Terminal.h"
#include "Utilities/Files/AtomicFile.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

using Utilities::Files::WriteFileAtomically;

/// What is read once and then written could be two different things.
void RefuseToChangeInPlace(const std::string& file) {
    std::error_code error;
    if (file != StandardStream && std::filesystem::is_other(file, error)) {
        throw Failure(FailureKind::BadArgument, file + " is no ordinary file and cannot be changed",
                      "`--image -` reads standard input and writes what becomes of it to standard output");
    }
}

std::uint32_t CountDifferences(const EepromImage& a, const EepromImage& b) {
    return std::transform_reduce(a.begin(), a.end(), b.begin(), 0U, std::plus(), std::not_equal_to());
}

}  // namespace

void AddMemoryOptions(CommandSpec command, MemoryOptions& options, const std::string& argument) {
    AddInstrumentOptions(command, options);
    const std::string names = argument.empty() ? "--image" : "--image," + argument;
    command.Under("Instrument")
        .Add(names.c_str(), options.imageFile,
             "work on this image file instead of an instrument; `-` is standard input (and output)",
             {.type = "FILE", .excludes = {"--device", "--transport"}});
    AddJsonFlag(command, options.json);
}

void AddChangeOptions(CommandSpec command, ChangeOptions& options, BackupHabit habit) {
    const bool isMade = habit == BackupHabit::Always;
    CommandSpec change = command.Under("Change");
    change.Add("--dry-run", options.dryRun, "show what would be done and do nothing");
    change.Add("--backup", options.backupFile,
               isMade ? "file for the instrument's earlier content; must not exist (default: a new name)"
                      : "file for the instrument's earlier content; must not exist (default: no backup)",
               {.type = "FILE"});
    if (isMade) {
        change.Add("--no-backup", options.noBackup, "make no backup", {.excludes = {"--backup"}});
    }
}

MemoryTarget::MemoryTarget(Session& usedSession, const MemoryOptions& options, Use use)
    : session_(usedSession), json_(options.json), file_(options.imageFile) {
    if (!file_.empty()) {
        if (use == Use::Change) {
            RefuseToChangeInPlace(file_);
        }
        name_ = ShownSource(file_);
        image_ = ReadImageFile(session_, file_);
        return;
    }
    instrument_.emplace(
        session_.Context(),
        ChooseInstrument(session_, options, use == Use::Change ? Choice::MustBeNamed : Choice::FirstWillDo));
    name_ = instrument_->Identifier();
    image_ = ReadEepromTwice(*instrument_);
}

Failure MemoryTarget::Unusable(const std::string& reason) const {
    const std::string which = instrument_ ? "--device " + Service::ShortNameOf(name_) : QuotedSource(file_);
    return {FailureKind::BadData, name_ + ": the driver cannot use what is in it: " + reason,
            "`ostra eeprom check " + which + "` tells what is wrong with it"};
}

std::string MemoryTarget::MakeBackup(const ChangeOptions& options) {
    if (options.noBackup) {
        return {};
    }
    if (options.backupFile == StandardStream) {
        session_.ClaimOut();
        session_.WriteClaimedOut(image_);
        session_.Note("backup of " + name_ + " written to standard output");
        return options.backupFile;
    }
    try {
        return SaveBackup(*instrument_, image_, options.backupFile);
    } catch (const Failure& failure) {
        if (options.backupFile.empty() && failure.Kind() == FailureKind::File) {
            throw failure.Advising("--backup FILE makes it elsewhere; --no-backup leaves it out");
        }
        throw;
    }
}

std::string MemoryTarget::WayBack(const std::string& backup) const {
    if (backup.empty()) {
        return "the same command once more writes what is missing; there is no backup";
    }
    const bool isPiped = backup == StandardStream;
    return fmt::format("this brings back what was there before{}: ostra eeprom restore {} --device {}{}",
                       isPiped ? " (FILE: what went to standard output)" : "",
                       isPiped ? "FILE" : QuotedFileName(backup), Service::ShortNameOf(name_),
                       IsSane(CheckImage(image_)) ? "" : " --force");
}

MemoryTarget::Outcome MemoryTarget::Make(const EepromImage& wanted, const ChangeOptions& options,
                                         Granularity granularity) {
    Outcome outcome{CountDifferences(image_, wanted), 0, {}};
    if (instrument_) {
        if (options.dryRun) {
            outcome.pieces = PiecesToWrite(image_, wanted, granularity).size();
        } else {
            const auto [pieces, backup] = ChangeEeprom(
                *instrument_, image_, wanted, granularity,
                {[&] { return MakeBackup(options); }, [this](const auto& kept) { return WayBack(kept); }});
            outcome.pieces = pieces;
            outcome.backup = backup;
        }
    } else if (!options.dryRun && file_ == StandardStream) {
        session_.ClaimOut();
        session_.WriteClaimedOut(wanted);  // with or without a change: the next one waits for it
    } else if (!options.dryRun && outcome.bytes > 0) {
        WriteFileAtomically(file_, wanted);
    }
    return outcome;
}

void MemoryTarget::Change(const EepromImage& wanted, const ChangeOptions& options, Granularity granularity,
                          std::initializer_list<Json::Member> details, const std::string& lead) {
    const Outcome outcome = Make(wanted, options, granularity);
    if (json_) {
        Json result = {{"target", name_},
                       {"dryRun", options.dryRun},
                       {"changedBytes", outcome.bytes},
                       {"pieces", outcome.pieces},
                       {"backup", Json::OrNull(outcome.backup)}};
        for (const auto& [name, value] : details) {
            result.Add(name, value);
        }
        session_.Print(result);
        return;
    }
    session_.Out() << lead;
    if (outcome.bytes == 0) {
        session_.Out() << name_ << " holds this already; nothing to write\n";
        return;
    }
    const bool isInstrument = outcome.pieces > 0;
    session_.Out() << CountText(outcome.bytes, "byte") << " of " << name_
                   << (options.dryRun ? " would be changed" : " changed")
                   << (isInstrument ? " in " + CountText(outcome.pieces, "piece") : "")
                   << (isInstrument && !options.dryRun ? ", read back and compared" : "") << '\n';
}

}  // namespace Varnholt::Cli
