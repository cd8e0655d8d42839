#include "Platform/Linux/UserDirectory.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "Platform/ErrorCodes.h"
#include "Platform/Linux/ErrnoCodes.h"

namespace Varnholt::Platform::Linux {
namespace {

constexpr const char* Prefix = "/ostra-";

}  // namespace

std::unique_ptr<UserDirectory> UserDirectory::Open(const std::string& above) {
    std::unique_ptr<UserDirectory> directory(new UserDirectory);
    const std::string first = above + Prefix + std::to_string(geteuid());
    // Ends: every name that somebody else has taken costs him memory of the machine.
    for (unsigned taken = 0;; ++taken) {
        directory->path_ = taken == 0 ? first : first + "." + std::to_string(taken);
        const char* const path = directory->path_.c_str();
        if (mkdir(path, S_IRWXU) != 0 && errno != EEXIST) {
            SetLastError(CodeOf(errno));
            return nullptr;
        }
        // O_PATH asks for no permission: who owns the directory is told of others' too.
        directory->descriptor_ = FileDescriptor(open(path, O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
        if (!directory->descriptor_) {
            if (errno == ENOTDIR || errno == ELOOP || errno == ENOENT) {
                continue;  // a file or link, or gone meanwhile
            }
            SetLastError(CodeOf(errno));
            return nullptr;
        }
        struct stat state {};
        if (fstat(directory->Descriptor(), &state) == 0 && state.st_uid == geteuid()) {
            return directory;
        }
    }
}

}  // namespace Varnholt::Platform::Linux
