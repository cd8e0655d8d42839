#pragma once

#include <cstddef>
#include <memory>
#include <string>

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
        bool (*initialise)(void* memory, const void* argument);
        bool (*isValid)(const void* memory);
        const void* argument;
    };

    /// Null on failure with the reason in `LastError`: `Errors::InvalidData` for a file that is in use
    /// with other content. `kind` is a short word.
    static std::unique_ptr<SharedFile> Open(const std::string& kind, const std::string& name,
                                            const Content& content);

    ~SharedFile();
    SharedFile(const SharedFile&) = delete;
    SharedFile& operator=(const SharedFile&) = delete;

    void* Memory() const;

    /// A name's file in the directory: the name with its unusual characters escaped, or shortened to its
    /// beginning and a hash.
    static std::string FileNameOf(const std::string& kind, const std::string& name);

  private:
    class OpenFile;
    struct Attempts;
    SharedFile(std::unique_ptr<UserDirectory> usersDirectory, std::string fileName,
               std::unique_ptr<OpenFile> opened);

    const std::unique_ptr<UserDirectory> directory_;
    const std::string name_;
    const std::unique_ptr<OpenFile> file_;
};

}  // namespace Varnholt::Platform::Linux
