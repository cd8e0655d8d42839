// What the library's readout and scan are compared with on real USB: the same transfers with libusb alone.
//
//     bare_libusb VID:PID readout COUNT  seconds of the best of so many readouts, each from open to close
//     bare_libusb VID:PID scan BYTES     seconds of the transfers of one fixed scan
//
// Prints the seconds as a decimal number; exit code 1 when a transfer fails.
#include <libusb-1.0/libusb.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string_view>
#include <thread>
#include <vector>

#include "Protocol/Instrument.h"

namespace {

using Clock = std::chrono::steady_clock;
using namespace Varnholt::Protocol;
constexpr int ChunkSize = 65536;
constexpr unsigned Timeout = 5000;

[[noreturn]] void Fail(const char* what, int code) {
    std::fprintf(stderr, "%s: %s\n", what, libusb_error_name(code));
    std::exit(1);
}

void Command(libusb_device_handle* device, Request request, std::vector<std::uint8_t> data) {
    std::this_thread::sleep_for(std::chrono::milliseconds(1));  // the pause that the library makes as well
    const int moved = libusb_control_transfer(device, VendorOut, static_cast<std::uint8_t>(request), 0, 0,
                                              data.data(), static_cast<std::uint16_t>(data.size()), Timeout);
    if (moved < 0) {
        Fail("control transfer", moved);
    }
}

struct Chunk {
    libusb_transfer* transfer = libusb_alloc_transfer(0);
    std::array<std::uint8_t, ChunkSize> bytes{};
    int done = 0;
};

void LIBUSB_CALL Completed(libusb_transfer* transfer) {
    static_cast<Chunk*>(transfer->user_data)->done = 1;
}

void Start(libusb_device_handle* device, Chunk& chunk, std::size_t length) {
    chunk.done = 0;
    libusb_fill_bulk_transfer(chunk.transfer, device, BulkInEndpoint, chunk.bytes.data(),
                              static_cast<int>(length), &Completed, &chunk, 0);
    if (const int code = libusb_submit_transfer(chunk.transfer)) {
        Fail("submit", code);
    }
}

void Scan(libusb_context* context, libusb_device_handle* device, std::size_t total) {
    static std::array<Chunk, 2> chunks;
    const auto result = std::make_unique_for_overwrite<std::uint8_t[]>(total);
    Command(device, Request::Measure, {});
    std::size_t asked = 0;
    std::size_t received = 0;
    for (Chunk& chunk : chunks) {
        const std::size_t length = std::min<std::size_t>(ChunkSize, total - asked);
        if (length > 0) {
            Start(device, chunk, length);
            asked += length;
        }
    }
    for (std::size_t current = 0; received < total; current ^= 1) {
        Chunk& chunk = chunks[current];
        while (!chunk.done) {
            libusb_handle_events_completed(context, &chunk.done);
        }
        if (chunk.transfer->status != LIBUSB_TRANSFER_COMPLETED || chunk.transfer->actual_length <= 0) {
            Fail("bulk transfer", LIBUSB_ERROR_IO);
        }
        const auto moved = static_cast<std::size_t>(chunk.transfer->actual_length);
        std::copy_n(chunk.bytes.begin(), moved, result.get() + received);
        received += moved;
        const std::size_t length = std::min<std::size_t>(ChunkSize, total - asked);
        if (length > 0) {
            Start(device, chunk, length);
            asked += length;
        }
    }
}

void Readout(libusb_device_handle* device) {
    std::array<std::uint8_t, ReadoutBytes> buffer{};
    Command(device, Request::Reset, {OpeningResetCode});
    std::this_thread::sleep_for(std::chrono::milliseconds(1000));
    Command(device, Request::SetMeasureParameters, {294 >> 8, 294 & 0xFF, 0, 0, 0, 1, 6, 0});
    Command(device, Request::Measure, {});
    int moved = 0;
    const int code =
        libusb_bulk_transfer(device, BulkInEndpoint, buffer.data(), ReadoutBytes, &moved, Timeout);
    if (code != 0 || moved != static_cast<int>(ReadoutBytes)) {
        Fail("readout", code);
    }
}

/// Opens the device, does the work, closes the device. Answers the seconds of all of that, or of the work
/// alone.
template <class Work>
double Seconds(std::uint16_t vendor, std::uint16_t product, bool ofWorkAlone, const Work& work) {
    const auto since = [](Clock::time_point start) {
        return std::chrono::duration<double>(Clock::now() - start).count();
    };
    const Clock::time_point start = Clock::now();
    libusb_context* context = nullptr;
    libusb_init(&context);
    libusb_device_handle* const device = libusb_open_device_with_vid_pid(context, vendor, product);
    if (!device) {
        Fail("open", LIBUSB_ERROR_NO_DEVICE);
    }
    if (const int code = libusb_claim_interface(device, 0)) {
        Fail("claim", code);
    }
    const Clock::time_point workStart = Clock::now();
    work(context, device);
    const double seconds = since(workStart);
    libusb_release_interface(device, 0);
    libusb_close(device);
    libusb_exit(context);
    return ofWorkAlone ? seconds : since(start);
}

}  // namespace

int main(int argc, char** argv) {
    unsigned vendorId = 0;
    unsigned productId = 0;
    if (argc != 4 || std::sscanf(argv[1], "%x:%x", &vendorId, &productId) != 2) {
        std::fprintf(stderr, "usage: bare_libusb VID:PID readout COUNT | scan BYTES\n");
        return 2;
    }
    const auto vendor = static_cast<std::uint16_t>(vendorId);
    const auto product = static_cast<std::uint16_t>(productId);
    const auto number = std::strtoull(argv[3], nullptr, 10);
    double best = 1e9;
    if (std::string_view(argv[2]) == "scan") {
        best =
            Seconds(vendor, product, true, [number](libusb_context* context, libusb_device_handle* device) {
                Scan(context, device, number);
            });
    } else {
        for (unsigned long long i = 0; i < number; ++i) {
            best = std::min(best,
                            Seconds(vendor, product, false,
                                    [](libusb_context*, libusb_device_handle* device) { Readout(device); }));
        }
    }
    std::printf("%.6f\n", best);
    return 0;
}
