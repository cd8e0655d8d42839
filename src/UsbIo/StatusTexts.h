#pragma once

#include <cstdint>

namespace Varnholt::UsbIo {

/// The text of a status code of the driver or of this library; one text for all others. Never null, static.
const char* StatusText(std::uint32_t status);

}  // namespace Varnholt::UsbIo
