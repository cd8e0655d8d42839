#include "Utilities/Files/FinalName.h"

#include <system_error>

#include "Utilities/Files/FileError.h"
#include "Utilities/Files/SyncToDisk.h"

namespace Varnholt::Utilities::Files {
namespace {

namespace Files = std::filesystem;

/// Where the file system has no second names for a file, what comes between the question and the change
/// loses.
bool RenameIfFree(const Files::path& partial, const Files::path& target, std::error_code& error) {
    Files::create_hard_link(partial, target, error);
    if (!error) {
        Files::remove(partial, error);
        return true;
    }
    if (error == std::errc::file_exists || Files::exists(target, error)) {
        return false;
    }
    Files::rename(partial, target, error);
    return true;
}

}  // namespace

FinalName::FinalName(const std::string& name) : shownName_(name), target_(name) {
    std::error_code error;
    const Files::file_status status = Files::status(target_, error);
    existed_ = Files::exists(status);
    isOrdinary_ = !existed_ || Files::is_regular_file(status);
    if (Files::is_directory(status)) {
        throw FileError(name + " is a directory", "name a file");
    }
    if (isOrdinary_) {
        if (const Files::path real = Files::canonical(target_, error); !error) {
            target_ = real;
        }
    }
}

Files::path FinalName::Beside(const std::string& suffix) const {
    return isOrdinary_ ? Files::path(target_) += suffix : Files::path();
}

bool FinalName::Give(const Files::path& partial, IfItExists policy) const {
    std::error_code error;
    if (policy == IfItExists::Refuse) {
        if (!RenameIfFree(partial, target_, error)) {
            return false;
        }
    } else {
        if (Files::exists(target_, error)) {
            Files::permissions(partial, Files::status(target_, error).permissions(), error);
        }
        Files::rename(partial, target_, error);
    }
    if (error) {
        Fail(error.message());
    }
    // So that the name is on the disk as well; a system that cannot do that to a folder does without.
    SyncToDisk(target_.has_parent_path() ? target_.parent_path().string() : ".");
    return true;
}

void FinalName::Fail(const std::string& what) const {
    throw FileError("cannot write " + shownName_ + ": " + what,
                    "check the folder, its permissions and the free space");
}

}  // namespace Varnholt::Utilities::Files
