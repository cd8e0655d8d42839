#pragma once

namespace Varnholt::Protocol {

/// Entries of a device list that are looked at: a bus has no more addresses.
inline constexpr int MaximumDevices = 127;

}  // namespace Varnholt::Protocol
