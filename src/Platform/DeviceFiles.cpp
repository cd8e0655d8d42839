#include "Platform/DeviceFiles.h"

namespace Varnholt::Platform {
namespace {
DeviceFileSystem* replacement = nullptr;
}

DeviceFileSystem& DeviceFiles() {
    return replacement ? *replacement : SystemDeviceFiles();
}

ScopedDeviceFiles::ScopedDeviceFiles(DeviceFileSystem& fileSystem) : previous_(replacement) {
    replacement = &fileSystem;
}

ScopedDeviceFiles::~ScopedDeviceFiles() {
    replacement = previous_;
}

}  // namespace Varnholt::Platform
