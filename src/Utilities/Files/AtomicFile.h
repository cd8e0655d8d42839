#pragma once

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <span>
#include <string>

#include "Utilities/Files/FinalName.h"

namespace Varnholt::Utilities::Files {

/// A file that takes its name only when it is complete: until `Commit` the content is in a file beside it,
/// which is gone if that never comes. What had the name before stays whole till then. A name that is no
/// ordinary file (a device, a pipe) is written to directly.
///
/// Failures are `FileError`.
class AtomicFile final {
  public:
    using IfItExists = FinalName::IfItExists;

    explicit AtomicFile(const std::string& name, IfItExists policy = IfItExists::Replace);
    ~AtomicFile();
    AtomicFile(const AtomicFile&) = delete;
    AtomicFile& operator=(const AtomicFile&) = delete;

    std::ostream& Stream() { return stream_; }
    void Write(std::span<const std::uint8_t> content);
    /// Returns when the content is on the disk, beside the name that it is to take.
    void Prepare();
    /// Returns when the content is on the disk under its name.
    void Commit();

  private:
    [[noreturn]] void FailAsItExists() const;

    const FinalName finalName_;
    const IfItExists ifItExists_;
    std::filesystem::path partial_;  ///< empty: written directly, or committed
    std::ofstream stream_;
};

void WriteFileAtomically(const std::string& name, std::span<const std::uint8_t> content,
                         AtomicFile::IfItExists policy = AtomicFile::IfItExists::Replace);

}  // namespace Varnholt::Utilities::Files
