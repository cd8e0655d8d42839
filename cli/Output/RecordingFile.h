#pragma once

#include <filesystem>

#include "Output/RecordOutput.h"
#include "Utilities/Files/FinalName.h"

namespace Varnholt::Cli {

/// Records in a file that grows as FILE.part and is FILE when it is complete. An early end cuts it to whole
/// records; it then becomes FILE only where there was none. What is no ordinary file is written to directly.
///
/// A FILE.part that is there already belongs to another run, or is what a killed one left: it is refused.
class RecordingFile final : public RecordOutput {
  public:
    /// `userInterruption` outlives the object.
    RecordingFile(const std::string& name, const Service::Interruption& userInterruption);
    /// Without a word on what it is to become, it ends early and keeps what there is.
    ~RecordingFile() override;

    void Complete() override;
    Remains KeepWholeRecords() override;
    void Discard() override;

  private:
    OutputDescriptor::Outcome Take(std::span<const char> block) override;
    [[noreturn]] void Fail(std::error_code error) const override;
    OutputDescriptor Open();

    const Utilities::Files::FinalName finalName_;
    const Service::Interruption& interruption_;
    const std::filesystem::path partial_;  ///< empty: written directly
    OutputDescriptor descriptor_;
    bool isOpen_ = true;
};

}  // namespace Varnholt::Cli
