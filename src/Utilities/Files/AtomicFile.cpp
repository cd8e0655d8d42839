#include "Utilities/Files/AtomicFile.h"

#include <cerrno>
#include <random>
#include <system_error>

#include "Utilities/Files/FileError.h"
#include "Utilities/Files/SyncToDisk.h"

namespace Varnholt::Utilities::Files {
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
    partial_ = finalName_.Beside(".part" + std::to_string(std::random_device{}()));
    errno = 0;
    stream_.open(partial_.empty() ? Files::path(name) : partial_, std::ios::binary | std::ios::trunc);
    if (!stream_) {
        partial_.clear();
        finalName_.Fail(ReasonOfLastFailure());
    }
}

AtomicFile::~AtomicFile() {
    if (!partial_.empty()) {
        stream_.close();
        std::error_code ignored;
        Files::remove(partial_, ignored);
    }
}

void AtomicFile::Write(std::span<const std::uint8_t> content) {
    stream_.write(reinterpret_cast<const char*>(content.data()),
                  static_cast<std::streamsize>(content.size()));
}

void AtomicFile::Prepare() {
    if (stream_) {
        errno = 0;
        stream_.close();
    }
    if (!stream_) {  // it may have failed before: then the reason is still that of the write
        finalName_.Fail(ReasonOfLastFailure());
    }
    errno = 0;
    if (!partial_.empty() && !SyncToDisk(partial_.string())) {
        finalName_.Fail(ReasonOfLastFailure());
    }
}

void AtomicFile::Commit() {
    Prepare();
    if (!partial_.empty() && !finalName_.Give(partial_, ifItExists_)) {
        FailAsItExists();
    }
    partial_.clear();
}

void AtomicFile::FailAsItExists() const {
    throw FileError(finalName_.Shown() + " exists already", "name a file that does not exist yet");
}

void WriteFileAtomically(const std::string& name, std::span<const std::uint8_t> content,
                         AtomicFile::IfItExists policy) {
    AtomicFile file(name, policy);
    file.Write(content);
    file.Commit();
}

}  // namespace Varnholt::Utilities::Files
