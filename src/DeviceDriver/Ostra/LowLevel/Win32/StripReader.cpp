#include "DeviceDriver/Ostra/LowLevel/Win32/StripReader.h"

#include <algorithm>
#include <utility>

#include "Platform/Time.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Platform::WaitResult;

StripReader::PendingRead::PendingRead(Platform::Handle event, std::uint32_t chunk)
    : buffer(std::make_unique_for_overwrite<std::uint8_t[]>(chunk)), request(event) {}

StripReader::StripReader(const USBConnection& connection, std::uint32_t chunk)
    : pipe_(connection.PipeHandle()),
      arrived_(std::make_unique_for_overwrite<std::uint8_t[]>(chunk)),
      first_(connection.CompletionEvent(), chunk),
      second_(connection.CompletionEvent(), chunk) {}

void StripReader::Start(std::uint32_t size) {
    following_->asked = size;
    following_->request.Start(pipe_, Platform::Operation::Read(following_->buffer.get(), size));
}

/// Both reads complete through the connection's one auto-reset event, so that a signal says only that some
/// read has completed: it can be the other's, two completions can leave a single signal, and a start resets
/// the event together with a signal that nobody has seen. So the result decides, and it is asked for before
/// every wait: no read is started between that question and the wait, and therefore a read that was still
/// running then wakes the wait.
WaitResult StripReader::Await(std::uint32_t limit) {
    const std::uint32_t start = Platform::TickCount();
    std::uint32_t remaining = limit;
    for (;;) {
        if (FetchResult()) {
            return WaitResult::Signalled;
        }
        const WaitResult waited = Platform::Wait(waiting_->request.CompletionEvent(), remaining);
        const std::uint32_t elapsed = Platform::TickCount() - start;
        if (waited != WaitResult::Signalled || elapsed >= limit) {
            FetchResult();
            return waited;
        }
        remaining = limit - elapsed;
    }
}

/// False while the read runs.
bool StripReader::FetchResult() {
    succeeded_ = waiting_->request.GetResult(count_);
    failure_ = succeeded_ ? Platform::Errors::Success : Platform::LastError();
    return !waiting_->request.IsRunning();
}

std::span<const std::uint8_t> StripReader::EndAndTake() {
    if (waiting_->request.IsRunning()) {
        count_ = waiting_->request.CancelAndWait();
    }
    return {waiting_->buffer.get(), std::min(count_, waiting_->asked)};
}

void StripReader::Advance() {
    std::swap(arrived_, waiting_->buffer);
    arrivedCount_ = succeeded_ ? count_ : 0;
    std::swap(waiting_, following_);
    count_ = 0;
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
