#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

namespace Varnholt::Cli {

/// What stands for standard input or output in the place of a file's name.
inline constexpr const char* StandardStream = "-";
/// A file's name as messages say it, where it is read.
std::string ShownSource(const std::string& name);
/// ... and as a command line takes it.
std::string QuotedSource(const std::string& name);

/// A file, a pipe or a device that is read without getting stuck. Failures are `ToolFailure` with
/// `ExitCode::File`.
class ByteSource {
  public:
    virtual ~ByteSource() = default;
    virtual bool IsTerminal() const = 0;
    /// Waits for something to read, the end included. False: there was nothing for so long.
    virtual bool Wait(std::uint32_t milliseconds) = 0;
    /// The number of bytes read, 0 at the end. To be called when `Wait` has answered true.
    virtual std::size_t Read(std::uint8_t* buffer, std::size_t size) = 0;
};

/// Opens it, without waiting for somebody who writes into a pipe; `StandardStream` is standard input.
std::unique_ptr<ByteSource> OpenByteSource(const std::string& name);

}  // namespace Varnholt::Cli
