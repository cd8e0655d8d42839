#include <gmock/gmock.h>

#include <stdexcept>

#include "KernelPort.h"
#include "Support/TestFolder.h"

namespace Varnholt::Simulator {
namespace {

constexpr const char* Heading = "hub port sta spd dev      sockfd local_busid\n";
constexpr const char* Attached = " 006 003 00010002 000003 3-1\n";
constexpr const char* Free = " 004 000 00000000 000000 0-0\n";

TEST(KernelPort, TakesAFreeHighSpeedPortOfTheLeastUsedController) {
    const Tests::TestFolder files;
    const auto plug = [&files] { return PlugIntoKernel(7, 0x10002, files.Path("")); };
    const auto write = [&files](const char* name, const std::string& text) {
        std::ofstream(files.Path(name)) << text;
    };
    EXPECT_THAT([&files] { PlugIntoKernel(7, 0x10002, files.Path("missing")); },
                testing::ThrowsMessage<std::runtime_error>(testing::HasSubstr("modprobe vhci-hcd")));
    const auto port = [](const char* number, bool isFree) {
        return "hs  00" + std::string(number) + (isFree ? Free : Attached);
    };
    // Two controllers, and the order that is given; empty: none is free.
    for (const auto& [first, second, order] : std::vector<std::tuple<std::string, std::string, const char*>>{
             {port("00", true) + port("01", true) + "ss  0015" + Free, port("30", true), "0 7 65538 3"},
             {port("00", false) + port("01", true), port("30", true), "30 7 65538 3"},
             {port("00", false) + port("01", true), port("30", false), "1 7 65538 3"},
             {"ss  0015" + std::string(Free), port("30", false), ""},
         }) {
        write("attach", "");
        write("status", Heading + first);
        write("status.1", Heading + second);
        if (*order == '\0') {
            EXPECT_THROW(plug(), std::runtime_error);
            continue;
        }
        EXPECT_EQ(std::stoul(order), plug());
        std::ifstream written(files.Path("attach"));
        EXPECT_EQ(order, std::string(std::istreambuf_iterator<char>(written), {}));
    }
    std::filesystem::remove(files.Path("attach"));
    write("status", Heading + port("00", true));
    EXPECT_THROW(plug(), std::runtime_error) << "nothing to write the order to";
}

}  // namespace
}  // namespace Varnholt::Simulator
