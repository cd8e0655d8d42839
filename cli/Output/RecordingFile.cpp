#include "Output/RecordingFile.h"

#include "Failure.h"

namespace Varnholt::Cli {
namespace {

namespace Files = std::filesystem;

Files::path PartialFor(const FinalName& name) {
    Files::path partial;
    if (name.CanBeReplaced()) {
        partial = name.Path();
        partial += ".part";
    }
    return partial;
}

}  // namespace

RecordingFile::RecordingFile(const std::string& name, const Interruption& userInterruption)
    : finalName(name), interruption(userInterruption), partial(PartialFor(finalName)), descriptor(Open()) {}

OutputDescriptor RecordingFile::Open() {
    std::error_code error;
    OutputDescriptor opened = partial.empty() ? OutputDescriptor::Open(finalName.Shown(), interruption, error)
                                              : OutputDescriptor::Create(partial.string(), error);
    if (error == std::errc::file_exists) {
        throw ToolFailure(ExitCode::File,
                          partial.string() + " exists: another run writes it, or one that was killed left it",
                          "it holds what that run recorded; move it away, or remove it, and try again");
    }
    if (error == std::errc::operation_canceled) {
        interruption.ThrowIfRequested();
    }
    if (error) {
        Fail(error);
    }
    return opened;
}

RecordingFile::~RecordingFile() {
    if (!isOpen) {
        return;
    }
    try {
        KeepWholeRecords();
    } catch (...) {  // it stays as FILE.part
    }
}

RecordOutput::Taken RecordingFile::Take(std::span<const char> block) {
    const OutputDescriptor::Outcome outcome = descriptor.Write(block, interruption);
    return {outcome.accepted, outcome.error};
}

void RecordingFile::Complete() {
    if (!partial.empty()) {
        if (const std::error_code error = descriptor.Sync()) {
            Fail(error);
        }
    }
    if (const std::error_code error = descriptor.Close()) {
        Fail(error);
    }
    if (!partial.empty()) {
        finalName.Give(partial, FinalName::IfItExists::Replace);
    }
    isOpen = false;
}

RecordOutput::Remains RecordingFile::KeepWholeRecords() {
    if (Records() == 0) {
        Discard();
        return {};
    }
    isOpen = false;
    if (partial.empty()) {
        return {finalName.Shown(), {}};
    }
    // What cannot be cut, synced or renamed is still more than nothing.
    descriptor.Cut(WholeBytes());
    descriptor.Sync();
    descriptor.Close();
    if (finalName.Existed()) {
        return {partial.string(), finalName.Shown()};
    }
    try {
        if (finalName.Give(partial, FinalName::IfItExists::Refuse)) {
            return {finalName.Shown(), {}};
        }
        return {partial.string(), finalName.Shown()};  // somebody was faster
    } catch (const ToolFailure&) {
        return {partial.string(), {}};
    }
}

void RecordingFile::Discard() {
    isOpen = false;
    descriptor.Close();
    if (!partial.empty()) {
        std::error_code ignored;
        Files::remove(partial, ignored);
    }
}

void RecordingFile::Fail(std::error_code error) const {
    finalName.Fail(error.message());
}

}  // namespace Varnholt::Cli
