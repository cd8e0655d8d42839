#include "BareLoop.h"

#include <algorithm>
#include <cstring>
#include <stdexcept>

#include "Protocol/Instrument.h"

namespace Varnholt::Bench {

using Platform::Usb::Transfer;

BareLoop::BareLoop(Platform::Usb::UsbDevice& usbDevice) : device_(usbDevice) {
    if (device_.Claim() != Platform::Errors::Success) {
        throw std::runtime_error("the device is in use");
    }
}

BareLoop::~BareLoop() {
    device_.Release();
}

void BareLoop::TransferCompleted(Transfer& transfer) noexcept {
    Platform::SignalEvent(static_cast<Chunk&>(transfer).completed.Get());
}

void BareLoop::Start(Chunk& chunk, std::uint32_t length) {
    chunk.data = chunk.bytes.data();
    chunk.length = length;
    chunk.client = this;
    if (device_.Submit(chunk) != Platform::Errors::Success) {
        throw std::runtime_error("transfer refused");
    }
}

void BareLoop::Finish(Chunk& chunk) {
    Platform::Wait(chunk.completed.Get(), Platform::Infinite);
}

void BareLoop::Read(std::uint64_t total, std::vector<std::uint8_t>& result) {
    control_.endpoint = 0;
    control_.setup = {Protocol::VendorOut, static_cast<std::uint8_t>(Protocol::Request::Measure), 0, 0, 0};
    Start(control_, 0);
    Finish(control_);

    std::uint64_t asked = 0;
    std::uint64_t received = 0;
    const auto next = [&](Chunk& chunk) {
        const std::uint64_t left = total == 0 ? ChunkSize : total - asked;
        const auto length = static_cast<std::uint32_t>(std::min<std::uint64_t>(left, ChunkSize));
        chunk.endpoint = Protocol::BulkInEndpoint;
        chunk.length = 0;
        if (length > 0) {
            Start(chunk, length);
            asked += length;
        }
    };
    next(chunks_[0]);
    next(chunks_[1]);
    for (std::size_t current = 0; chunks_[current].length > 0; current ^= 1) {
        Chunk& chunk = chunks_[current];
        Finish(chunk);
        const std::uint32_t moved = chunk.actualLength;
        if (result.size() < received + moved) {
            result.resize(received + moved);
        }
        std::memcpy(result.data() + received, chunk.bytes.data(), moved);
        received += moved;
        if (moved < chunk.length) {
            Chunk& other = chunks_[current ^ 1];
            if (other.length > 0) {
                device_.Cancel(other);
                Finish(other);
            }
            break;
        }
        next(chunk);
    }
    result.resize(received);
}

}  // namespace Varnholt::Bench
