#pragma once

#include <filesystem>
#include <string>

namespace Varnholt::Utilities::Files {

/// The name that a file is to have once it is complete: what may have that name now, and how a file that was
/// written beside it takes its place. Failures are `FileError`.
class FinalName final {
  public:
    enum class IfItExists { Replace, Refuse };

    /// A folder is refused.
    explicit FinalName(const std::string& name);

    const std::string& Shown() const { return shownName_; }
    /// For the file that is to take the name: this name, through links, with `suffix` behind it. Empty for
    /// what can only be written to directly: a device, a pipe.
    std::filesystem::path Beside(const std::string& suffix) const;
    /// Whether something had the name when the object was made.
    bool Existed() const { return existed_; }

    /// `partial`, a closed file in the same folder whose content is on the disk, gets the name, and the
    /// permissions of what had it. False, with nothing changed, where that is refused because something has
    /// the name already.
    bool Give(const std::filesystem::path& partial, IfItExists policy) const;

    [[noreturn]] void Fail(const std::string& what) const;

  private:
    const std::string shownName_;
    std::filesystem::path target_;
    bool existed_;
    bool isOrdinary_;
};

}  // namespace Varnholt::Utilities::Files
