#include "Platform/Usb/UsbIpSocket.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/timerfd.h>
#include <sys/uio.h>

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

UsbIpSocket::UsbIpSocket(int socketFile)
    : file_(socketFile), limit_(timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC)) {}

void UsbIpSocket::ShutdownSending() {
    shutdown(file_.Get(), SHUT_WR);
}

void UsbIpSocket::Shutdown() {
    shutdown(file_.Get(), SHUT_RDWR);
}

void UsbIpSocket::ReceiveUntil(std::optional<Clock::time_point> time) {
    itimerspec setting{};  // with a time of 0 the timer stands still
    if (time) {
        const auto seconds = std::chrono::floor<std::chrono::seconds>(*time);
        setting.it_value.tv_sec = seconds.time_since_epoch().count();
        setting.it_value.tv_nsec = std::chrono::nanoseconds(*time - seconds).count();
    }
    timerfd_settime(limit_.Get(), TFD_TIMER_ABSTIME, &setting, nullptr);
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
        const ssize_t sent = sendmsg(file_.Get(), &message, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (sent > 0) {
            const std::size_t ofHeader = std::min(header.size(), static_cast<std::size_t>(sent));
            header = header.subspan(ofHeader);
            payload = payload.subspan(static_cast<std::size_t>(sent) - ofHeader);
            patienceEnds = Clock::now() + Patience;
            continue;
        }
        if (errno != EAGAIN && errno != EINTR) {
            return false;
        }
        pollfd state{file_.Get(), POLLOUT, 0};
        if (poll(&state, 1, MillisecondsUntil(patienceEnds)) == 0 && Clock::now() >= patienceEnds) {
            return false;
        }
    }
    return true;
}

bool UsbIpSocket::Receive(std::span<std::uint8_t> bytes, bool inMessage) {
    if (!limit_) {
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
        // What does not fit any more is kept for later.
        std::array parts{iovec{bytes.data(), bytes.size()}, iovec{buffer_.data(), buffer_.size()}};
        msghdr message{};
        message.msg_iov = parts.data();
        message.msg_iovlen = parts.size();
        const ssize_t received = recvmsg(file_.Get(), &message, MSG_DONTWAIT);
        if (received > 0) {
            const std::size_t count = std::min(bytes.size(), static_cast<std::size_t>(received));
            bytes = bytes.subspan(count);
            bufferStart_ = 0;
            bufferEnd_ = static_cast<std::size_t>(received) - count;
            if (LimitHasPassed()) {
                return false;  // a peer that goes on sending would never let it be waited for
            }
            patienceEnds = Clock::now() + Patience;
            continue;
        }
        if (received == 0 || (errno != EAGAIN && errno != EINTR) || !WaitToReceive(patienceEnds)) {
            return false;
        }
    }
    return true;
}

bool UsbIpSocket::LimitHasPassed() const {
    pollfd state{limit_.Get(), POLLIN, 0};
    return poll(&state, 1, 0) > 0;
}

/// False when the patience or the limit ended before anything came.
bool UsbIpSocket::WaitToReceive(std::optional<Clock::time_point> patienceEnds) const {
    for (;;) {
        std::array<pollfd, 2> states{pollfd{file_.Get(), POLLIN, 0}, pollfd{limit_.Get(), POLLIN, 0}};
        const int timeout = patienceEnds ? MillisecondsUntil(*patienceEnds) : -1;
        const int ready = poll(states.data(), states.size(), timeout);
        if (states[0].revents != 0) {
            return true;
        }
        if (states[1].revents != 0 || (ready == 0 && Clock::now() >= *patienceEnds)) {
            return false;
        }
    }
}

}  // namespace Varnholt::Platform::Usb
