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

AtomicFile::AtomicFile(const std::string& name, IfItExists policy) : finalName(name), ifItExists(policy) {
    if (finalName.Existed() && ifItExists == IfItExists::Refuse) {
        FailAsItExists();
    }
    Files::path written = name;
    if (finalName.CanBeReplaced()) {
        partial = finalName.Path();
        partial += ".part" + std::to_string(std::random_device{}());
        written = partial;
    }
    errno = 0;
    stream.open(written, std::ios::binary | std::ios::trunc);
    if (!stream) {
        partial.clear();
        finalName.Fail(ReasonOfLastFailure());
    }
}

AtomicFile::~AtomicFile() {
    if (!committed && !partial.empty()) {
        stream.close();
        std::error_code ignored;
        Files::remove(partial, ignored);
    }
}

void AtomicFile::Commit() {
    if (stream) {
        errno = 0;
        stream.close();
    }
    if (!stream) {  // it may have failed before: then the reason is still that of the write
        finalName.Fail(ReasonOfLastFailure());
    }
    if (!partial.empty()) {
        errno = 0;
        if (!SyncToDisk(partial.string())) {
            finalName.Fail(ReasonOfLastFailure());
        }
        if (!finalName.Give(partial, ifItExists)) {
            FailAsItExists();
        }
    }
    committed = true;
}

void AtomicFile::FailAsItExists() const {
    throw ToolFailure(ExitCode::File, finalName.Shown() + " exists already",
                      "name a file that does not exist yet");
}

void WriteFileAtomically(const std::string& name, std::span<const std::uint8_t> content,
                         AtomicFile::IfItExists policy) {
    AtomicFile file(name, policy);
    file.Stream().write(reinterpret_cast<const char*>(content.data()),
                        static_cast<std::streamsize>(content.size()));
    file.Commit();
}

}  // namespace Varnholt::Cli
