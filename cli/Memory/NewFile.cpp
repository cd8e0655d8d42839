#include "Memory/NewFile.h"

#include <filesystem>

#include "Memory/InputFile.h"
#include "Session.h"
#include "Utilities/Files/AtomicFile.h"

namespace Varnholt::Cli {

using Utilities::Files::AtomicFile;

void AddNewFileOptions(CommandSpec command, const char* names, NewFileOptions& options) {
    command.Add(names, options.name, "must not exist; `-` is standard output",
                {.type = "FILE", .isRequired = true});
    command.Under("Output").Add("--force", options.force, "replace a file that exists");
}

NewFile::NewFile(Session& usedSession, const NewFileOptions& chosen)
    : session_(usedSession), options_(chosen), isStandardOutput_(chosen.name == StandardStream) {
    if (isStandardOutput_) {
        session_.ClaimOut();
        return;
    }
    std::error_code error;
    replaces_ = options_.force || std::filesystem::is_other(options_.name, error);
    if (!replaces_ && std::filesystem::is_regular_file(options_.name, error)) {
        throw Failure(FailureKind::File, options_.name + " exists already",
                      "--force replaces it; or name a file that does not exist yet");
    }
}

void NewFile::Write(std::span<const std::uint8_t> content) const {
    if (isStandardOutput_) {
        session_.WriteClaimedOut(content);
    } else {
        Utilities::Files::WriteFileAtomically(
            options_.name, content,
            replaces_ ? AtomicFile::IfItExists::Replace : AtomicFile::IfItExists::Refuse);
    }
}

std::string NewFile::ShownName() const {
    return isStandardOutput_ ? "standard output" : options_.name;
}

}  // namespace Varnholt::Cli
