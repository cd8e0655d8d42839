#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

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
    struct Case {
        const char* name;
        std::vector<std::string> controllers;
        std::string order;  ///< empty: none is free
    };
    const auto port = [](const char* number, const char* state) {
        return "hs  00" + std::string(number) + state;
    };
    for (const Case& test : {
             Case{"all free",
                  {port("00", Free) + port("01", Free) + "ss  0015" + Free, port("30", Free)},
                  "0 7 65538 3"},
             Case{"one used", {port("00", Attached) + port("01", Free), port("30", Free)}, "30 7 65538 3"},
             Case{"beside used ones",
                  {port("00", Attached) + port("01", Free), port("30", Attached)},
                  "1 7 65538 3"},
             Case{"super speed only", {"ss  0015" + std::string(Free)}, ""},
             Case{"all used", {port("00", Attached), port("30", Attached)}, ""},
         }) {
        std::filesystem::remove_all(folder_);
        std::filesystem::create_directory(folder_);
        Write("attach", "");
        for (std::size_t i = 0; i < test.controllers.size(); ++i) {
            Write("status" + (i == 0 ? "" : "." + std::to_string(i)), Heading + test.controllers[i]);
        }
        if (test.order.empty()) {
            EXPECT_THROW(PlugIntoKernel(7, 0x10002, folder_), std::runtime_error) << test.name;
            continue;
        }
        EXPECT_EQ(std::stoul(test.order), PlugIntoKernel(7, 0x10002, folder_)) << test.name;
        std::ifstream written(files_.Path("attach"));
        EXPECT_EQ(test.order, std::string(std::istreambuf_iterator<char>(written), {})) << test.name;
    }
}

TEST_F(KernelPortTest, SaysWhatToDoWhereThereIsNoSuchHost) {
    try {
        PlugIntoKernel(7, 0x10002, files_.Path("missing"));
        ADD_FAILURE();
    } catch (const std::runtime_error& error) {
        EXPECT_THAT(error.what(), testing::HasSubstr("modprobe vhci-hcd"));
    }
    Write("status", Heading + std::string("hs  0000") + Free);
    EXPECT_THROW(PlugIntoKernel(7, 0x10002, folder_), std::runtime_error) << "nothing to write the order to";
}

}  // namespace
}  // namespace Varnholt::Simulator
