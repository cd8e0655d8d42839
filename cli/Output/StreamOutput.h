#pragma once

#include <iosfwd>

#include "Output/RecordOutput.h"

namespace Varnholt::Cli {

/// Records on a stream, such as standard output, each block on its way when `Append` returns.
class StreamOutput final : public RecordOutput {
  public:
    /// Not owned.
    explicit StreamOutput(std::ostream& usedStream) : stream_(usedStream) {}

    void Complete() override {}
    Remains KeepWholeRecords() override { return {}; }
    void Discard() override {}

  private:
    OutputDescriptor::Outcome Take(std::span<const char> block) override;
    [[noreturn]] void Fail(std::error_code error) const override;

    std::ostream& stream_;
};

}  // namespace Varnholt::Cli
