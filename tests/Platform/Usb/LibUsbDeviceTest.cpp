#include <sys/socket.h>
#include <sys/un.h>

#include "Platform/Linux/FileDescriptor.h"
#include "Platform/Usb/LibUsbDevice.h"
#include "Support/TestFolder.h"

namespace Varnholt::Platform::Usb {
namespace {

TEST(LibUsbDevices, SayWhyTheyDoNotOpen) {
    const Tests::TestFolder folder;
    const std::string unplugged = folder.Path("socket");  // "no such device" is what opening it answers
    sockaddr_un address{AF_UNIX, {}};
    unplugged.copy(address.sun_path, sizeof address.sun_path);
    const Linux::FileDescriptor file(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    ASSERT_EQ(bind(file.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    for (const auto& [node, code] : {std::pair(unplugged, Errors::FileNotFound),
                                     {folder.Path("none"), Errors::FileNotFound},
                                     {folder.Path(""), Errors::AccessDenied}}) {
        ErrorCode error = Errors::Success;
        EXPECT_EQ(OpenLibUsbDevice(node, error), nullptr);
        EXPECT_EQ(error, code) << node;
    }
}

}  // namespace
}  // namespace Varnholt::Platform::Usb
