#include "Memory/NewFile.h"

#include <filesystem>

#include "Memory/ByteSource.h"
#include "Output/AtomicFile.h"
#include "Session.h"

namespace Varnholt::Cli {

void AddNewFileOptions(CommandSpec command, const char* names, NewFileOptions& options) {
    command.Add(names, options.name, "must not exist; `-` is standard output").Type("FILE").Required();
    command.AddFlag("--force", options.force, "replace a file that exists").Group("Output");
}

NewFile::NewFile(Session& usedSession, const NewFileOptions& chosen)
    : session(usedSession), options(chosen), isStandardOutput(chosen.name == StandardStream) {
    if (isStandardOutput) {
        session.ClaimOut();
        return;
    }
    std::error_code error;
    replaces = options.force || std::filesystem::is_other(options.name, error);
    if (!replaces && std::filesystem::is_regular_file(options.name, error)) {
        throw ToolFailure(ExitCode::File, options.name + " exists already",
                          "--force replaces it; or name a file that does not exist yet");
    }
}

void NewFile::Write(std::span<const std::uint8_t> content) const {
    if (isStandardOutput) {
        session.WriteClaimedOut(content);
    } else {
        WriteFileAtomically(options.name, content,
                            replaces ? AtomicFile::IfItExists::Replace : AtomicFile::IfItExists::Refuse);
    }
}

std::string NewFile::ShownName() const {
    return isStandardOutput ? "standard output" : options.name;
}

}  // namespace Varnholt::Cli
