#include "Platform/Usb/UsbIpSocket.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

namespace Varnholt::Platform::Usb {
namespace {

/// A peer that is in the middle of a message, or has not taken one, is given up after this silence.
constexpr auto Patience = std::chrono::milliseconds(2000);

int MillisecondsUntil(UsbIpSocket::Clock::time_point time) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(time - UsbIpSocket::Clock::now()).count();
    return static_cast<int>(std::clamp<long long>(left, 0, 60'000));
}

}  // namespace

UsbIpSocket::UsbIpSocket(int socketFile) : file_(socketFile), wake_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

UsbIpSocket::~UsbIpSocket() {
    close(file_);
    if (wake_ >= 0) {
        close(wake_);
    }
}

void UsbIpSocket::ShutdownSending() {
    shutdown(file_, SHUT_WR);
}

void UsbIpSocket::Shutdown() {
    shutdown(file_, SHUT_RDWR);
}

void UsbIpSocket::ReceiveUntil(std::optional<Clock::time_point> time) {
    {
        const std::lock_guard lock(mutex_);
        if (limit_ == time) {
            return;
        }
        limit_ = time;
    }
    eventfd_write(wake_, 1);
}

bool UsbIpSocket::Send(std::span<const std::uint8_t> header, std::span<const std::uint8_t> payload) {
    Clock::time_point patienceEnds = Clock::now() + Patience;
    while (!header.empty() || !payload.empty()) {
        std::array<iovec, 2> parts{};
        std::size_t count = 0;
        for (const std::span<const std::uint8_t> part : {header, payload}) {
            if (!part.empty()) {
                parts[count++] = {const_cast<std::uint8_t*>(part.data()), part.size()};
            }
        }
        msghdr message{};
        message.msg_iov = parts.data();
        message.msg_iovlen = count;
        const ssize_t sent = sendmsg(file_, &message, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (sent > 0) {
            const std::size_t ofHeader = std::min(header.size(), static_cast<std::size_t>(sent));
            header = header.subspan(ofHeader);
            payload = payload.subspan(static_cast<std::size_t>(sent) - ofHeader);
            patienceEnds = Clock::now() + Patience;
            continue;
        }
        if (sent < 0 && errno == EINTR) {
            continue;
        }
        if (sent < 0 && errno != EAGAIN) {
            return false;
        }
        pollfd state{file_, POLLOUT, 0};
        if (poll(&state, 1, MillisecondsUntil(patienceEnds)) == 0 && Clock::now() >= patienceEnds) {
            return false;
        }
    }
    return true;
}

bool UsbIpSocket::Receive(std::span<std::uint8_t> bytes, bool inMessage) {
    if (wake_ < 0) {
        return false;  // waits could not be ended in time
    }
    std::optional<Clock::time_point> patienceEnds;
    if (inMessage) {
        patienceEnds = Clock::now() + Patience;
    }
    while (!bytes.empty()) {
        if (bufferStart_ < bufferEnd_) {
            const std::size_t count = std::min(bytes.size(), bufferEnd_ - bufferStart_);
            std::memcpy(bytes.data(), &buffer_[bufferStart_], count);
            bufferStart_ += count;
            bytes = bytes.subspan(count);
            continue;
        }
        const bool direct = bytes.size() >= buffer_.size();
        const ssize_t received = direct ? recv(file_, bytes.data(), bytes.size(), MSG_DONTWAIT)
                                        : recv(file_, buffer_.data(), buffer_.size(), MSG_DONTWAIT);
        if (received > 0) {
            if (direct) {
                bytes = bytes.subspan(static_cast<std::size_t>(received));
            } else {
                bufferStart_ = 0;
                bufferEnd_ = static_cast<std::size_t>(received);
            }
            const auto now = Clock::now();
            if (LimitIsBefore(now)) {
                return false;  // a peer that goes on sending would never let it be waited for
            }
            patienceEnds = now + Patience;
            continue;
        }
        if (received < 0 && errno == EINTR) {
            continue;
        }
        if (received == 0 || errno != EAGAIN || WaitToReceive(patienceEnds) == Readiness::Lost) {
            return false;
        }
    }
    return true;
}

bool UsbIpSocket::LimitIsBefore(Clock::time_point time) {
    const std::lock_guard lock(mutex_);
    return limit_ && *limit_ < time;
}

UsbIpSocket::Readiness UsbIpSocket::WaitToReceive(std::optional<Clock::time_point> patienceEnds) {
    for (;;) {
        std::optional<Clock::time_point> end = patienceEnds;
        {
            const std::lock_guard lock(mutex_);
            if (limit_ && (!end || *limit_ < *end)) {
                end = limit_;
            }
        }
        std::array<pollfd, 2> states{pollfd{file_, POLLIN, 0}, pollfd{wake_, POLLIN, 0}};
        const int ready = poll(states.data(), states.size(), end ? MillisecondsUntil(*end) : -1);
        if (states[0].revents != 0) {
            return Readiness::Ready;
        }
        if (ready > 0) {
            eventfd_t count = 0;
            eventfd_read(wake_, &count);
        } else if (end && Clock::now() >= *end) {
            return Readiness::Lost;
        }
    }
}

}  // namespace Varnholt::Platform::Usb
