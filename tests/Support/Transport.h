#pragma once

#include "DeviceDriver/Ostra/Transport.h"

namespace Varnholt::Tests {

using DeviceDriver::Ostra::Transport;

inline const char* Name(Transport transport) {
    return transport == Transport::Native ? "native" : "usbio";
}

}  // namespace Varnholt::Tests
