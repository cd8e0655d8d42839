#include "Platform/Linux/SharedFile.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <optional>
#include <string_view>
#include <utility>

#include "Platform/ErrorCodes.h"
#include "Platform/Linux/ErrnoCodes.h"

namespace Varnholt::Platform::Linux {
namespace {

constexpr std::size_t LongestEscapedName = 180;
constexpr std::size_t KeptOfLongName = 120;
/// Each attempt but the last met a process that was just letting go of the file, or just making it.
constexpr int MostAttempts = 1000;
constexpr useconds_t PauseBetweenAttempts = 200;
constexpr int AttemptsWithoutPause = 10;

std::string Escaped(const std::string& name) {
    std::string escaped;
    for (const char character : name) {
        const bool usual = (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z') ||
                           (character >= '0' && character <= '9') || character == '_' || character == '-';
        if (usual) {
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

/// A file that is open and mapped.
class SharedFile::OpenFile final {
  public:
    OpenFile() = default;
    ~OpenFile() {
        Unmap();
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
    }
    OpenFile(const OpenFile&) = delete;
    OpenFile& operator=(const OpenFile&) = delete;

    /// Once; false with the reason in `errno`. The object is there before the file is, so that no failure
    /// comes between the two.
    bool Open(const UserDirectory& directory, const char* name, int flags, mode_t mode = 0) {
        descriptor_ = openat(directory.Descriptor(), name, flags, mode);
        return descriptor_ >= 0;
    }
    int Get() const { return descriptor_; }
    void* Memory() const { return memory_; }

    bool Map(std::size_t mappedSize) {
        void* const mapped = mmap(nullptr, mappedSize, PROT_READ | PROT_WRITE, MAP_SHARED, descriptor_, 0);
        if (mapped == MAP_FAILED) {
            return false;
        }
        memory_ = mapped;
        size_ = mappedSize;
        return true;
    }
    void Unmap() {
        if (memory_) {
            munmap(std::exchange(memory_, nullptr), size_);
        }
    }

  private:
    int descriptor_ = -1;
    void* memory_ = nullptr;
    std::size_t size_ = 0;
};

/// The steps of `Open`.
struct SharedFile::Attempts {
    using OpenFilePtr = std::unique_ptr<OpenFile>;

    static OpenFilePtr Fail(ErrorCode code) {
        SetLastError(code);
        return nullptr;
    }

    /// Null when the file was in motion: another process made it or let go of it at this moment. Otherwise an
    /// attempt that came to an end, with a file or, after `LastError` was set, without.
    using Attempt = std::optional<OpenFilePtr>;

    /// Makes the file without a name, fills it, and then gives it its name if nobody has taken that
    /// meanwhile.
    static Attempt Make(const UserDirectory& directory, const std::string& name,
                        const SharedFile::Content& content) {
        auto file = std::make_unique<OpenFile>();
        if (!file->Open(directory, ".", O_TMPFILE | O_RDWR | O_CLOEXEC, S_IRUSR | S_IWUSR) ||
            ftruncate(file->Get(), static_cast<off_t>(content.size)) != 0 || !file->Map(content.size) ||
            flock(file->Get(), LOCK_SH | LOCK_NB) != 0) {
            return Fail(CodeOf(errno));
        }
        if (!content.initialise(file->Memory(), content.argument)) {
            return Fail(Errors::NoSystemResources);
        }
        const std::string unnamed = "/proc/self/fd/" + std::to_string(file->Get());
        if (linkat(AT_FDCWD, unnamed.c_str(), directory.Descriptor(), name.c_str(), AT_SYMLINK_FOLLOW) != 0) {
            return errno == EEXIST ? Attempt() : Fail(CodeOf(errno));
        }
        return file;
    }

    /// Opens what another process has made.
    static Attempt Join(OpenFilePtr file, const UserDirectory& directory, const std::string& name,
                        const SharedFile::Content& content) {
        struct stat state {};
        if (fstat(file->Get(), &state) != 0) {
            return Fail(CodeOf(errno));
        }
        if (!S_ISREG(state.st_mode) || state.st_uid != geteuid()) {
            // Such as root could have put there: its owner may write anything into it.
            return Fail(Errors::AccessDenied);
        }
        if (flock(file->Get(), LOCK_SH | LOCK_NB) != 0) {
            return errno == EWOULDBLOCK ? Attempt() : Fail(CodeOf(errno));
        }
        if (fstat(file->Get(), &state) != 0 || state.st_nlink == 0) {
            return Attempt();
        }
        // The size first: memory behind the end of a file must not be touched.
        if (state.st_size == static_cast<off_t>(content.size)) {
            if (!file->Map(content.size)) {
                return Fail(CodeOf(errno));
            }
            if (content.isValid(file->Memory())) {
                return file;
            }
        }
        // Nothing of ours. Without users it only bars the way.
        if (flock(file->Get(), LOCK_EX | LOCK_NB) == 0 &&
            unlinkat(directory.Descriptor(), name.c_str(), 0) == 0) {
            return Attempt();
        }
        return Fail(Errors::InvalidData);
    }

    static Attempt OpenOrMake(const UserDirectory& directory, const std::string& name,
                              const SharedFile::Content& content) {
        // Not to be kept waiting by a named pipe either, and no link to be followed.
        auto file = std::make_unique<OpenFile>();
        if (file->Open(directory, name.c_str(), O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC)) {
            return Join(std::move(file), directory, name, content);
        }
        return errno == ENOENT ? Make(directory, name, content) : Fail(CodeOf(errno));
    }
};

SharedFile::SharedFile(std::unique_ptr<UserDirectory> usersDirectory, std::string fileName,
                       std::unique_ptr<OpenFile> opened)
    : directory_(std::move(usersDirectory)), name_(std::move(fileName)), file_(std::move(opened)) {}

std::unique_ptr<SharedFile> SharedFile::Open(const std::string& kind, const std::string& name,
                                             const Content& content) {
    auto directory = UserDirectory::Open();
    if (!directory) {
        return nullptr;
    }
    std::string fileName = FileNameOf(kind, name);
    for (int count = 0; count < MostAttempts; ++count) {
        if (Attempts::Attempt attempt = Attempts::OpenOrMake(*directory, fileName, content)) {
            return *attempt ? std::unique_ptr<SharedFile>(new SharedFile(
                                  std::move(directory), std::move(fileName), std::move(*attempt)))
                            : nullptr;
        }
        if (count > AttemptsWithoutPause) {
            usleep(PauseBetweenAttempts);
        }
    }
    SetLastError(Errors::Busy);
    return nullptr;
}

SharedFile::~SharedFile() {
    file_->Unmap();
    if (flock(file_->Get(), LOCK_EX | LOCK_NB) != 0) {
        return;  // others use it
    }
    struct stat state {};
    if (fstat(file_->Get(), &state) == 0 && state.st_nlink > 0) {
        unlinkat(directory_->Descriptor(), name_.c_str(), 0);
    }
}

void* SharedFile::Memory() const {
    return file_->Memory();
}

std::string SharedFile::FileNameOf(const std::string& kind, const std::string& name) {
    std::string escaped = Escaped(name);
    if (escaped.size() > LongestEscapedName) {
        escaped = escaped.substr(0, KeptOfLongName) + "." + Hash(name);
    }
    return kind + "." + escaped;
}

}  // namespace Varnholt::Platform::Linux
