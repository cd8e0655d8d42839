#pragma once

#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <tuple>

#include "DeviceDriver/Ostra/Transport.h"

namespace Varnholt::Tests {

using DeviceDriver::Ostra::Transport;

inline const char* Name(Transport transport) {
    return transport == Transport::Native ? "native" : "usbio";
}

inline std::string NameOfTransport(const testing::TestParamInfo<Transport>& info) {
    return Name(info.param);
}
#define OSTRA_ON_BOTH_TRANSPORTS(Suite) \
    INSTANTIATE_TEST_SUITE_P(, Suite, testing::Values(Transport::Native, Transport::UsbIo), NameOfTransport)

/// With each element of an array, or what a function answers, that has a name.
#define OSTRA_SWEEP_BOTH_TRANSPORTS(Suite, elements)                                                \
    INSTANTIATE_TEST_SUITE_P(All, Suite,                                                            \
                             testing::Combine(testing::Values(Transport::Native, Transport::UsbIo), \
                                              testing::Range<std::size_t>(0, std::size(elements))), \
                             [](const auto& parameter) {                                            \
                                 return std::string(Name(std::get<0>(parameter.param))) + "_" +     \
                                        (elements)[std::get<1>(parameter.param)].name;              \
                             })

}  // namespace Varnholt::Tests
