// What the library's readout and scan are compared with on real USB: the same transfers with libusb alone.
//
//     bare_libusb VID:PID native COUNT  so many readouts as the library takes them on its native transport
//     bare_libusb VID:PID usbio COUNT   the same on its USBIO transport
//     bare_libusb VID:PID scan BYTES    one fixed scan
//
// Prints for each the seconds as a decimal number: of a readout from open to close, of a scan those of its
// transfers. Exit code 1 when a transfer fails.
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

/// The pause that the library makes before each command as well.
void Pause() {
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
}

void Command(libusb_device_handle* device, Request request, std::vector<std::uint8_t> data,
             std::uint16_t value = 0) {
    Pause();
    const int moved = libusb_control_transfer(device, VendorOut, static_cast<std::uint8_t>(request), value, 0,
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

void Start(libusb_device_handle* device, Chunk& chunk, std::uint8_t endpoint, std::size_t length) {
    chunk.done = 0;
    libusb_fill_bulk_transfer(chunk.transfer, device, endpoint, chunk.bytes.data(), static_cast<int>(length),
                              &Completed, &chunk, 0);
    if (endpoint == InterruptInEndpoint) {
        chunk.transfer->type = LIBUSB_TRANSFER_TYPE_INTERRUPT;
    }
    if (const int code = libusb_submit_transfer(chunk.transfer)) {
        Fail("submit", code);
    }
}

void Await(libusb_context* context, Chunk& chunk) {
    while (!chunk.done) {
        libusb_handle_events_completed(context, &chunk.done);
    }
}

void Abort(libusb_context* context, Chunk& chunk) {
    libusb_cancel_transfer(chunk.transfer);
    Await(context, chunk);
}

void Scan(libusb_context* context, libusb_device_handle* device, std::size_t total) {
    static std::array<Chunk, 2> chunks;
    const auto result = std::make_unique_for_overwrite<std::uint8_t[]>(total);
    Command(device, Request::Measure, {});
    std::size_t asked = 0;
    std::size_t received = 0;
    const auto startNext = [&](Chunk& chunk) {
        const std::size_t length = std::min<std::size_t>(ChunkSize, total - asked);
        if (length > 0) {
            Start(device, chunk, BulkInEndpoint, length);
            asked += length;
        }
    };
    std::ranges::for_each(chunks, startNext);
    for (std::size_t current = 0; received < total; current ^= 1) {
        Chunk& chunk = chunks[current];
        Await(context, chunk);
        if (chunk.transfer->status != LIBUSB_TRANSFER_COMPLETED || chunk.transfer->actual_length <= 0) {
            Fail("bulk transfer", LIBUSB_ERROR_IO);
        }
        const auto moved = static_cast<std::size_t>(chunk.transfer->actual_length);
        std::copy_n(chunk.bytes.begin(), moved, result.get() + received);
        received += moved;
        startNext(chunk);
    }
}

/// The library listens to the button meanwhile: the native transport for a record of 8 bytes, until a closing
/// that ends with an abort and a command; USBIO byte by byte, and once anew after its first command.
void Readout(libusb_context* context, libusb_device_handle* device, bool isNative) {
    static Chunk button;
    std::array<std::uint8_t, ReadoutBytes> buffer{};
    Start(device, button, InterruptInEndpoint, isNative ? 8 : 1);
    Command(device, Request::Reset, {OpeningResetCode});
    if (!isNative) {
        Abort(context, button);
        Start(device, button, InterruptInEndpoint, 1);
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(1000));
    Command(device, Request::SetMeasureParameters, {294 >> 8, 294 & 0xFF, 0, 0, 0, 1, 6, 0});
    Command(device, Request::Measure, {});
    int moved = 0;
    const int code =
        libusb_bulk_transfer(device, BulkInEndpoint, buffer.data(), ReadoutBytes, &moved, Timeout);
    if (code != 0 || moved != static_cast<int>(ReadoutBytes)) {
        Fail("readout", code);
    }
    if (isNative) {
        Pause();
    }
    Abort(context, button);
    if (isNative) {
        Command(device, Request::ButtonReport, {}, 3);
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
    const std::string_view what = argc == 4 ? argv[2] : "";
    if ((what != "native" && what != "usbio" && what != "scan") ||
        std::sscanf(argv[1], "%x:%x", &vendorId, &productId) != 2) {
        std::fprintf(stderr, "usage: bare_libusb VID:PID native COUNT | usbio COUNT | scan BYTES\n");
        return 2;
    }
    const auto vendor = static_cast<std::uint16_t>(vendorId);
    const auto product = static_cast<std::uint16_t>(productId);
    const auto number = std::strtoull(argv[3], nullptr, 10);
    if (what == "scan") {
        std::printf("%.6f\n", Seconds(vendor, product, true,
                                      [number](libusb_context* context, libusb_device_handle* device) {
                                          Scan(context, device, number);
                                      }));
        return 0;
    }
    for (unsigned long long i = 0; i < number; ++i) {
        std::printf("%.6f\n", Seconds(vendor, product, false,
                                      [what](libusb_context* context, libusb_device_handle* device) {
                                          Readout(context, device, what == "native");
                                      }));
    }
    return 0;
}
