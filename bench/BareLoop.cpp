#include "BareLoop.h"

#include <algorithm>
#include <cstring>
#include <stdexcept>

#include "Protocol/Instrument.h"

namespace Varnholt::Bench {

using Platform::Usb::Transfer;

BareLoop::BareLoop(Platform::Usb::UsbDevice& usbDevice) : device(usbDevice) {
    if (device.Claim() != Platform::Errors::Success) {
        throw std::runtime_error("the device is in use");
    }
}

BareLoop::~BareLoop() {
    device.Release();
    for (Chunk* chunk : {&chunks[0], &chunks[1], &control}) {
        Platform::Close(chunk->completed);
    }
}

void BareLoop::TransferCompleted(Transfer& transfer) noexcept {
    for (Chunk* chunk : {&chunks[0], &chunks[1], &control}) {
        if (&chunk->transfer == &transfer) {
            Platform::SignalEvent(chunk->completed);
        }
    }
}

void BareLoop::Start(Chunk& chunk, std::uint32_t length) {
    chunk.transfer.data = chunk.bytes.data();
    chunk.transfer.length = length;
    chunk.transfer.client = this;
    if (device.Submit(chunk.transfer) != Platform::Errors::Success) {
        throw std::runtime_error("transfer refused");
    }
}

void BareLoop::Finish(Chunk& chunk) {
    Platform::Wait(chunk.completed, Platform::Infinite);
}

void BareLoop::Read(std::uint64_t total, std::vector<std::uint8_t>& result) {
    control.transfer.endpoint = 0;
    control.transfer.setup = {Protocol::VendorOut, static_cast<std::uint8_t>(Protocol::Request::Measure), 0,
                              0, 0};
    Start(control, 0);
    Finish(control);

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
    next(chunks[0]);
    next(chunks[1]);
    for (std::size_t current = 0; chunks[current].transfer.length > 0; current ^= 1) {
        Chunk& chunk = chunks[current];
        Finish(chunk);
        const std::uint32_t moved = chunk.transfer.actualLength;
        if (result.size() < received + moved) {
            result.resize(received + moved);
        }
        std::memcpy(result.data() + received, chunk.bytes.data(), moved);
        received += moved;
        if (moved < chunk.transfer.length) {
            Chunk& other = chunks[current ^ 1];
            if (other.transfer.length > 0) {
                device.Cancel(other.transfer);
                Finish(other);
            }
            break;
        }
        next(chunk);
    }
    result.resize(received);
}

}  // namespace Varnholt::Bench
