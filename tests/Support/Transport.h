#pragma once

#include <string>

namespace Varnholt::Tests {

enum class Transport { Native, UsbIo };

inline const char* Name(Transport transport) {
    return transport == Transport::Native ? "native" : "usbio";
}

}  // namespace Varnholt::Tests
