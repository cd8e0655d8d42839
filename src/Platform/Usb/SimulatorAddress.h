#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace Varnholt::Platform::Usb {

/// Where simulated instruments listen: Unix sockets in the abstract namespace, one for each, named this and
/// the instrument's name.
inline constexpr const char* SimulatorSocketPrefix = "ostra-simulator/";
/// The bus id of the only device on such a socket.
inline constexpr const char* SimulatorBusId = "1-1";
/// In a device record's path, in front of who has the device imported.
inline constexpr const char* UsedByMark = ", used by ";
/// Who has an instrument that is plugged into the kernel.
inline constexpr const char* KernelAsUser = "the kernel";

/// Letters, digits, '-', '_' and '.', at most 64 of them: a name that can stand in a device path.
bool IsSimulatorName(const std::string& name);

struct PeerCredentials {
    std::uint32_t userId;
    int processId;
};
/// Who is at the other end of a connected Unix socket.
std::optional<PeerCredentials> CredentialsOfPeer(int socketFile);
/// Whether a process of that user may be talked to: it is this process's own user, or root.
bool IsTrustedUser(std::uint32_t userId);

/// A listening (or connected) socket file for the instrument `name`, which does not wait; -1 with `errno`
/// set. `EAGAIN` says that somebody listens but has not taken connections for some time.
int ListenAsSimulator(const std::string& name);
int ConnectToSimulator(const std::string& name);

}  // namespace Varnholt::Platform::Usb
