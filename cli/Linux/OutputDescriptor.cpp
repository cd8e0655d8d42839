#include "Output/OutputDescriptor.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

namespace Varnholt::Cli {
namespace {

constexpr std::size_t LargePiece = 1 << 20;
/// What a pipe that has room takes without waiting.
constexpr std::size_t PipePiece = 4096;
constexpr int LookInterval = 50;  // milliseconds
constexpr int RetryInterval = 5;  // milliseconds
constexpr std::chrono::milliseconds PatienceAtTheEnd{300};
constexpr mode_t NewFileMode = 0666;

std::error_code LastCode() {
    return {errno, std::generic_category()};
}

/// The same terminal or pipe, opened once more, so that nobody else finds it non-blocking; -1 where the
/// system does not give it, and for what is no such thing.
int NonBlockingTwin(int standard) {
    struct stat facts {};
    const int mode = ::fcntl(standard, F_GETFL);
    if (::fstat(standard, &facts) != 0 || !(S_ISFIFO(facts.st_mode) || S_ISCHR(facts.st_mode)) || mode < 0 ||
        (mode & O_ACCMODE) == O_RDONLY) {
        return -1;
    }
    const std::string path = "/proc/self/fd/" + std::to_string(standard);
    return ::open(path.c_str(), O_WRONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
}

bool IsFile(int descriptor) {
    struct stat facts {};
    return ::fstat(descriptor, &facts) == 0 && S_ISREG(facts.st_mode);
}

}  // namespace

OutputDescriptor::OutputDescriptor(int openDescriptor, Ownership ownership)
    : descriptor_(openDescriptor), isOwn_(ownership == Ownership::Own), isFile_(IsFile(openDescriptor)) {}

OutputDescriptor OutputDescriptor::Of(Standard stream) {
    const int descriptor = static_cast<int>(stream);
    const int twin = NonBlockingTwin(descriptor);
    return twin < 0 ? OutputDescriptor(descriptor, Ownership::Borrowed)
                    : OutputDescriptor(twin, Ownership::Own);
}

OutputDescriptor OutputDescriptor::Create(const std::string& path, std::error_code& error) {
    const int created = ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, NewFileMode);
    error = created < 0 ? LastCode() : std::error_code();
    return {created, Ownership::Own};
}

OutputDescriptor OutputDescriptor::Open(const std::string& path, const Service::Interruption& interruption,
                                        std::error_code& error) {
    for (;;) {
        const int opened = ::open(path.c_str(), O_WRONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
        error = opened < 0 ? LastCode() : std::error_code();
        struct stat facts {};
        const bool lacksReader = error == std::errc::no_such_device_or_address &&
                                 ::stat(path.c_str(), &facts) == 0 && S_ISFIFO(facts.st_mode);
        if (!lacksReader) {
            return {opened, Ownership::Own};
        }
        if (!interruption.Sleep(LookInterval)) {
            error = std::make_error_code(std::errc::operation_canceled);
            return {-1, Ownership::Own};
        }
    }
}

/// Milliseconds until the next look at the user's wish; 0: there is nothing to wait for any more.
int OutputDescriptor::WaitingTime(const Service::Interruption& interruption) {
    if (!interruption.IsRequested()) {
        return LookInterval;
    }
    const auto now = std::chrono::steady_clock::now();
    if (!patienceEnd_) {
        patienceEnd_ = now + PatienceAtTheEnd;
    }
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(*patienceEnd_ - now).count();
    return static_cast<int>(std::clamp<std::int64_t>(left, 0, LookInterval));
}

/// What is broken counts as room: the write then tells what it is.
std::error_code OutputDescriptor::AwaitRoom(const Service::Interruption& interruption) {
    for (;;) {
        const int waitingTime = WaitingTime(interruption);
        pollfd waited{descriptor_, POLLOUT, 0};
        const int ready = ::poll(&waited, 1, waitingTime);
        if (ready > 0) {
            return {};
        }
        if (ready < 0 && errno != EINTR) {
            return LastCode();
        }
        if (waitingTime == 0) {
            return std::make_error_code(std::errc::operation_canceled);
        }
    }
}

OutputDescriptor::Outcome OutputDescriptor::Write(std::span<const char> bytes,
                                                  const Service::Interruption& interruption) {
    // A file takes all, and what this object has opened as much as there is room for.
    const bool neverWaits = isFile_ || isOwn_;
    std::size_t accepted = 0;
    bool wasRefused = false;
    while (accepted < bytes.size()) {
        if (!neverWaits || wasRefused) {
            if (const std::error_code error = AwaitRoom(interruption)) {
                return {accepted, error};
            }
        }
        const std::size_t piece = std::min(bytes.size() - accepted, neverWaits ? LargePiece : PipePiece);
        const ssize_t taken = ::write(descriptor_, bytes.data() + accepted, piece);
        if (taken < 0 && errno == EAGAIN) {
            if (wasRefused) {  // a terminal with room for less than a line end
                if (WaitingTime(interruption) == 0) {
                    return {accepted, std::make_error_code(std::errc::operation_canceled)};
                }
                ::poll(nullptr, 0, RetryInterval);
            }
            wasRefused = true;
            continue;
        }
        if (taken < 0 && errno != EINTR) {
            return {accepted, LastCode()};
        }
        wasRefused = false;
        accepted += static_cast<std::size_t>(std::max<ssize_t>(taken, 0));
    }
    return {accepted, {}};
}

std::error_code OutputDescriptor::Cut(std::uint64_t size) {
    return ::ftruncate(descriptor_, static_cast<off_t>(size)) == 0 ? std::error_code() : LastCode();
}

std::error_code OutputDescriptor::Sync() {
    return ::fsync(descriptor_) == 0 ? std::error_code() : LastCode();
}

std::error_code OutputDescriptor::Close() {
    const int closed = std::exchange(descriptor_, -1);
    return !isOwn_ || closed < 0 || ::close(closed) == 0 ? std::error_code() : LastCode();
}

}  // namespace Varnholt::Cli
