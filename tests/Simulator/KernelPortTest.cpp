#include <gmock/gmock.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>

#include "KernelPort.h"
#include "Support/TestFolder.h"

namespace Varnholt::Simulator {
namespace {

constexpr const char* Heading = "hub port sta spd dev      sockfd local_busid\n";
constexpr const char* Attached = " 006 003 00010002 000003 3-1\n";
constexpr const char* Free = " 004 000 00000000 000000 0-0\n";

class KernelPortTest : public testing::Test {
  protected:
    void Write(const std::string& name, const std::string& text) { std::ofstream(files_.Path(name)) << text; }

    const Tests::TestFolder files_;
    const std::string folder_ = files_.Path("");
};

TEST_F(KernelPortTest, TakesAFreeHighSpeedPortOfTheLeastUsedController) {
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
        Write("attach", "");
        Write("status", Heading + first);
        Write("status.1", Heading + second);
        if (*order == '\0') {
            EXPECT_THROW(PlugIntoKernel(7, 0x10002, folder_), std::runtime_error);
            continue;
        }
        EXPECT_EQ(std::stoul(order), PlugIntoKernel(7, 0x10002, folder_));
        std::ifstream written(files_.Path("attach"));
        EXPECT_EQ(order, std::string(std::istreambuf_iterator<char>(written), {}));
    }
    std::filesystem::remove(files_.Path("attach"));
    Write("status", Heading + port("00", true));
    EXPECT_THROW(PlugIntoKernel(7, 0x10002, folder_), std::runtime_error) << "nothing to write the order to";
}

TEST_F(KernelPortTest, SaysWhatToDoWhereThereIsNoSuchHost) {
    EXPECT_THAT([this] { PlugIntoKernel(7, 0x10002, files_.Path("missing")); },
                testing::ThrowsMessage<std::runtime_error>(testing::HasSubstr("modprobe vhci-hcd")));
}

}  // namespace
}  // namespace Varnholt::Simulator
