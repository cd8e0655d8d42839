#include "Platform/Usb/SimulatorAddress.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <string_view>
#include <utility>

#include "Platform/Linux/FileDescriptor.h"

namespace Varnholt::Platform::Usb {
namespace {

class Address final {
  public:
    explicit Address(const std::string& name) {
        // A leading zero makes the name an abstract one, which is as long as the address says.
        const std::string path = SimulatorSocketPrefix + name;
        address_.sun_family = AF_UNIX;
        std::copy_n(path.begin(), std::min(path.size(), sizeof(address_.sun_path) - 1),
                    address_.sun_path + 1);
        size_ = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + 1 + path.size());
    }

    Linux::FileDescriptor MakeSocket(int (*use)(int, const sockaddr*, socklen_t)) const {
        // Never waits: a connection is there at once, or the simulator has stopped taking them.
        Linux::FileDescriptor file(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
        const bool isUsed = file && use(file.Get(), reinterpret_cast<const sockaddr*>(&address_), size_) == 0;
        return isUsed ? std::move(file) : Linux::FileDescriptor();
    }

  private:
    sockaddr_un address_{};
    socklen_t size_ = 0;
};

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
    Linux::FileDescriptor file = Address(name).MakeSocket(bind);
    // Beyond them a connection fails, so these are more than come while the simulator is busy.
    constexpr int waitingConnections = 256;
    return file && listen(file.Get(), waitingConnections) == 0 ? file.Release() : -1;
}

int ConnectToSimulator(const std::string& name) {
    return Address(name).MakeSocket(connect).Release();
}

}  // namespace Varnholt::Platform::Usb
