#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace Varnholt::Utilities::Files {

/// A file, a pipe or a device that is read without getting stuck. Failures are `FileError`.
class ByteSource {
  public:
    virtual ~ByteSource() = default;
    virtual bool IsTerminal() const = 0;
    /// Waits for something to read, the end included. False: there was nothing for so long.
    virtual bool Wait(std::uint32_t milliseconds) = 0;
    /// The number of bytes read, 0 at the end. To be called when `Wait` has answered true; a plain file never
    /// needs to be waited for.
    virtual std::size_t Read(std::uint8_t* buffer, std::size_t size) = 0;
};

/// Opens it, without waiting for somebody who writes into a pipe.
std::unique_ptr<ByteSource> OpenByteSource(const std::string& name);
std::unique_ptr<ByteSource> OpenStandardInput();

/// What is in it, and at most one byte more than `limit`: that many are too many. `await` is called before
/// each read and returns when there is something to read, or throws; none: a plain file is read.
std::vector<std::uint8_t> ReadUpTo(ByteSource& source, std::size_t limit,
                                   const std::function<void()>& await = {});

}  // namespace Varnholt::Utilities::Files
