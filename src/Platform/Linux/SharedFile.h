#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <utility>

#include "Platform/ErrorCodes.h"
#include "Platform/Linux/FileDescriptor.h"
#include "Platform/Linux/UserDirectory.h"

namespace Varnholt::Platform::Linux {

/// Memory that every process of one user that opens the same name shares; a file in the user's directory that
/// is there while somebody has it open.
///
/// A file appears under its name complete, and goes with the last that lets go of it: users hold a shared
/// lock on it, and who can turn his own into an exclusive one is the last. A newcomer who locked a file that
/// has just lost its name starts again. A process that dies leaves a file that the next one takes over.
class SharedFile final {
  public:
    /// What the content must be made of. `initialise` is called on zeroed memory that nobody else can see,
    /// `isValid` on what another process has made; the size must match as well.
    struct Content {
        std::size_t size;
        std::function<bool(void* memory)> initialise;
        std::function<bool(const void* memory)> isValid;
    };

    /// Null on failure with the reason in `LastError`: `Errors::InvalidData` for a file that is in use
    /// with other content. `kind` is a short word.
    static std::unique_ptr<SharedFile> Open(const std::string& kind, const std::string& name,
                                            const Content& content);

    ~SharedFile();
    SharedFile(const SharedFile&) = delete;
    SharedFile& operator=(const SharedFile&) = delete;

    void* Memory() const { return file_.memory.get(); }

    /// A name's file in the directory: the name with its unusual characters escaped, or shortened to its
    /// beginning and a hash.
    static std::string FileNameOf(const std::string& kind, const std::string& name);

  private:
    /// A file that is open and mapped.
    struct MappedFile {
        struct Unmap {
            std::size_t size;
            void operator()(void* mapped) const;
        };
        FileDescriptor descriptor;
        std::unique_ptr<void, Unmap> memory;

        bool Map(std::size_t size);  ///< false with the reason in `errno`
    };
    /// An attempt to open the file may find it in motion: another process made it or let go of it at this
    /// moment. One that failed has set `LastError`.
    enum class Attempt { Succeeded, Failed, InMotion };

    SharedFile(std::unique_ptr<UserDirectory> usersDirectory, std::string fileName)
        : directory_(std::move(usersDirectory)), name_(std::move(fileName)) {}
    static Attempt Fail(ErrorCode code);
    Attempt OpenOrMake(const Content& content);
    Attempt Make(const Content& content);
    Attempt Join(const Content& content);

    const std::unique_ptr<UserDirectory> directory_;
    const std::string name_;
    MappedFile file_;
};

}  // namespace Varnholt::Platform::Linux
