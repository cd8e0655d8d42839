#include "Platform/Posix/UserDirectory.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "Platform/ErrorCodes.h"
#include "Platform/Posix/ErrnoCodes.h"

namespace Varnholt::Platform::Posix {
namespace {

constexpr const char* Prefix = "/ostra-";

}  // namespace

std::unique_ptr<UserDirectory> UserDirectory::Open(const std::string& above) {
    std::unique_ptr<UserDirectory> directory(new UserDirectory);
    const std::string first = above + Prefix + std::to_string(geteuid());
    // Ends: every name that somebody else has taken costs him memory of the machine.
    for (unsigned taken = 0;; ++taken) {
        directory->path = taken == 0 ? first : first + "." + std::to_string(taken);
        const char* const path = directory->path.c_str();
        if (mkdir(path, S_IRWXU) != 0 && errno != EEXIST) {
            SetLastError(CodeOf(errno));
            return nullptr;
        }
        // O_PATH asks for no permission: who owns the directory is told of others' too.
        directory->descriptor = open(path, O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
        if (directory->descriptor < 0) {
            if (errno == ENOTDIR || errno == ELOOP || errno == ENOENT) {
                continue;  // a file or link, or gone meanwhile
            }
            SetLastError(CodeOf(errno));
            return nullptr;
        }
        struct stat state {};
        if (fstat(directory->descriptor, &state) == 0 && state.st_uid == geteuid()) {
            return directory;
        }
        close(directory->descriptor);
        directory->descriptor = -1;
    }
}

UserDirectory::~UserDirectory() {
    if (descriptor >= 0) {
        close(descriptor);
    }
}

}  // namespace Varnholt::Platform::Posix
