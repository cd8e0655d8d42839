#include "Platform/Usb/SimulatorAddress.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <string_view>
#include <utility>

#include "Platform/Linux/FileDescriptor.h"

namespace Varnholt::Platform::Usb {
namespace {

/// A socket that `bind` or `connect` has put to use; none, with the reason in `errno`, on failure.
Linux::FileDescriptor MakeSocket(const std::string& name, int (*use)(int, const sockaddr*, socklen_t)) {
    // A leading zero makes the name an abstract one, which is as long as the address says.
    const std::string path = '\0' + (SimulatorSocketPrefix + name);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::copy_n(path.begin(), std::min(path.size(), sizeof address.sun_path), address.sun_path);
    const auto size = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + path.size());
    // Never waits: a connection is there at once, or the simulator has stopped taking them.
    Linux::FileDescriptor file(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    const bool isUsed = file && use(file.Get(), reinterpret_cast<const sockaddr*>(&address), size) == 0;
    return isUsed ? std::move(file) : Linux::FileDescriptor();
}

}  // namespace

bool IsSimulatorName(const std::string& name) {
    constexpr std::string_view allowed = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_.";
    constexpr std::size_t longest = 64;
    return !name.empty() && name.size() <= longest && name.find_first_not_of(allowed) == std::string::npos;
}

std::optional<PeerCredentials> CredentialsOfPeer(int socketFile) {
    ucred credentials{};
    socklen_t size = sizeof credentials;
    if (getsockopt(socketFile, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) {
        return std::nullopt;
    }
    return PeerCredentials{credentials.uid, credentials.pid};
}

bool IsTrustedUser(std::uint32_t userId) {
    return userId == geteuid() || userId == 0;
}

int ListenAsSimulator(const std::string& name) {
    Linux::FileDescriptor file = MakeSocket(name, bind);
    // Beyond them a connection fails, so these are more than come while the simulator is busy.
    constexpr int waitingConnections = 256;
    return file && listen(file.Get(), waitingConnections) == 0 ? file.Release() : -1;
}

int ConnectToSimulator(const std::string& name) {
    return MakeSocket(name, connect).Release();
}

}  // namespace Varnholt::Platform::Usb
