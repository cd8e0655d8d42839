#pragma once

#include <cstdint>
#include <span>
#include <string>

#include "CommandSpec.h"

namespace Varnholt::Cli {

class Session;

/// The file that a command makes.
struct NewFileOptions {
    std::string name;
    bool force = false;
};

/// The file, by these names, and --force.
void AddNewFileOptions(CommandSpec command, const char* names, NewFileOptions& options);

/// A file made of bytes, or standard output for "-". What exists already is replaced only by force; a pipe or
/// a device is written into.
class NewFile final {
  public:
    /// Refuses what cannot be written to, before anything is done for it. Both must outlive the object.
    NewFile(Session& usedSession, const NewFileOptions& chosen);

    void Write(std::span<const std::uint8_t> content) const;
    /// As messages say it.
    std::string ShownName() const;

  private:
    Session& session_;
    const NewFileOptions& options_;
    const bool isStandardOutput_;
    bool replaces_ = false;
};

}  // namespace Varnholt::Cli
