#include "Platform/ListedInterfaces.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "Platform/ErrorCodes.h"

namespace Varnholt::Platform {
namespace {

constexpr std::uint32_t RecordSizeField = InterfaceRecord{}.size;

std::uint32_t DetailSizeOf(const std::string& path) {
    return static_cast<std::uint32_t>(InterfaceDetailPathOffset + path.size() + 1);
}

}  // namespace

ListedInterfaces::ListedInterfaces(const Protocol::Guid& interfaceClass, std::vector<std::string> paths)
    : listedClass_(interfaceClass), listedPaths_(std::move(paths)) {}

bool ListedInterfaces::Find(const Protocol::Guid& interfaceClass, std::uint32_t index,
                            InterfaceRecord& record) const {
    if (record.size != RecordSizeField) {
        SetLastError(Errors::InvalidParameter);
        return false;
    }
    if (interfaceClass != listedClass_ || index >= listedPaths_.size()) {
        SetLastError(Errors::NoMoreItems);
        return false;
    }
    constexpr std::uint32_t InterfaceIsActive = 1;
    record.interfaceClass = listedClass_;
    record.flags = InterfaceIsActive;
    record.reserved = std::uintptr_t{index} + 1;  // 0 names nothing: a record that was never filled in
    return true;
}

std::uint32_t ListedInterfaces::DetailSize(const InterfaceRecord& record) const {
    const std::string* path = PathOf(record);
    return path ? DetailSizeOf(*path) : 0;
}

bool ListedInterfaces::ReadDetail(const InterfaceRecord& record, std::span<std::byte> detail) const {
    const std::string* path = PathOf(record);
    if (path == nullptr) {
        return false;
    }
    if (detail.size() < DetailSizeOf(*path)) {
        SetLastError(Errors::InsufficientBuffer);
        return false;
    }
    std::uint32_t sizeField = 0;
    std::memcpy(&sizeField, detail.data(), sizeof sizeField);
    if (sizeField != InterfaceDetailSizeField) {
        SetLastError(Errors::InvalidParameter);
        return false;
    }
    const auto behindPath =
        std::ranges::copy(std::as_bytes(std::span(*path)), detail.begin() + InterfaceDetailPathOffset).out;
    *behindPath = std::byte{0};
    return true;
}

const std::string* ListedInterfaces::PathOf(const InterfaceRecord& record) const {
    if (record.size != RecordSizeField || record.interfaceClass != listedClass_ || record.reserved == 0 ||
        record.reserved > listedPaths_.size()) {
        SetLastError(Errors::InvalidParameter);
        return nullptr;
    }
    return &listedPaths_[record.reserved - 1];
}

}  // namespace Varnholt::Platform
