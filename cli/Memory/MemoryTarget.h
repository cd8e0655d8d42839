#pragma once

#include <optional>
#include <string>

#include "Commands/CommonOptions.h"
#include "Output/Rows.h"
#include "Service/Memory/EepromAccess.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::Cli {

/// What a memory command works on: an instrument, or an image file instead.
struct MemoryOptions : InstrumentOptions {
    std::string imageFile;
};

/// How a memory command changes it.
struct ChangeOptions {
    bool dryRun = false;
    bool noBackup = false;
    std::string backupFile;  ///< empty: a name is made up
};

/// --image FILE beside --device, --transport and --json. The file may stand as an argument too where that has
/// a name.
void AddMemoryOptions(CommandSpec command, MemoryOptions& options, const std::string& argument = {});
enum class BackupHabit {
    Always,     ///< unless --no-backup says otherwise
    WhenNamed,  ///< with --backup only
};
/// --dry-run, --backup and, where it means something, --no-backup.
void AddChangeOptions(CommandSpec command, ChangeOptions& options, BackupHabit habit = BackupHabit::Always);

/// The content of an EEPROM, where it came from, and the way back to there.
class MemoryTarget final {
  public:
    enum class Use { Read, Change };

    /// Reads it; an instrument is opened for the object's life.
    MemoryTarget(Session& session, const MemoryOptions& options, Use use);

    /// The instrument's identifier or the file's name.
    const std::string& Name() const { return name_; }
    const Service::EepromImage& Image() const { return image_; }

    /// What `read` makes of the image's values. The memory model's refusal of an image is a `Failure`
    /// that names the image and how to look into it.
    template <class Read>
    auto Interpret(Read read) const {
        try {
            return read(image_);
        } catch (const Utilities::Exceptions::RuntimeException& exception) {
            throw Unusable(exception.what());
        }
    }

    /// Makes the content `wanted` and tells the user: as JSON, with the members of `details`, or in a line
    /// behind `lead`. A file is replaced as a whole. Of an instrument a backup is made, only what differs is
    /// written, and all is read back.
    void Change(const Service::EepromImage& wanted, const ChangeOptions& options,
                Service::Granularity granularity, std::initializer_list<Json::Member> details,
                const std::string& lead = {});
    /// The same for a change of values, which the rows are.
    void Change(const Service::EepromImage& wanted, const ChangeOptions& options, const Rows& changes) {
        Change(wanted, options, Service::Granularity::Elements, {{"changes", changes.AsJson()}},
               changes.Text());
    }

  private:
    /// What a change did, or with a dry run would have done.
    struct Outcome {
        std::uint32_t bytes = 0;  ///< that differ
        std::size_t pieces = 0;   ///< written to an instrument
        std::string backup;       ///< file with the earlier content; empty: none was made
    };

    Outcome Make(const Service::EepromImage& wanted, const ChangeOptions& options,
                 Service::Granularity granularity);
    Failure Unusable(const std::string& reason) const;
    std::string MakeBackup(const ChangeOptions& options);
    std::string WayBack(const std::string& backup) const;

    Session& session_;
    const bool json_;
    std::string file_;
    std::optional<Service::OpenedInstrument> instrument_;
    std::string name_;
    Service::EepromImage image_;
};

}  // namespace Varnholt::Cli
