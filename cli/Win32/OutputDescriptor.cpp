#include "Output/OutputDescriptor.h"

#include <fcntl.h>
#include <io.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <utility>

namespace Varnholt::Cli {
namespace {

constexpr std::size_t FilePiece = 1 << 20;
constexpr std::size_t PipePiece = 4096;

std::error_code LastCode() {
    return {errno, std::generic_category()};
}

bool IsFile(int descriptor) {
    struct _stat64 facts {};
    return ::_fstat64(descriptor, &facts) == 0 && (facts.st_mode & _S_IFMT) == _S_IFREG;
}

}  // namespace

OutputDescriptor::OutputDescriptor(int openDescriptor, Ownership ownership)
    : descriptor_(openDescriptor),
      isOwn_(ownership == Ownership::Own),
      isFile_(openDescriptor >= 0 && IsFile(openDescriptor)) {}

OutputDescriptor OutputDescriptor::Of(Standard stream) {
    return {static_cast<int>(stream), Ownership::Borrowed};
}

OutputDescriptor OutputDescriptor::Create(const std::string& path, std::error_code& error) {
    const int created = ::_open(path.c_str(), _O_WRONLY | _O_CREAT | _O_EXCL | _O_BINARY | _O_NOINHERIT,
                                _S_IREAD | _S_IWRITE);
    error = created < 0 ? LastCode() : std::error_code();
    return {created, Ownership::Own};
}

OutputDescriptor OutputDescriptor::Open(const std::string& path, const Service::Interruption&,
                                        std::error_code& error) {
    const int opened = ::_open(path.c_str(), _O_WRONLY | _O_BINARY | _O_NOINHERIT);
    error = opened < 0 ? LastCode() : std::error_code();
    return {opened, Ownership::Own};
}

OutputDescriptor::Outcome OutputDescriptor::Write(std::span<const char> bytes,
                                                  const Service::Interruption& interruption) {
    std::size_t accepted = 0;
    while (accepted < bytes.size()) {
        // Nothing here tells whether a pipe has room; only what comes next is refused.
        if (!isFile_ && accepted > 0 && interruption.IsRequested()) {
            return {accepted, std::make_error_code(std::errc::operation_canceled)};
        }
        const std::size_t piece = std::min(bytes.size() - accepted, isFile_ ? FilePiece : PipePiece);
        const int taken = ::_write(descriptor_, bytes.data() + accepted, static_cast<unsigned>(piece));
        if (taken < 0) {
            return {accepted, LastCode()};
        }
        accepted += static_cast<std::size_t>(taken);
        if (taken == 0) {
            return {accepted, std::make_error_code(std::errc::no_space_on_device)};
        }
    }
    return {accepted, {}};
}

std::error_code OutputDescriptor::Cut(std::uint64_t size) {
    const int code = ::_chsize_s(descriptor_, static_cast<__int64>(size));
    return {code, std::generic_category()};
}

std::error_code OutputDescriptor::Sync() {
    return ::_commit(descriptor_) == 0 ? std::error_code() : LastCode();
}

std::error_code OutputDescriptor::Close() {
    const int closed = std::exchange(descriptor_, -1);
    return !isOwn_ || closed < 0 || ::_close(closed) == 0 ? std::error_code() : LastCode();
}

}  // namespace Varnholt::Cli
