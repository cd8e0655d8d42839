#pragma once

#include <cstdint>
#include <span>
#include <string>

#include "Output/OutputDescriptor.h"

namespace Varnholt::Cli {

/// Where the records of a measurement go while they are taken, and what becomes of them at its end. Knows at
/// any time how many records are there whole. Failures are `FileError` or, when the user wants
/// to end while something is waited for, `Failure` with `ExitCode::Interrupted`.
class RecordOutput {
  public:
    RecordOutput() = default;
    virtual ~RecordOutput() = default;
    RecordOutput(const RecordOutput&) = delete;
    RecordOutput& operator=(const RecordOutput&) = delete;

    /// How the records of a block are told from each other.
    enum class Form { EqualLength, Lines };
    /// Appends a block that holds so many whole records; with none it is something else, such as a head. Of a
    /// block that is taken in part, the whole records count.
    void Append(std::span<const char> block, std::uint64_t records, Form form = Form::EqualLength);

    std::uint64_t Records() const { return records_; }

    /// The end of a measurement that went as it should: returns when everything is where it belongs.
    virtual void Complete() = 0;

    /// What an early end has left.
    struct Remains {
        std::string file;     ///< that has the whole records; empty: there is none
        std::string earlier;  ///< the file that was to be replaced and stays as it was; empty: none
    };
    /// An early end that keeps the whole records, and nothing where there are none.
    virtual Remains KeepWholeRecords() = 0;
    /// An early end that keeps nothing.
    virtual void Discard() = 0;

  protected:
    virtual OutputDescriptor::Outcome Take(std::span<const char> block) = 0;
    [[noreturn]] virtual void Fail(std::error_code error) const = 0;

    /// Up to the end of the last whole record.
    std::uint64_t WholeBytes() const { return wholeBytes_; }

  private:
    std::uint64_t records_ = 0;
    std::uint64_t wholeBytes_ = 0;
};

}  // namespace Varnholt::Cli
