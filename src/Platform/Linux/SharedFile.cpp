#include "Platform/Linux/SharedFile.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <string_view>
#include <utility>

#include "Platform/ErrorCodes.h"
#include "Platform/Linux/ErrnoCodes.h"

namespace Varnholt::Platform::Linux {
namespace {

/// What a name's characters stay as they are in the name of its file.
constexpr std::string_view Usual = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789_-";
constexpr std::size_t LongestEscapedName = 180;
constexpr std::size_t KeptOfLongName = 120;
/// Each attempt but the last met a process that was just letting go of the file, or just making it.
constexpr int MostAttempts = 1000;
constexpr useconds_t PauseBetweenAttempts = 200;
constexpr int AttemptsWithoutPause = 10;

std::string Escaped(const std::string& name) {
    std::string escaped;
    for (const char character : name) {
        if (Usual.find(character) != Usual.npos) {
            escaped += character;
        } else {
            char code[4];
            static_cast<void>(std::snprintf(code, sizeof code, "%%%02X",
                                            static_cast<unsigned>(static_cast<unsigned char>(character))));
            escaped += code;
        }
    }
    return escaped;
}

/// FNV-1a; two start values make 128 bits, so that two names do not meet by chance.
std::string Hash(const std::string& name) {
    std::string text;
    for (std::uint64_t hash : {0xCBF29CE484222325u, 0x9AE16A3B2F90404Fu}) {
        for (const char character : name) {
            hash = (hash ^ static_cast<unsigned char>(character)) * 0x100000001B3u;
        }
        char digits[17];
        static_cast<void>(
            std::snprintf(digits, sizeof digits, "%016llX", static_cast<unsigned long long>(hash)));
        text += digits;
    }
    return text;
}

}  // namespace

void SharedFile::MappedFile::Unmap::operator()(void* mapped) const {
    munmap(mapped, size);
}

bool SharedFile::MappedFile::Map(std::size_t size) {
    void* const mapped = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, descriptor.Get(), 0);
    if (mapped == MAP_FAILED) {
        return false;
    }
    memory = std::unique_ptr<void, Unmap>(mapped, {size});
    return true;
}

std::unique_ptr<SharedFile> SharedFile::Open(const std::string& kind, const std::string& name,
                                             const Content& content) {
    auto directory = UserDirectory::Open();
    if (!directory) {
        return nullptr;
    }
    std::unique_ptr<SharedFile> file(new SharedFile(std::move(directory), FileNameOf(kind, name)));
    for (int count = 0; count < MostAttempts; ++count) {
        const Attempt attempt = file->OpenOrMake(content);
        if (attempt != Attempt::InMotion) {
            return attempt == Attempt::Succeeded ? std::move(file) : nullptr;
        }
        if (count > AttemptsWithoutPause) {
            usleep(PauseBetweenAttempts);
        }
    }
    SetLastError(Errors::Busy);
    return nullptr;
}

SharedFile::Attempt SharedFile::Fail(ErrorCode code) {
    SetLastError(code);
    return Attempt::Failed;
}

SharedFile::Attempt SharedFile::OpenOrMake(const Content& content) {
    file_ = {};
    // Not to be kept waiting by a named pipe either, and no link to be followed.
    constexpr int flags = O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
    file_.descriptor = FileDescriptor(openat(directory_->Descriptor(), name_.c_str(), flags));
    if (file_.descriptor) {
        return Join(content);
    }
    return errno == ENOENT ? Make(content) : Fail(CodeOf(errno));
}

/// Makes the file without a name, fills it, and then gives it its name if nobody has taken that meanwhile.
SharedFile::Attempt SharedFile::Make(const Content& content) {
    constexpr int flags = O_TMPFILE | O_RDWR | O_CLOEXEC;
    file_.descriptor = FileDescriptor(openat(directory_->Descriptor(), ".", flags, S_IRUSR | S_IWUSR));
    const int file = file_.descriptor.Get();
    if (file < 0 || ftruncate(file, static_cast<off_t>(content.size)) != 0 || !file_.Map(content.size) ||
        flock(file, LOCK_SH | LOCK_NB) != 0) {
        return Fail(CodeOf(errno));
    }
    if (!content.initialise(Memory())) {
        return Fail(Errors::NoSystemResources);
    }
    const std::string unnamed = "/proc/self/fd/" + std::to_string(file);
    if (linkat(AT_FDCWD, unnamed.c_str(), directory_->Descriptor(), name_.c_str(), AT_SYMLINK_FOLLOW) != 0) {
        return errno == EEXIST ? Attempt::InMotion : Fail(CodeOf(errno));
    }
    return Attempt::Succeeded;
}

/// Takes the file that another process has made.
SharedFile::Attempt SharedFile::Join(const Content& content) {
    const int file = file_.descriptor.Get();
    struct stat state {};
    if (fstat(file, &state) != 0) {
        return Fail(CodeOf(errno));
    }
    if (!S_ISREG(state.st_mode) || state.st_uid != geteuid()) {
        // Such as root could have put there: its owner may write anything into it.
        return Fail(Errors::AccessDenied);
    }
    if (flock(file, LOCK_SH | LOCK_NB) != 0) {
        return errno == EWOULDBLOCK ? Attempt::InMotion : Fail(CodeOf(errno));
    }
    if (fstat(file, &state) != 0 || state.st_nlink == 0) {
        return Attempt::InMotion;
    }
    // The size first: memory behind the end of a file must not be touched.
    if (state.st_size == static_cast<off_t>(content.size)) {
        if (!file_.Map(content.size)) {
            return Fail(CodeOf(errno));
        }
        if (content.isValid(Memory())) {
            return Attempt::Succeeded;
        }
        file_.memory.reset();
    }
    // Nothing of ours. Without users it only bars the way.
    if (flock(file, LOCK_EX | LOCK_NB) == 0 && unlinkat(directory_->Descriptor(), name_.c_str(), 0) == 0) {
        return Attempt::InMotion;
    }
    return Fail(Errors::InvalidData);
}

SharedFile::~SharedFile() {
    if (!file_.memory || flock(file_.descriptor.Get(), LOCK_EX | LOCK_NB) != 0) {
        return;  // not ours, or others use it
    }
    struct stat state {};
    if (fstat(file_.descriptor.Get(), &state) == 0 && state.st_nlink > 0) {
        unlinkat(directory_->Descriptor(), name_.c_str(), 0);
    }
}

std::string SharedFile::FileNameOf(const std::string& kind, const std::string& name) {
    std::string escaped = Escaped(name);
    if (escaped.size() > LongestEscapedName) {
        escaped = escaped.substr(0, KeptOfLongName) + "." + Hash(name);
    }
    return kind + "." + escaped;
}

}  // namespace Varnholt::Platform::Linux
