#include "UsbIpConnection.h"

#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

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

UsbIpConnection::UsbIpConnection(PollLoop& pollLoop, int connectedSocket,
                                 std::unique_ptr<UsbIpExports> offered, Over whenOver)
    : loop(pollLoop), file(connectedSocket), exports(std::move(offered)), over(std::move(whenOver)) {}

UsbIpConnection::~UsbIpConnection() {
    StopListening();
    session.reset();
    exports.reset();
    // The peer takes this for the sign that the instrument is free again.
    close(file);
}

void UsbIpConnection::Begin() {
    session = std::make_unique<UsbIpSession>(*exports, [this] { FlushSoon(); });
    Watch();
}

void UsbIpConnection::BeginWith(std::shared_ptr<Platform::Usb::UsbDevice> device) {
    session = std::make_unique<UsbIpSession>(std::move(device), [this] { FlushSoon(); });
    Watch();
}

void UsbIpConnection::Watch() {
    short events = 0;
    if (session->WantsInput()) {
        events = static_cast<short>(events | POLLIN);
    }
    if (!session->Output().empty()) {
        events = static_cast<short>(events | POLLOUT);
    }
    if (events != watchedFor) {
        watchedFor = events;
        loop.Watch(file, events, [this] { Ready(); });
    }
    if (deadline == 0 && session->PeerIsDue()) {
        CheckPeerAt(loop.Now() + Patience);
    }
}

void UsbIpConnection::CheckPeerAt(std::uint64_t time) {
    deadline = loop.CallAt(time, [this] {
        deadline = 0;
        if (!session->PeerIsDue()) {
            return;
        }
        if (lastMoved + Patience > loop.Now()) {
            CheckPeerAt(lastMoved + Patience);
            return;
        }
        End("silent for too long");
    });
}

/// Not from inside the session, which is busy.
void UsbIpConnection::FlushSoon() {
    if (flush == 0 && !ended) {
        flush = loop.CallSoon([this] {
            flush = 0;
            Flush();
        });
    }
}

void UsbIpConnection::Ready() {
    if (session->WantsInput() && inputStart == inputEnd) {
        const ssize_t count = recv(file, input.data(), input.size(), MSG_DONTWAIT);
        if (count == 0 || (count < 0 && errno != EAGAIN && errno != EINTR)) {
            End();
            return;
        }
        lastMoved = loop.Now();
        inputStart = 0;
        inputEnd = static_cast<std::size_t>(std::max<ssize_t>(count, 0));
    }
    Flush();
}

/// Lets the session have what was received, and the peer what the session has for it, as far as it goes.
void UsbIpConnection::Flush() {
    do {
        inputStart += session->Receive(std::span(input).subspan(inputStart, inputEnd - inputStart));
        if (!SendOutput()) {
            End();
            return;
        }
    } while (session->WantsInput() && inputStart < inputEnd);
    if (session->Over() && session->Output().empty()) {
        End(session->Complaint());
        return;
    }
    Watch();
}

/// False when the peer is lost.
bool UsbIpConnection::SendOutput() {
    while (!session->Output().empty()) {
        const auto output = session->Output();
        const ssize_t count = send(file, output.data(), output.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
        if (count < 0 && errno != EINTR) {
            return errno == EAGAIN;
        }
        lastMoved = loop.Now();
        session->OutputSent(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
    }
    return true;
}

void UsbIpConnection::StopListening() {
    ended = true;
    loop.Forget(flush);
    loop.Forget(deadline);
    loop.Unwatch(file);
}

void UsbIpConnection::End(const std::string& complaint) {
    StopListening();
    over(*this, complaint);
}

}  // namespace Varnholt::Simulator
