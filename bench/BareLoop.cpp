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
    for (Chunk* chunk : {&chunks_[0], &chunks_[1], &control_}) {
        Platform::Close(chunk->completed);
    }
}

void BareLoop::TransferCompleted(Transfer& transfer) noexcept {
    for (Chunk* chunk : {&chunks_[0], &chunks_[1], &control_}) {
        if (&chunk->transfer == &transfer) {
            Platform::SignalEvent(chunk->completed);
        }
    }
}

void BareLoop::Start(Chunk& chunk, std::uint32_t length) {
    chunk.transfer.data = chunk.bytes.data();
    chunk.transfer.length = length;
    chunk.transfer.client = this;
    if (device_.Submit(chunk.transfer) != Platform::Errors::Success) {
        throw std::runtime_error("transfer refused");
    }
}

void BareLoop::Finish(Chunk& chunk) {
    Platform::Wait(chunk.completed, Platform::Infinite);
}

void BareLoop::Read(std::uint64_t total, std::vector<std::uint8_t>& result) {
    control_.transfer.endpoint = 0;
    control_.transfer.setup = {Protocol::VendorOut, static_cast<std::uint8_t>(Protocol::Request::Measure), 0,
                               0, 0};
    Start(control_, 0);
    Finish(control_);

    std::uint64_t asked = 0;
    std::uint64_t received = 0;
    const auto next = [&](Chunk& chunk) {
        const std::uint64_t left = total == 0 ? ChunkSize : total - asked;
        const auto length = static_cast<std::uint32_t>(std::min<std::uint64_t>(left, ChunkSize));
        chunk.transfer.endpoint = Protocol::BulkInEndpoint;
        chunk.transfer.length = 0;
        if (length > 0) {
            Start(chunk, length);
            asked += length;
        }
        return length > 0;
    };
    next(chunks_[0]);
    next(chunks_[1]);
    for (std::size_t current = 0; chunks_[current].transfer.length > 0; current ^= 1) {
        Chunk& chunk = chunks_[current];
        Finish(chunk);
        const std::uint32_t moved = chunk.transfer.actualLength;
        if (result.size() < received + moved) {
            result.resize(received + moved);
        }
        std::memcpy(result.data() + received, chunk.bytes.data(), moved);
        received += moved;
        if (moved < chunk.transfer.length) {
            Chunk& other = chunks_[current ^ 1];
            if (other.transfer.length > 0) {
                device_.Cancel(other.transfer);
                Finish(other);
            }
            break;
        }
        next(chunk);
    }
    result.resize(received);
}

}  // namespace Varnholt::Bench
