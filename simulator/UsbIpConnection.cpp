#include "UsbIpConnection.h"

#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <span>
#include <utility>

namespace Varnholt::Simulator {

namespace {

/// Microseconds. A peer that is due and moves no byte for so long is given up: it would keep its connection
/// for ever.
constexpr std::uint64_t Patience = 5'000'000;

}  // namespace

UsbIpConnection::UsbIpConnection(PollLoop& pollLoop, Platform::Linux::FileDescriptor connectedSocket,
                                 std::unique_ptr<UsbIpExports> offered,
                                 std::shared_ptr<Platform::Usb::UsbDevice> imported, Over whenOver)
    : loop_(pollLoop),
      file_(std::move(connectedSocket)),
      exports_(std::move(offered)),
      over_(std::move(whenOver)),
      peerCheck_(loop_, [this] { CheckPeer(); }),
      flushing_(loop_, [this] { Flush(); }),
      session_(imported ? UsbIpSession(std::move(imported), [this] { FlushSoon(); })
                        : UsbIpSession(*exports_, [this] { FlushSoon(); })) {
    Watch();
}

void UsbIpConnection::Watch() {
    short events = 0;
    if (session_.WantsInput()) {
        events = static_cast<short>(events | POLLIN);
    }
    if (!session_.Output().empty()) {
        events = static_cast<short>(events | POLLOUT);
    }
    if (events != watchedFor_) {
        watchedFor_ = events;
        loop_.Watch(file_.Get(), events, [this] { Ready(); });
    }
    if (session_.PeerIsDue()) {
        peerCheck_.RingNoLaterThan(loop_.Now() + Patience);
    }
}

void UsbIpConnection::CheckPeer() {
    if (!session_.PeerIsDue()) {
        return;
    }
    if (lastMoved_ + Patience > loop_.Now()) {
        peerCheck_.RingNoLaterThan(lastMoved_ + Patience);
        return;
    }
    End("silent for too long");
}

/// Not from inside the session, which is busy.
void UsbIpConnection::FlushSoon() {
    if (!ended_) {
        flushing_.RingNoLaterThan(0);
    }
}

void UsbIpConnection::Ready() {
    if (session_.WantsInput() && inputStart_ == inputEnd_) {
        const ssize_t count = recv(file_.Get(), input_.data(), input_.size(), MSG_DONTWAIT);
        if (count == 0 || (count < 0 && errno != EAGAIN && errno != EINTR)) {
            End();
            return;
        }
        lastMoved_ = loop_.Now();
        inputStart_ = 0;
        inputEnd_ = static_cast<std::size_t>(std::max<ssize_t>(count, 0));
    }
    Flush();
}

/// Lets the session have what was received, and the peer what the session has for it, as far as it goes.
void UsbIpConnection::Flush() {
    do {
        inputStart_ += session_.Receive(std::span(input_).subspan(inputStart_, inputEnd_ - inputStart_));
        if (!SendOutput()) {
            End();
            return;
        }
    } while (session_.WantsInput() && inputStart_ < inputEnd_);
    if (session_.Over() && session_.Output().empty()) {
        End(session_.Complaint());
        return;
    }
    Watch();
}

/// False when the peer is lost.
bool UsbIpConnection::SendOutput() {
    while (!session_.Output().empty()) {
        const auto output = session_.Output();
        const ssize_t count = send(file_.Get(), output.data(), output.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
        if (count < 0 && errno != EINTR) {
            return errno == EAGAIN;
        }
        lastMoved_ = loop_.Now();
        session_.OutputSent(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
    }
    return true;
}

void UsbIpConnection::StopListening() {
    ended_ = true;
    peerCheck_.Clear();
    flushing_.Clear();
    loop_.Unwatch(file_.Get());
}

void UsbIpConnection::End(const std::string& complaint) {
    StopListening();
    over_(*this, complaint);
}

}  // namespace Varnholt::Simulator
