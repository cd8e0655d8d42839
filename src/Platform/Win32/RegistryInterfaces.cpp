#include "Platform/Win32/RegistryInterfaces.h"

#include <charconv>
#include <cstdio>
#include <optional>
#include <string_view>

#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

constexpr const char* NotificationKey = "System\\CurrentControlSet\\Control\\WinDK\\DeviceNotification";
constexpr const char* DevicePrefix = "\\\\.\\";

/// The longest name of a registry value.
constexpr std::size_t LongestName = 16383;

class RegistryKey final {
  public:
    explicit RegistryKey(const char* path) {
        if (::RegOpenKeyExA(HKEY_LOCAL_MACHINE, path, 0, KEY_QUERY_VALUE, &key_) != ERROR_SUCCESS) {
            key_ = nullptr;
        }
    }
    ~RegistryKey() {
        if (key_ != nullptr) {
            ::RegCloseKey(key_);
        }
    }
    RegistryKey(const RegistryKey&) = delete;
    RegistryKey& operator=(const RegistryKey&) = delete;

    /// Nothing behind the last value, and where the key could not be opened.
    std::optional<std::string> NameOfValue(DWORD index) const {
        std::string name(LongestName + 1, '\0');
        auto length = static_cast<DWORD>(name.size());
        if (key_ == nullptr || ::RegEnumValueA(key_, index, name.data(), &length, nullptr, nullptr, nullptr,
                                               nullptr) != ERROR_SUCCESS) {
            return std::nullopt;
        }
        name.resize(length);
        return name;
    }

  private:
    HKEY key_ = nullptr;
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
    const RegistryKey key(NotificationKey);
    for (DWORD index = 0; const std::optional<std::string> name = key.NameOfValue(index); ++index) {
        if (NamesInterfaceOf(interfaceClass, *name)) {
            paths.push_back(DevicePrefix + *name);
        }
    }
    return paths;
}

}  // namespace Varnholt::Platform
