#include <gtest/gtest.h>

#include <algorithm>
#include <span>
#include <string>
#include <vector>

#include "Platform/DeviceFiles.h"
#include "Platform/DeviceInterfaces.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Platform {
namespace {

/// Files that are there to be listed.
class ListedFiles final : public DeviceFileSystem {
  public:
    std::vector<std::string> paths;

    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override {
        return interfaceClass == Protocol::UsbIoDriver::InterfaceClass ? paths : std::vector<std::string>{};
    }
    Handle Open(const std::string&) override { return InvalidHandle(); }
    bool CloseFile(Handle) override { return false; }
    bool StartRead(Handle, void*, std::uint32_t, Overlapped&) override { return false; }
    bool StartWrite(Handle, const void*, std::uint32_t, Overlapped&) override { return false; }
    bool StartControl(Handle, std::uint32_t, const void*, std::uint32_t, void*, std::uint32_t,
                      Overlapped&) override {
        return false;
    }
    bool GetResult(Handle, Overlapped&, std::uint32_t&, bool) override { return false; }
    bool CancelTransfers(Handle) override { return false; }
};

class Interfaces : public testing::Test {
  protected:
    static constexpr auto Class = Protocol::UsbIoDriver::InterfaceClass;

    void SetUp() override {
        files_.paths = {"usbio/first", "", "usbio/third"};
        list_ = DeviceInterfaces::MakeList(Class, false);
        ASSERT_NE(list_, nullptr);
    }
    void TearDown() override { EXPECT_TRUE(DeviceInterfaces::DestroyList(list_)); }

    ListedFiles files_;
    const ScopedDeviceFiles replaced_{files_};
    DeviceList list_ = nullptr;
};

std::vector<std::byte> Detail(std::size_t size, std::uint32_t sizeField = InterfaceDetailSizeField) {
    std::vector<std::byte> detail(size, std::byte{0xEE});
    const auto field = std::as_bytes(std::span(&sizeField, 1));
    std::copy_n(field.begin(), std::min(size, field.size()), detail.begin());
    return detail;
}

TEST_F(Interfaces, AreASnapshotInTheOrderOfTheFiles) {
    const std::vector<std::string> expected = files_.paths;
    files_.paths.clear();
    InterfaceRecord record;
    std::vector<std::string> found;
    for (std::uint32_t index = 0; DeviceInterfaces::Find(list_, Class, index, record); ++index) {
        EXPECT_EQ(record.interfaceClass, Class);
        std::vector<std::byte> detail = Detail(DeviceInterfaces::DetailSize(list_, record));
        ASSERT_TRUE(DeviceInterfaces::ReadDetail(list_, record, detail));
        EXPECT_EQ(detail.back(), std::byte{0});
        found.emplace_back(reinterpret_cast<const char*>(detail.data() + InterfaceDetailPathOffset));
        EXPECT_EQ(detail.size(), InterfaceDetailPathOffset + found.back().size() + 1);
    }
    EXPECT_EQ(LastError(), Errors::NoMoreItems);
    EXPECT_EQ(found, expected);
    SetLastError(Errors::Success);
    EXPECT_FALSE(DeviceInterfaces::Find(list_, Protocol::NativeDriver::InterfaceClass, 0, record));
    EXPECT_EQ(LastError(), Errors::NoMoreItems) << "of another class";
}

TEST_F(Interfaces, NeedTheSizesThatTheSystemExpects) {
    InterfaceRecord wrongSize;
    wrongSize.size = 32;
    EXPECT_FALSE(DeviceInterfaces::Find(list_, Class, 0, wrongSize));
    EXPECT_EQ(LastError(), Errors::InvalidParameter);

    InterfaceRecord record;
    ASSERT_TRUE(DeviceInterfaces::Find(list_, Class, 0, record));
    const std::uint32_t size = DeviceInterfaces::DetailSize(list_, record);
    struct {
        std::vector<std::byte> detail;
        ErrorCode code;
    } cases[] = {{Detail(size, 8), Errors::InvalidParameter},
                 {Detail(size - 1), Errors::InsufficientBuffer},
                 {Detail(0), Errors::InsufficientBuffer},
                 {Detail(3), Errors::InsufficientBuffer}};
    for (auto& failing : cases) {
        const std::vector<std::byte> before = failing.detail;
        EXPECT_FALSE(DeviceInterfaces::ReadDetail(list_, record, failing.detail));
        EXPECT_EQ(LastError(), failing.code);
        EXPECT_EQ(failing.detail, before) << "a failed read must not write";
    }
    const InterfaceRecord neverFilled;
    EXPECT_EQ(DeviceInterfaces::DetailSize(list_, neverFilled), 0u);
}

TEST_F(Interfaces, OfUnknownListsAreRefused) {
    int local = 0;
    const DeviceList gone = DeviceInterfaces::MakeList({}, false);
    EXPECT_TRUE(DeviceInterfaces::DestroyList(gone));
    for (const DeviceList unknown : {DeviceList{}, static_cast<DeviceList>(&local), gone}) {
        InterfaceRecord record;
        SetLastError(Errors::Success);
        EXPECT_FALSE(DeviceInterfaces::Find(unknown, {}, 0, record));
        EXPECT_EQ(LastError(), Errors::InvalidHandle);
        EXPECT_EQ(DeviceInterfaces::DetailSize(unknown, record), 0u);
        EXPECT_FALSE(DeviceInterfaces::ReadDetail(unknown, record, {}));
        EXPECT_FALSE(DeviceInterfaces::DestroyList(unknown));
    }
}

}  // namespace
}  // namespace Varnholt::Platform
