// A host program in C++ that is linked with the library: takes a readout and shows it.
//
//     linked_cpp [INSTRUMENT]
#include <ostra.h>

#include <array>
#include <cstdint>
#include <iomanip>
#include <iostream>
#include <stdexcept>
#include <string>

namespace {

using Readout = std::array<std::int32_t, OSTRA_READOUT_VALUES>;

Readout TakeReadout(const std::string& instrument) {
    Readout values{};
    if (d4fb86cecc88582a(values.data(), instrument.c_str()) != OSTRA_OK) {
        const std::string reason = b5ae189db26b2a1b("LastError");
        throw std::runtime_error(reason.empty() ? "no such instrument is connected" : reason);
    }
    return values;
}

}  // namespace

int main(int argc, char** argv) {
    try {
        const Readout values = TakeReadout(argc > 1 ? argv[1] : "");
        for (std::size_t i = 0; i < values.size(); ++i) {
            std::cout << std::setw(6) << values[i] << (i % 8 == 7 ? '\n' : ' ');
        }
        return 0;
    } catch (const std::exception& error) {
        std::cerr << "no readout: " << error.what() << "\n";
        return 1;
    }
}
