#include "Platform/Win32/RegistryInterfaces.h"

#include <charconv>
#include <cstdio>
#include <memory>
#include <string_view>
#include <type_traits>

#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

constexpr const char* NotificationKey = "System\\CurrentControlSet\\Control\\WinDK\\DeviceNotification";
constexpr const char* DevicePrefix = "\\\\.\\";

/// The longest name of a registry value.
constexpr std::size_t LongestName = 16383;

struct CloseKey {
    void operator()(HKEY key) const { ::RegCloseKey(key); }
};

/// Reads `digits`, two per byte, into the bytes; false unless they are exactly that many hexadecimal digits.
bool ReadBytes(std::string_view digits, std::uint8_t* bytes, std::size_t count) {
    if (digits.size() != 2 * count) {
        return false;
    }
    for (std::size_t i = 0; i < count; ++i) {
        const char* first = digits.data() + 2 * i;
        if (std::from_chars(first, first + 2, bytes[i], 16).ptr != first + 2) {
            return false;
        }
    }
    return true;
}

}  // namespace

bool NamesInterfaceOf(const Protocol::Guid& interfaceClass, const std::string& valueName) {
    unsigned data1 = 0;
    unsigned data2 = 0;
    unsigned data3 = 0;
    char clock[4 + 1] = "";
    char node[12 + 1] = "";
    if (std::sscanf(valueName.c_str(), "{%8x-%4x-%4x-%4s-%12s}", &data1, &data2, &data3, clock, node) != 5) {
        return false;
    }
    Protocol::Guid named{data1, static_cast<std::uint16_t>(data2), static_cast<std::uint16_t>(data3), {}};
    return ReadBytes(clock, named.data4.data(), 2) && ReadBytes(node, named.data4.data() + 2, 6) &&
           named == interfaceClass;
}

std::vector<std::string> ListRegistryInterfaces(const Protocol::Guid& interfaceClass) {
    std::vector<std::string> paths;
    HKEY opened = nullptr;
    if (::RegOpenKeyExA(HKEY_LOCAL_MACHINE, NotificationKey, 0, KEY_QUERY_VALUE, &opened) != ERROR_SUCCESS) {
        return paths;
    }
    const std::unique_ptr<std::remove_pointer_t<HKEY>, CloseKey> key(opened);
    std::string buffer(LongestName + 1, '\0');
    for (DWORD index = 0;; ++index) {
        auto length = static_cast<DWORD>(buffer.size());
        if (::RegEnumValueA(key.get(), index, buffer.data(), &length, nullptr, nullptr, nullptr, nullptr) !=
            ERROR_SUCCESS) {
            return paths;
        }
        const std::string name = buffer.substr(0, length);
        if (NamesInterfaceOf(interfaceClass, name)) {
            paths.push_back(DevicePrefix + name);
        }
    }
}

}  // namespace Varnholt::Platform
