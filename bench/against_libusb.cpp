// The library on real USB against libusb alone: runs `bare_libusb` of the same folder and the library in
// turns.
//
//     against_libusb native|usbio VID:PID scan BYTES  ratio of the medians of scans
//     against_libusb native|usbio VID:PID readout     what a readout takes beyond libusb's own time
//
// Exit code 1 when either of them fails.
#include <stdio.h>  // popen

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "ostra.h"
#include "Platform/HostQueries.h"
#include "Timing.h"

namespace {

using Varnholt::Bench::Seconds;

std::vector<double> BareSeconds(const std::string& arguments) {
    std::vector<double> all;
    if (FILE* const program = popen(("./bare_libusb " + arguments).c_str(), "r")) {
        for (double seconds = 0; std::fscanf(program, "%lf", &seconds) == 1;) {
            all.push_back(seconds);
        }
        pclose(program);
    }
    return all.empty() ? throw std::runtime_error("bare_libusb " + arguments + " failed") : all;
}

double Median(std::vector<double> all) {
    const auto middle = all.begin() + static_cast<std::ptrdiff_t>(all.size() / 2);
    std::ranges::nth_element(all, middle);
    return *middle;
}

/// Some rounds of each; in a round as many of ours as the bare program makes.
struct Medians {
    Medians(int rounds, const std::string& bareArguments, const std::function<double()>& secondsOfOurs) {
        std::vector<double> ours, bare;
        for (int round = 0; round < rounds; ++round) {
            const std::vector<double> some = BareSeconds(bareArguments);
            bare.insert(bare.end(), some.begin(), some.end());
            std::generate_n(std::back_inserter(ours), some.size(), secondsOfOurs);
        }
        ofOurs = Median(ours);
        ofBare = Median(bare);
    }
    double ofOurs, ofBare;
};

void CompareScans(bool isUsbIo, const std::string& device, const std::string& bytes) {
    const auto total = static_cast<std::uint32_t>(std::stoul(bytes));
    const Medians scans(9, device + " scan " + bytes, [&] {
        Varnholt::DeviceDriver::Ostra::LowLevel::PellandoFunctionality instrument(nullptr, 0);
        return Seconds([&] { instrument.StartScan(isUsbIo ? 256 : 6400, 5, total); });
    });
    std::printf("scan: %.1f MB/s, %.3f of libusb alone\n", total / scans.ofOurs / 1e6,
                scans.ofBare / scans.ofOurs);
}

void CompareReadouts(bool isUsbIo, const std::string& device) {
    const Medians readouts(3, device + (isUsbIo ? " usbio 5" : " native 5"), [] {
        return Seconds([] {
            std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};
            if (d4fb86cecc88582a(values.data(), "") != OSTRA_OK) {
                throw std::runtime_error(b5ae189db26b2a1b("LastError"));
            }
        });
    });
    std::printf("readout: %.1f ms more than libusb alone\n", (readouts.ofOurs - readouts.ofBare) * 1e3);
}

}  // namespace

int main(int argc, char** argv) try {
    const std::vector<std::string> words(argv + 1, argv + argc);
    if (words.size() < 3 || (words[2] == "scan") != (words.size() == 4)) {
        std::fprintf(stderr, "usage: against_libusb native|usbio VID:PID scan BYTES | readout\n");
        return 2;
    }
    const bool isUsbIo = words[0] == "usbio";
    Varnholt::Platform::Override64BitHost(isUsbIo);
    words[2] == "scan" ? CompareScans(isUsbIo, words[1], words[3]) : CompareReadouts(isUsbIo, words[1]);
    return 0;
} catch (const std::exception& failure) {
    std::fprintf(stderr, "%s\n", failure.what());
    return 1;
}
