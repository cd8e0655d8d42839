#include "Output/RecordingFile.h"

#include "Utilities/Files/FileError.h"

namespace Varnholt::Cli {

using Utilities::Files::FileError;
using Utilities::Files::FinalName;

RecordingFile::RecordingFile(const std::string& name, const Service::Interruption& userInterruption)
    : finalName_(name),
      interruption_(userInterruption),
      partial_(finalName_.Beside(".part")),
      descriptor_(Open()) {}

OutputDescriptor RecordingFile::Open() {
    std::error_code error;
    OutputDescriptor opened = partial_.empty()
                                  ? OutputDescriptor::Open(finalName_.Shown(), interruption_, error)
                                  : OutputDescriptor::Create(partial_.string(), error);
    if (error == std::errc::file_exists) {
        throw FileError(partial_.string() + " exists: another run writes it, or one that was killed left it",
                        "it holds what that run recorded; move it away, or remove it, and try again");
    }
    if (error == std::errc::operation_canceled) {
        interruption_.ThrowIfRequested();
    }
    if (error) {
        Fail(error);
    }
    return opened;
}

RecordingFile::~RecordingFile() {
    if (!isOpen_) {
        return;
    }
    try {
        KeepWholeRecords();
    } catch (...) {  // it stays as FILE.part
    }
}

OutputDescriptor::Outcome RecordingFile::Take(std::span<const char> block) {
    return descriptor_.Write(block, interruption_);
}

void RecordingFile::Complete() {
    if (!partial_.empty()) {
        if (const std::error_code error = descriptor_.Sync()) {
            Fail(error);
        }
    }
    if (const std::error_code error = descriptor_.Close()) {
        Fail(error);
    }
    if (!partial_.empty()) {
        finalName_.Give(partial_, FinalName::IfItExists::Replace);
    }
    isOpen_ = false;
}

RecordOutput::Remains RecordingFile::KeepWholeRecords() {
    if (Records() == 0) {
        Discard();
        return {};
    }
    isOpen_ = false;
    if (partial_.empty()) {
        return {finalName_.Shown(), {}};
    }
    // What cannot be cut, synced or renamed is still more than nothing.
    descriptor_.Cut(WholeBytes());
    descriptor_.Sync();
    descriptor_.Close();
    if (finalName_.Existed()) {
        return {partial_.string(), finalName_.Shown()};
    }
    try {
        if (finalName_.Give(partial_, FinalName::IfItExists::Refuse)) {
            return {finalName_.Shown(), {}};
        }
        return {partial_.string(), finalName_.Shown()};  // somebody was faster
    } catch (const FileError&) {
        return {partial_.string(), {}};
    }
}

void RecordingFile::Discard() {
    isOpen_ = false;
    descriptor_.Close();
    if (!partial_.empty()) {
        std::error_code ignored;
        std::filesystem::remove(partial_, ignored);
    }
}

void RecordingFile::Fail(std::error_code error) const {
    finalName_.Fail(error.message());
}

}  // namespace Varnholt::Cli
