#include "Output/AtomicFile.h"

#include <cerrno>
#include <random>
#include <system_error>

#include "Failure.h"
#include "Terminal.h"

namespace Varnholt::Cli {
namespace {

namespace Files = std::filesystem;

std::string ReasonOfLastFailure() {
    return errno != 0 ? std::generic_category().message(errno) : std::string("cannot be written");
}

}  // namespace

AtomicFile::AtomicFile(const std::string& name, IfItExists policy)
    : shownName(name), ifItExists(policy), target(name) {
    std::error_code error;
    const Files::file_status status = Files::status(target, error);
    if (Files::is_directory(status)) {
        throw ToolFailure(ExitCode::File, name + " is a directory", "name a file");
    }
    if (Files::exists(status) && ifItExists == IfItExists::Refuse) {
        throw ToolFailure(ExitCode::File, name + " exists already", "name a file that does not exist yet");
    }
    Files::path written = target;
    if (!Files::exists(status) || Files::is_regular_file(status)) {
        // Through a link: the link stays, what it points to is replaced.
        if (const Files::path real = Files::canonical(target, error); !error) {
            target = real;
        }
        partial = target;
        partial += ".part" + std::to_string(std::random_device{}());
        written = partial;
    }
    errno = 0;
    stream.open(written, std::ios::binary | std::ios::trunc);
    if (!stream) {
        partial.clear();
        Fail(ReasonOfLastFailure());
    }
}

AtomicFile::~AtomicFile() {
    if (!committed && !partial.empty()) {
        stream.close();
        std::error_code ignored;
        Files::remove(partial, ignored);
    }
}

void AtomicFile::Flush() {
    if (stream) {
        errno = 0;
        stream.flush();
    }
    if (!stream) {  // it may have failed before: then the reason is still that of the write
        Fail(ReasonOfLastFailure());
    }
}

void AtomicFile::Commit() {
    Flush();
    errno = 0;
    stream.close();
    if (!stream) {
        Fail(ReasonOfLastFailure());
    }
    if (!partial.empty()) {
        errno = 0;
        if (!SyncToDisk(partial.string())) {
            Fail(ReasonOfLastFailure());
        }
        std::error_code error;
        if (ifItExists == IfItExists::Refuse && Files::exists(target, error)) {
            throw ToolFailure(ExitCode::File, shownName + " exists already",
                              "name a file that does not exist yet");
        }
        if (Files::exists(target, error)) {
            Files::permissions(partial, Files::status(target, error).permissions(), error);
        }
        Files::rename(partial, target, error);
        if (error) {
            Fail(error.message());
        }
        // So that the name is on the disk as well; a system that cannot do that to a folder does without.
        SyncToDisk(target.has_parent_path() ? target.parent_path().string() : ".");
    }
    committed = true;
}

void AtomicFile::Fail(const std::string& what) const {
    throw ToolFailure(ExitCode::File, "cannot write " + shownName + ": " + what,
                      "check the folder, its permissions and the free space");
}

void WriteFileAtomically(const std::string& name, std::span<const std::uint8_t> content,
                         AtomicFile::IfItExists policy) {
    AtomicFile file(name, policy);
    file.Stream().write(reinterpret_cast<const char*>(content.data()),
                        static_cast<std::streamsize>(content.size()));
    file.Commit();
}

}  // namespace Varnholt::Cli
