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

AtomicFile::AtomicFile(const std::string& name, IfItExists policy) : finalName_(name), ifItExists_(policy) {
    if (finalName_.Existed() && ifItExists_ == IfItExists::Refuse) {
        FailAsItExists();
    }
    Files::path written = name;
    if (finalName_.CanBeReplaced()) {
        partial_ = finalName_.Path();
        partial_ += ".part" + std::to_string(std::random_device{}());
        written = partial_;
    }
    errno = 0;
    stream_.open(written, std::ios::binary | std::ios::trunc);
    if (!stream_) {
        partial_.clear();
        finalName_.Fail(ReasonOfLastFailure());
    }
}

AtomicFile::~AtomicFile() {
    if (!committed_ && !partial_.empty()) {
        stream_.close();
        std::error_code ignored;
        Files::remove(partial_, ignored);
    }
}

void AtomicFile::Commit() {
    if (stream_) {
        errno = 0;
        stream_.close();
    }
    if (!stream_) {  // it may have failed before: then the reason is still that of the write
        finalName_.Fail(ReasonOfLastFailure());
    }
    if (!partial_.empty()) {
        errno = 0;
        if (!SyncToDisk(partial_.string())) {
            finalName_.Fail(ReasonOfLastFailure());
        }
        if (!finalName_.Give(partial_, ifItExists_)) {
            FailAsItExists();
        }
    }
    committed_ = true;
}

void AtomicFile::FailAsItExists() const {
    throw ToolFailure(ExitCode::File, finalName_.Shown() + " exists already",
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
