#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "CommandSpec.h"
#include "Service/Memory/EepromImage.h"

namespace Varnholt::Cli {

/// What stands for standard input or output in the place of a file's name.
inline constexpr const char* StandardStream = "-";
/// A file's name as messages say it, where it is read.
std::string ShownSource(const std::string& name);
/// ... and as a command line takes it.
std::string QuotedSource(const std::string& name);

class Session;

/// The content of a file, a pipe or, for "-", of standard input when it has exactly `size` bytes; `what` a
/// file of that size is, with its article, is for the message. Throws `Failure`: `ExitCode::File` when it
/// cannot be read or brings nothing for long, `ExitCode::BadData` when it has another size.
std::vector<std::uint8_t> ReadFileOfSize(Session& session, const std::string& name, std::size_t size,
                                         const std::string& what, const std::string& advice = {});

/// FILE, or --image FILE: an image that is read.
void AddImageArgument(CommandSpec command, std::string& file);
/// An image, as far as its size tells.
Service::EepromImage ReadImageFile(Session& session, const std::string& name);

}  // namespace Varnholt::Cli
